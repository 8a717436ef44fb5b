// The grammar of share definitions, also held against Samba's own reader, and what sections mean.
#include "shares/share_definitions.h"

#include "shares/share_options.h"
#include "support/testing.h"
#include "vexo/share.h"

namespace {

using vexo::ShareOption;

const vexo::IncludeReader kNoIncludes = [](const std::string&) { return std::optional<std::string>(); };

// What is compared with Samba, in its spelling.
using Fields = std::map<std::string, std::string>;
using Sections = std::map<std::string, Fields>;  // by folded name
const Rows<const char*, ShareOption> kBooleans = {{"read only", ShareOption::readOnly},
                                                  {"browseable", ShareOption::browseable},
                                                  {"available", ShareOption::available}};
const Rows<const char*, ShareOption> kLists = {
    row("valid users", ShareOption::validUsers), row("invalid users", ShareOption::invalidUsers),
    row("read list", ShareOption::readList), row("write list", ShareOption::writeList)};

Sections ours(const vexo::Definitions& definitions) {
    Sections out;
    for (const auto& section : definitions.sections) {
        if (!section.fault.empty()) continue;
        Fields& fields = out[vexo::foldedName(section.name)];
        const std::string path = fields["path"] = section.value(ShareOption::path).text;
        for (const auto& [key, option] : kBooleans) {
            const auto& value = section.value(option);
            fields[key] = vexo::parseBoolean(value.text).value_or(!value.stated) ? "Yes" : "No";
        }
        if (path.empty()) fields["available"] = "No";
        for (const auto& [key, option] : kLists) {
            std::string& list = fields[key];
            for (const std::string& entry : vexo::splitList(section.value(option).text)) {
                const char* quote = entry.find(' ') != std::string::npos ? "\"" : "";
                list.append(" ").append(quote).append(entry).append(quote);
            }
            list.erase(0, 1);
        }
    }
    return out;
}

// Samba's reader prints a value of a section only where it differs from [global]'s, and that only where it differs
// from the built-in one. Nothing when it refuses the file as a whole.
std::optional<Sections> samba(const std::string& file) {
    FILE* pipe = popen(("testparm -s --debuglevel=0 '" + file + "' 2>/dev/null").c_str(), "r");
    if (pipe == nullptr) return {};
    Sections printed, out;
    std::string current;
    char line[4096];
    while (fgets(line, sizeof line, pipe) != nullptr) {
        std::string text = line;
        text.pop_back();
        if (text.starts_with('[')) {
            current = vexo::foldedName(text.substr(1, text.size() - 2));
            printed[current];
        } else if (const size_t equals = text.find(" = "); text.starts_with('\t') && equals != std::string::npos) {
            printed[current][text.substr(1, equals - 1)] = text.substr(equals + 3);
        }
    }
    if (pclose(pipe) != 0) return {};
    const Fields global = printed["global"];
    printed.erase("global");
    for (auto& [name, fields] : printed) {
        Fields& full = out[name];
        full["path"];
        for (const auto& [key, option] : kBooleans) full[key] = "Yes";
        for (const auto& [key, option] : kLists) full[key];
        for (auto& [key, value] : full) {
            if (global.contains(key)) value = global.at(key);
            if (fields.contains(key)) value = fields.at(key);
        }
    }
    return out;
}

// Samba refuses the whole file; here the sections listed are sound.
const Rows<std::string, std::set<std::string>> kRefusedBySamba = {
    {"[a]\npath = /v/a\n[b]\npath = /v/b\nread only = maybe\n[c]\npath = /v/c\n", {"a", "c"}},
    {"[a]\npath = /v/a\n[b\npath = /v/b\nread only = no\n[]\npath = /v/x\n[c]\npath = /v/c\n", {"a", "c"}},
    {"[a]\npath = /v/a\n = x\n[c]\npath = /v/c\n", {"c"}},
    {"[a]\npath = /v/a\ncopy = b\n[b]\npath = /v/b\n[c]\npath = /v/c\ncopy = c\n[d]\npath = /v/d\n", {"b", "d"}},
    {"[a]\npath = /v/a\n[b]\npath = /v/b\ninclude = @/loop.conf\n", {"a"}}};

using SambaGrammar = ApplianceTest;

TEST_F(SambaGrammar, ReadsAlike) {
    const bool hasOracle = system("command -v testparm >/dev/null") == 0;
    const std::string folder = systemRoot() + "/definitions";
    writeFile(folder + "/users.conf", "valid users = included\n# no section of its own\n");
    writeFile(folder + "/sections.conf", "read list = first\n[inner]\npath = /v/inner\n");
    writeFile(folder + "/loop.conf", "include = " + folder + "/loop.conf\n");
    const auto read = [&](std::string& text) {
        for (size_t at = 0; (at = text.find("@/", at)) != std::string::npos;) text.replace(at, 1, folder);
        writeFile(folder + "/smb.conf", text);
        return vexo::parseDefinitions(text, [](const std::string& file) {
            return fs::exists(file) ? std::optional(readFile(file)) : std::nullopt;
        });
    };
    // Included files are named "@/...", for the test's folder.
    for (auto [text] : rowsOf<std::string>("platform/samba_grammar")) {
        const Sections mine = ours(read(text));
        EXPECT_TRUE(!hasOracle || samba(folder + "/smb.conf") == mine) << text;
    }
    for (auto [text, sections] : kRefusedBySamba) {
        std::set<std::string> names;
        for (const auto& section : read(text).sections) {
            if (vexo::readShare(section).share) names.insert(section.name);
        }
        EXPECT_EQ(names, sections) << text;
        EXPECT_FALSE(hasOracle && samba(folder + "/smb.conf")) << text;
    }
    if (!hasOracle) GTEST_SKIP() << "testparm (package samba-common-bin) is not installed";
}

// What readShare says of the section [photo].
vexo::ShareReading read(const std::string& text, std::string before = {}) {
    for (const auto& section : vexo::parseDefinitions(before.append("[photo]\n").append(text), kNoIncludes).sections) {
        if (section.name == "photo") return vexo::readShare(section);
    }
    vexo::ShareReading none;
    none.fault = "no section";
    return none;
}

TEST(ShareSection, MalformedOnesSayWhy) {
    for (const auto& [text, fault] : rowsOf<std::string, const char*>("platform/malformed_shares")) {
        const vexo::ShareReading reading = read(text);
        EXPECT_FALSE(reading.share.has_value()) << text;
        EXPECT_NE(reading.fault.find(fault), std::string::npos) << text << reading.fault;
        EXPECT_EQ(reading.fault.empty(), *fault == '\0') << text;
    }
    // A default that cannot be read spoils whoever relies on it; so does the section that is copied.
    EXPECT_NE(read("path = /v/p\n", "vexo:restriction = high\n").fault, "");
    EXPECT_EQ(read("path = /v/p\nvexo:restriction = 2\n", "vexo:restriction = high\n").fault, "");
    EXPECT_NE(read("copy = t\npath = /v/p\n", "[t]\npath = /v/t\nvalid users alice\n").fault, "");
}

TEST(ShareSection, NamesAndVariablesOfPaths) {
    const auto isSound = [](const std::string& name) {
        const auto sections = vexo::parseDefinitions("[" + name + "]\npath = /v/p\n", kNoIncludes).sections;
        return sections.size() == 1 && vexo::readShare(sections[0]).share.has_value();
    };
    const std::string longest(255, 'x');
    EXPECT_TRUE(isSound("a b.c \xFF") && isSound("homes") && isSound(longest));
    EXPECT_FALSE(isSound(longest + "x"));
    for (const char* name : {".", "..", "a/b", "a\x01", "HOME", "\x7F"}) EXPECT_FALSE(isSound(name)) << name;
    const vexo::PathVariables variables{"photo", "DOM\\alice", "alice", "DOM", "users", "/h"};
    EXPECT_EQ(vexo::replaceVariables("/%S-%U/%D%g%u%G%H%%U%x%", variables),
              "/photo-alice/DOMusersDOM\\aliceusers/h%%U%x%");
    EXPECT_EQ(vexo::replaceVariables("%U", {"", "", "%S", "", "", ""}), "%S") << "a name is not looked through again";
    EXPECT_FALSE(vexo::replaceVariables("/v/%D", {"s", "u", "u", "", "g", "/h"})) << "another folder than is meant";
}

// Files that include each other without end cost a section, not the process.
TEST(ShareSection, IncludesEnd) {
    int reads = 0;
    const auto definitions = vexo::parseDefinitions(
        "[a]\npath = /v/a\n[b]\npath = /v/b\ninclude = x\n[c]\npath = /v/c\n",
        [&](const std::string&) { return ++reads, std::optional<std::string>("include = x\ninclude = y\n"); });
    EXPECT_LT(reads, 1000);
    ASSERT_EQ(definitions.sections.size(), 3U);
    for (const auto& section : definitions.sections) EXPECT_EQ(section.fault.empty(), section.name != "b");
}

}  // namespace
