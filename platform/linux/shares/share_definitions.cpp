#include "shares/share_definitions.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <iterator>
#include <unordered_map>
#include <utility>

#include "shares/definition_lines.h"
#include "vexo/text.h"

namespace vexo {
namespace {

constexpr int kIncludeDepth = 16;
constexpr int kIncludedFiles = 128;
constexpr size_t kMaxSections = 10000;
constexpr size_t kGlobal = SIZE_MAX;
constexpr size_t kNowhere = SIZE_MAX - 1;  // behind a header that names nothing

char lower(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c + ('a' - 'A')) : c;
}

// Names and values: blanks at the ends do not count, several in a row are one.
std::string withSingleBlanks(std::string_view text) {
    std::string out;
    for (const char c : trimmed(text)) {
        if (!isDefinitionBlank(c) || !isDefinitionBlank(out.back())) out += c;
    }
    return out;
}

// Keys: neither blanks nor case count.
std::string foldedKey(std::string_view text) {
    std::string out;
    for (const char c : text) {
        if (!isDefinitionBlank(c)) out += lower(c);
    }
    return out;
}

struct KnownKey {
    std::string_view key;
    ShareOption option;
    bool opposite = false;  // a synonym that says yes where the option says no
};
constexpr KnownKey kKeys[] = {
    {"path", ShareOption::path},
    {"directory", ShareOption::path},
    {"available", ShareOption::available},
    {"printable", ShareOption::printable},
    {"printok", ShareOption::printable},
    {"browseable", ShareOption::browseable},
    {"browsable", ShareOption::browseable},
    {"readonly", ShareOption::readOnly},
    {"writeable", ShareOption::readOnly, true},
    {"writable", ShareOption::readOnly, true},
    {"writeok", ShareOption::readOnly, true},
    {"validusers", ShareOption::validUsers},
    {"invalidusers", ShareOption::invalidUsers},
    {"readlist", ShareOption::readList},
    {"writelist", ShareOption::writeList},
    {"createmask", ShareOption::createMask},
    {"createmode", ShareOption::createMask},
    {"forcecreatemode", ShareOption::forceCreateMode},
    {"directorymask", ShareOption::directoryMask},
    {"directorymode", ShareOption::directoryMask},
    {"forcedirectorymode", ShareOption::forceDirectoryMode},
    {"forcegroup", ShareOption::forceGroup},
    {"group", ShareOption::forceGroup},
    {"inheritpermissions", ShareOption::inheritPermissions},
    {"inheritacls", ShareOption::inheritAcls},
    {"vetofiles", ShareOption::vetoFiles},
    {"recycle:repository", ShareOption::recycleRepository},
    {"shadow:snapdir", ShareOption::shadowFolder},
    {"shadow:format", ShareOption::shadowFormat},
    {"shadow:localtime", ShareOption::shadowLocal},
    {"shadow:basedir", ShareOption::shadowBase},
    {"shadow:mountpoint", ShareOption::shadowMount},
    {"shadow:snapsharepath", ShareOption::shadowInside},
    {"shadow:snapdirseverywhere", ShareOption::shadowEverywhere},
    {"shadow:snapprefix", ShareOption::shadowPrefix},
    {"shadow:delimiter", ShareOption::shadowDelimiter},
    {"shadow:sscanf", ShareOption::shadowScan},
    {"-valid", ShareOption::valid},
    {"usersharepath", ShareOption::usersharePath},
    {"usersharemaxshares", ShareOption::usershareMost},
    {"usershareowneronly", ShareOption::usershareOwnerOnly},
    {"usershareprefixallowlist", ShareOption::usershareAllow},
    {"usershareprefixdenylist", ShareOption::usershareDeny},
    {"usersharetemplateshare", ShareOption::usershareTemplate},
    {"vexo:restriction", ShareOption::restriction},
    {"vexo:encrypted", ShareOption::encrypted},
    {"vexo:index", ShareOption::index},
    {"vexo:synced", ShareOption::synced},
    {"vexo:ftp", ShareOption::ftp},
    {"vexo:acl", ShareOption::acl},
    {"vexo:ignore", ShareOption::ignore},
};

class Parser {
 public:
    explicit Parser(const IncludeReader& include) : include_(include) {}

    // `file` names an included text in what is said about its lines.
    void parse(std::string_view text, const std::string& file) {
        const int position = static_cast<int>(out_.files.size());
        out_.files.push_back(file);
        DefinitionLines lines(text);
        std::string line;
        int number = 0;
        while (lines.next(line, number)) {
            place_ = {position, number};
            if (line.front() == '[') {
                takeHeader(line);
            } else {
                takeOption(line);
            }
        }
    }
    void endTorn() { fault("the file ends within a line: somebody is writing it"); }
    Definitions result() {
        out_.global = std::move(defaultLimits_);
        out_.defaults = std::move(defaults_);
        return std::move(out_);
    }

 private:
    void takeHeader(std::string_view line);
    void takeOption(std::string_view line);
    void store(const KnownKey& known, std::string text);
    void storeLimit(std::string_view key, std::string_view written, std::string text);
    void copyFrom(const std::string& name);
    void includeFile(const std::string& file);
    void fault(const std::string& what);

    const IncludeReader& include_;
    Definitions out_;
    OptionValues defaults_;
    LimitValues defaultLimits_;
    std::unordered_map<std::string, size_t> byName_;
    size_t current_ = kGlobal;  // lines above every header are global
    Place place_;               // of the line at hand
    int depth_ = 0;
    int included_ = 0;
    bool tooMany_ = false;
};

// A section with a line that could have been a restriction is worth nothing, so the fault stays with it.
void Parser::fault(const std::string& what) {
    if (current_ == kGlobal || current_ == kNowhere) {
        out_.problems.push_back({what, place_});
    } else if (out_.sections[current_].fault.empty()) {
        out_.sections[current_].fault = what;
        out_.sections[current_].faultPlace = place_;
    }
}

void Parser::takeHeader(std::string_view line) {
    const size_t end = line.find(']');
    std::string name = end == std::string_view::npos ? std::string() : withSingleBlanks(line.substr(1, end - 1));
    if (name.empty()) {
        current_ = kNowhere;
        fault("a section without a name");
        return;
    }
    const std::string key = foldedKey(name);
    if (key == "global" || key == "globals") {
        current_ = kGlobal;
        return;
    }
    const auto known = byName_.find(foldedName(name));
    if (known != byName_.end()) {
        current_ = known->second;
        return;
    }
    if (out_.sections.size() == kMaxSections) {
        current_ = kNowhere;
        if (!std::exchange(tooMany_, true)) fault("more than " + std::to_string(kMaxSections) + " sections");
        return;
    }
    current_ = out_.sections.size();
    byName_.emplace(foldedName(name), current_);
    out_.sections.push_back({std::move(name), place_, defaults_, defaultLimits_, {}, {}, {}});
}

void Parser::takeOption(std::string_view line) {
    if (current_ == kNowhere) return;
    const size_t equals = line.find('=');
    const std::string key = foldedKey(line.substr(0, equals));
    if (equals == std::string_view::npos || key.empty()) {
        fault("neither a section nor an option");
        return;
    }
    std::string text = withSingleBlanks(line.substr(equals + 1));
    if (key == "include") {
        includeFile(text);
    } else if (key == "copy") {
        copyFrom(text);
    } else {
        const auto* known =
            std::find_if(std::begin(kKeys), std::end(kKeys), [&](const auto& k) { return k.key == key; });
        if (known != std::end(kKeys)) {
            store(*known, std::move(text));
        } else {
            storeLimit(key, line.substr(0, equals), std::move(text));
        }
    }
}

void Parser::storeLimit(std::string_view key, std::string_view written, std::string text) {
    const std::string kept = limitKey(key);
    if (kept.empty()) return;
    const bool global = current_ == kGlobal;
    LimitValues& limits = global ? defaultLimits_ : out_.sections[current_].limits;
    limits[kept] = {limitName(kept, written), std::move(text), place_, !global};
}

void Parser::store(const KnownKey& known, std::string text) {
    if (known.opposite) {
        // What is no boolean stays as it is, for whoever reads the option to refuse.
        if (const auto says = parseBoolean(text)) text = *says ? "no" : "yes";
    }
    OptionValues& values = current_ == kGlobal ? defaults_ : out_.sections[current_].values;
    values[static_cast<size_t>(known.option)] = {std::move(text), true, current_ != kGlobal, place_};
}

// Everything the other section has, its defaults too, except what this one stated itself.
void Parser::copyFrom(const std::string& name) {
    if (current_ == kGlobal) return;
    const auto source = byName_.find(foldedName(name));
    if (source == byName_.end() || source->second == current_) {
        fault("copies a section that is not above it");
        return;
    }
    const DefinitionSection& from = out_.sections[source->second];
    DefinitionSection& to = out_.sections[current_];
    for (size_t i = 0; i < kShareOptions; ++i) {
        if (!to.values[i].own) to.values[i] = {from.values[i].text, from.values[i].stated, false, from.values[i].place};
    }
    std::erase_if(to.limits, [](const auto& limit) { return !limit.second.own; });
    for (const auto& [key, limit] : from.limits) {
        to.limits.emplace(key, LimitValue{limit.name, limit.text, limit.place, false});
    }
    if (!from.fault.empty()) fault("copies a section with a fault");
}

void Parser::includeFile(const std::string& file) {
    const size_t includer = current_;
    if (file == "registry" || unknownVariable(file, "")) {
        storeLimit("include", "include", file);
        if (current_ == kGlobal) fault("include = " + file + " cannot be read here, so shares below are closed");
        return;
    }
    if (depth_ == kIncludeDepth || included_ == kIncludedFiles) {
        fault("too many files are included");
        return;
    }
    ++included_;
    errno = 0;
    const std::optional<std::string> text = include_(file);
    if (!text) {
        const bool missing = errno == ENOENT;
        fault("the included file cannot be read");
        // What stands in a file that is there may close the shares below.
        if (current_ == kGlobal && !missing) storeLimit("include", "include", file);
        return;
    }
    ++depth_;
    parse(*text, file);
    --depth_;
    // A file that ends behind a broken header must not swallow what its includer says next.
    if (current_ == kNowhere) current_ = includer;
}

}  // namespace

std::string placeText(const Definitions& definitions, const Place& place) {
    const std::string& file = definitions.files.at(static_cast<size_t>(place.file));
    return "line " + std::to_string(place.line) + (file.empty() ? "" : " of " + file);
}

Definitions parseDefinitions(std::string_view text, const IncludeReader& include, bool torn) {
    Parser parser(include);
    parser.parse(text, {});
    if (torn) parser.endTorn();
    return parser.result();
}

std::vector<std::string> splitList(std::string_view text) {
    std::vector<std::string> entries;
    std::string entry;
    bool quoted = false;
    bool begun = false;
    for (const char c : text) {
        if (c == '"') {
            quoted = !quoted;
            begun = true;
        } else if (quoted || (c != ',' && c != ';' && !isDefinitionBlank(c))) {
            entry += c;
            begun = true;
        } else if (begun) {
            entries.push_back(std::exchange(entry, {}));
            begun = false;
        }
    }
    if (begun) entries.push_back(std::move(entry));
    return entries;
}

std::optional<bool> parseBoolean(std::string_view text) {
    const std::string word = foldedKey(text);
    if (word == "yes" || word == "true" || word == "on" || word == "1") return true;
    if (word == "no" || word == "false" || word == "off" || word == "0") return false;
    return std::nullopt;
}

std::string foldedName(std::string_view name) {
    std::string key;
    VEXO::AppendFoldKey(name, key);
    return key;
}

}  // namespace vexo
