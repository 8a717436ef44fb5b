#include "index/index_condition.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <memory>
#include <string_view>

#include "failure.h"
#include "index/index_columns.h"

namespace vexo::fileindex {
namespace {

using Node = __tag_FI_SQL_COND;

constexpr int kEscape = '\\';
constexpr size_t kNamePatternLimit = 493;  // as much as the criterion on names compares
constexpr const char* kNobody = "4294967295";
constexpr int kDepthLimit = 100;  // SQLite takes expressions of depth 1,000
constexpr int kNodeLimit = 20000;
constexpr size_t kTrigramsOfPattern = 16;
constexpr size_t kTrigramsLimit = 65536;  // bytes; beyond, looking at every name is the shorter way

std::string_view textOf(const Node& node) {
    return {node.szValue, strnlen(node.szValue, sizeof node.szValue)};
}

// The folder that a path condition is about.
std::string folderOf(const Node& node, bool ofSearch) {
    std::string_view text = textOf(node);
    if (ofSearch) {
        text.remove_prefix(std::min(text.find_first_not_of('/'), text.size()));
        text.remove_prefix(std::min(text.find('/'), text.size()));
    }
    std::string folder;
    for (const char c : text) {
        if (c != '/' || (!folder.empty() && folder.back() != '/')) folder += c;
    }
    if (folder.ends_with('/')) folder.pop_back();
    return folder;
}

bool isBelowForm(const Node& node, bool ofSearch) {
    return !ofSearch && textOf(node).ends_with("/*");
}

const char* numberComparison(__tag_FI_SQL_COND_OP op) {
    switch (op) {
        case FI_OP_EQUAL:
            return "=";
        case FI_OP_LESS:
            return "<";
        case FI_OP_GREATER:
            return ">";
        case FI_OP_GREATER_EQUAL:
            return ">=";
        default:
            return nullptr;
    }
}

// The trigrams of a pattern's literals as full-text terms; every fitting name holds all of them.
std::optional<std::string> trigramsOf(const orvel::Wildcard& pattern) {
    std::string terms;
    size_t count = 0;
    for (const std::string& literal : pattern.literals()) {
        std::vector<size_t> starts;  // of its characters, and its end
        for (size_t at = 0; at < literal.size(); ++at) {
            if ((static_cast<unsigned char>(literal[at]) & 0xC0U) != 0x80U) starts.push_back(at);
        }
        starts.push_back(literal.size());
        for (size_t i = 0; i + 3 < starts.size() && count < kTrigramsOfPattern; ++i, ++count) {
            terms += count == 0 ? "\"" : " AND \"";
            for (size_t at = starts[i]; at < starts[i + 3]; ++at) {
                terms += literal[at];
                if (literal[at] == '"') terms += '"';
            }
            terms += '"';
        }
    }
    if (count == 0) return {};
    return "(" + terms + ")";
}

Condition always() {
    return {"1"};
}

// What stands behind "*." in a pattern that holds no other wildcard, in the form of the comparison. Characters that
// this form does not tell apart are left to the pattern itself.
std::optional<std::string> endingOf(std::string_view text, const orvel::Wildcard& pattern) {
    if (!text.starts_with("*.") || text.find('\\') != std::string_view::npos) return {};
    std::string rest;
    orvel::appendComparable(text.substr(1), rest);
    const std::vector<std::string> literals = pattern.literals();
    if (literals.size() != 1 || literals.front() != rest || rest.find("\xEF\xBF\xBD") != std::string::npos) return {};
    return rest.substr(1);
}

template <class Item>
void appendTo(std::vector<Item>& to, std::vector<Item>& from) {
    std::move(from.begin(), from.end(), std::back_inserter(to));
}

bool fits(const Value& test, std::string_view name) {
    if (const auto* pattern = std::get_if<Pattern>(&test)) return (*pattern)->match(name);
    const auto* endings = std::get_if<EndingList>(&test);
    return endings == nullptr || (*endings)->match(name);
}

// What one of many alternatives asks for, without what it says itself.
void addHints(Condition& to, Condition& from) {
    if (to.folders && from.folders) {
        appendTo(*to.folders, *from.folders);
    } else {
        to.folders.reset();
    }
    if (to.trigrams && from.trigrams) {
        *to.trigrams += " OR " + *from.trigrams;
    } else {
        to.trigrams.reset();
    }
    // What holds for all of either holds for the first of each.
    to.names.resize(to.names.empty() || from.names.empty() ? 0 : 1);
    if (!to.names.empty()) appendTo(to.names.front(), from.names.front());
}

Condition either(Condition a, Condition b) {
    a.sql = "(" + a.sql + " OR " + b.sql + ")";
    appendTo(a.values, b.values);
    addHints(a, b);
    if (a.trigrams) a.trigrams = "(" + *a.trigrams + ")";
    a.plain.reset();
    return a;
}

Condition joined(const std::vector<Condition>& parts, bool endings) {
    auto names = std::make_shared<Endings>();
    auto folders = std::make_shared<FolderSet>();
    for (const Condition& part : parts) {
        if (endings) {
            names->add(part.plain->text);
        } else {
            folders->add(part.plain->text, part.plain->kind == PlainTest::Kind::kBelow);
        }
    }
    if (endings) return {"vexo_ending(?,name)", {Value(EndingList(names))}, {}, {}, {}, {{Value(EndingList(names))}}};
    return {"vexo_within(?,path)", {Value(FolderList(folders))}};
}

// Alternatives that one test can ask become one.
void joinPlain(std::vector<Condition>& parts, bool endings) {
    const auto isOther = [endings](const Condition& part) {
        return !part.plain || (part.plain->kind == PlainTest::Kind::kEnding) != endings;
    };
    const auto from = std::stable_partition(parts.begin(), parts.end(), isOther);
    std::vector<Condition> plain(std::make_move_iterator(from), std::make_move_iterator(parts.end()));
    parts.erase(from, parts.end());
    if (plain.size() > 1) {
        Condition all = joined(plain, endings);
        all.folders = std::move(plain.front().folders);
        all.trigrams = std::move(plain.front().trigrams);
        const auto names = all.names;  // of all of them
        for (size_t i = 1; i < plain.size(); ++i) addHints(all, plain[i]);
        all.names = names;
        if (all.trigrams) all.trigrams = "(" + *all.trigrams + ")";
        plain.clear();
        plain.push_back(std::move(all));
    }
    std::move(plain.begin(), plain.end(), std::back_inserter(parts));
}

// Halves, so that a long list of alternatives does not become a deep expression.
Condition halved(std::vector<Condition>& parts, size_t from, size_t to) {
    if (to - from == 1) return std::move(parts[from]);
    const size_t middle = from + (to - from) / 2;
    Condition left = halved(parts, from, middle);
    return either(std::move(left), halved(parts, middle, to));
}

Condition anyOf(std::vector<Condition> parts) {
    joinPlain(parts, true);
    joinPlain(parts, false);
    return halved(parts, 0, parts.size());
}

class Reader {
 public:
    explicit Reader(const Reading& reading) : reading_(reading) {}

    std::optional<Condition> chain(const Node* first, int depth) {
        std::vector<Group> groups;
        const Node* shared = nullptr;
        for (const Node* node = first; node != nullptr && shared == nullptr; node = node->pOrNext) {
            if (--budget_ < 0) return {};
            shared = node->pAndNext;
        }
        for (const Node* node = first; node != nullptr; node = node->pOrNext) {
            if (--budget_ < 0) return {};
            const Node* link = node->pAndNext != nullptr ? node->pAndNext : shared;
            std::optional<Condition> own = isWidened(*node, link) ? always() : test(*node);
            if (!own) return {};
            addTo(groups, link, std::move(*own));
        }
        return join(groups, depth);
    }

 private:
    // The members of a chain that share an and-link, which is then written once.
    struct Group {
        const Node* link;
        std::vector<Condition> members;
    };

    static void addTo(std::vector<Group>& groups, const Node* link, Condition member) {
        const auto found =
            std::find_if(groups.begin(), groups.end(), [&](const Group& group) { return group.link == link; });
        Group& group = found == groups.end() ? groups.emplace_back(Group{link, {}}) : *found;
        group.members.push_back(std::move(member));
    }

    std::optional<Condition> join(std::vector<Group>& groups, int depth) {
        std::vector<Condition> parts;
        for (Group& group : groups) {
            Condition members = anyOf(std::move(group.members));
            if (group.link != nullptr) {
                std::optional<Condition> link;
                if (depth < kDepthLimit) link = chain(group.link, depth + 1);
                if (!link) return {};
                members = both(std::move(members), std::move(*link));
            }
            parts.push_back(std::move(members));
        }
        return anyOf(std::move(parts));
    }

    // "Directly in V" that is and-linked with "below V" says the latter.
    [[nodiscard]] bool isWidened(const Node& node, const Node* link) const {
        return node.type == FI_COL_PATH && node.op == FI_OP_PATH && link != nullptr && link->type == FI_COL_PATH &&
               link->op == FI_OP_BELOW && textOf(node) == textOf(*link);
    }

    [[nodiscard]] std::optional<Condition> test(const Node& node) const {
        const Column* column = columnOf(node.type);
        if (column == nullptr) return {};
        if (node.type == FI_COL_ACCESS_TIME && reading_.accessHolds) return always();
        if (node.op == FI_OP_PATH || node.op == FI_OP_BELOW) {
            if (node.type != FI_COL_PATH) return {};
            return pathTest(node);
        }
        if (!column->isText) return numberTest(node, *column);
        if (node.op == FI_OP_EQUAL) return Condition{std::string(column->name) + "=?", {valueOf(node)}};
        if (node.op == FI_OP_WILDCARD) return patternTest(node, *column);
        return {};
    }

    static std::optional<Condition> numberTest(const Node& node, const Column& column) {
        const char* comparison = numberComparison(node.op);
        if (comparison == nullptr) return {};
        // The reserved id matches no owner, as for the criteria.
        const bool isId = node.type == FI_COL_UID || node.type == FI_COL_GID;
        if (isId && node.op == FI_OP_EQUAL && textOf(node) == kNobody) return Condition{"0"};
        return Condition{std::string(column.name) + comparison + "?", {valueOf(node)}};
    }

    [[nodiscard]] std::optional<Condition> patternTest(const Node& node, const Column& column) const {
        const bool isName = node.type == FI_COL_NAME;
        const bool isCut = isName && reading_.ofCriteria;
        const std::string_view text = textOf(node).substr(0, isCut ? kNamePatternLimit : std::string_view::npos);
        const auto pattern = std::make_shared<const orvel::Wildcard>(text, kEscape);
        Condition out{std::string("vexo_match(?,") + column.name + ")", {Value(Pattern(pattern))}};
        if (isName) out.names = {{Value(Pattern(pattern))}};
        if (isName && reading_.ofCriteria) out.trigrams = trigramsOf(*pattern);
        if (auto ending = isName ? endingOf(text, *pattern) : std::nullopt) {
            const auto endings = std::make_shared<Endings>();
            endings->add(*ending);
            out.names = {{Value(EndingList(endings))}};
            out.plain = {PlainTest::Kind::kEnding, std::move(*ending)};
        }
        return out;
    }

    [[nodiscard]] Condition pathTest(const Node& node) const {
        std::string folder = folderOf(node, reading_.ofSearch);
        bool below = node.op == FI_OP_BELOW;
        if (node.op == FI_OP_PATH && isBelowForm(node, reading_.ofSearch)) {
            folder.resize(folder.size() - 1);
            if (folder.ends_with('/')) folder.pop_back();
            below = true;
        }
        if (folder.empty() && below) return always();
        Condition out{"parent=?", {Value(folder)}, {{{folder, below}}}, {}, {}};
        if (!folder.empty()) {
            Condition inRange{"(path>? AND path<?)", {Value(folder + "/"), Value(folder + "0")}};
            if (below) inRange.folders = std::move(out.folders);
            out = below ? std::move(inRange) : both(std::move(inRange), std::move(out));
        }
        out.plain = {below ? PlainTest::Kind::kBelow : PlainTest::Kind::kDirect, folder};
        return out;
    }

    const Reading reading_;
    int budget_ = kNodeLimit;
};

}  // namespace

Condition both(Condition a, Condition b) {
    if (a.sql == "1") return b;
    if (b.sql == "1") return a;
    a.plain.reset();
    a.sql = "(" + a.sql + " AND " + b.sql + ")";
    appendTo(a.values, b.values);
    appendTo(a.names, b.names);
    if (!a.folders) a.folders = std::move(b.folders);
    if (a.trigrams && b.trigrams) {
        a.trigrams = "(" + *a.trigrams + " AND " + *b.trigrams + ")";
    } else if (!a.trigrams) {
        a.trigrams = std::move(b.trigrams);
    }
    return a;
}

bool fitsNames(const Condition& condition, std::string_view name) {
    return std::all_of(condition.names.begin(), condition.names.end(), [name](const std::vector<Value>& alternatives) {
        return std::any_of(alternatives.begin(), alternatives.end(),
                           [name](const Value& test) { return fits(test, name); });
    });
}

bool mayHaveExtension(const Condition& condition, std::string_view extension) {
    const auto allows = [extension](const Value& test) {
        const auto* endings = std::get_if<EndingList>(&test);
        return endings == nullptr || (*endings)->mayMatch(extension);
    };
    return std::all_of(condition.names.begin(), condition.names.end(), [&](const std::vector<Value>& alternatives) {
        return std::any_of(alternatives.begin(), alternatives.end(), allows);
    });
}

bool asksForExtension(const Condition& condition) {
    const auto isEndings = [](const Value& test) { return std::holds_alternative<EndingList>(test); };
    return std::any_of(condition.names.begin(), condition.names.end(), [&](const std::vector<Value>& alternatives) {
        return std::all_of(alternatives.begin(), alternatives.end(), isEndings);
    });
}

Value valueOf(const __tag_FI_SQL_COND& node) {
    const Column* column = columnOf(node.type);
    if (column != nullptr && column->isText) return std::string(textOf(node));
    return static_cast<int64_t>(std::strtoll(std::string(textOf(node)).c_str(), nullptr, 10));
}

std::optional<Condition> readCondition(const __tag_FI_SQL_COND* tree, const Reading& reading) {
    if (tree == nullptr) return always();
    std::optional<Condition> condition = Reader(reading).chain(tree, 0);
    if (!condition) {
        fail(VEXO_ERR_PARAMETER, EINVAL);
        return {};
    }
    if (condition->trigrams && condition->trigrams->size() > kTrigramsLimit) condition->trigrams.reset();
    return condition;
}

}  // namespace vexo::fileindex
