// The grammar of share definitions, also held against Samba's own reader, and what sections mean.
#include "share_definitions.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "share_options.h"
#include "support/appliance.h"
#include "vexo/share.h"

namespace {

namespace fs = std::filesystem;
using vexo::ShareOption;

const vexo::IncludeReader kNoIncludes = [](const std::string&) { return std::optional<std::string>(); };

// What is compared with Samba, in its spelling.
using Fields = std::map<std::string, std::string>;
using Sections = std::map<std::string, Fields>;  // by folded name
const char* const kBooleans[] = {"read only", "browseable", "available"};
const char* const kTexts[] = {"path", "valid users", "invalid users", "read list", "write list"};

std::string asList(const std::string& text) {
    std::string out;
    for (const std::string& entry : vexo::splitList(text)) {
        const bool quoted = entry.find(' ') != std::string::npos;
        out += ' ' + (quoted ? '"' + entry + '"' : entry);
    }
    return out.empty() ? out : out.substr(1);
}

Sections ours(const vexo::Definitions& definitions) {
    Sections out;
    for (const auto& section : definitions.sections) {
        if (!section.fault.empty()) continue;
        const auto flag = [&](ShareOption option, bool byDefault) -> std::string {
            const auto& value = section.value(option);
            const auto says = vexo::parseBoolean(value.text);
            if (value.stated && !says) return "?";
            return says.value_or(byDefault) ? "Yes" : "No";
        };
        const std::string path = section.value(ShareOption::path).text;
        Fields& fields = out[vexo::foldedName(section.name)];
        fields["path"] = path;
        fields["read only"] = flag(ShareOption::readOnly, true);
        fields["browseable"] = flag(ShareOption::browseable, true);
        fields["available"] = path.empty() ? "No" : flag(ShareOption::available, true);
        fields["valid users"] = asList(section.value(ShareOption::validUsers).text);
        fields["invalid users"] = asList(section.value(ShareOption::invalidUsers).text);
        fields["read list"] = asList(section.value(ShareOption::readList).text);
        fields["write list"] = asList(section.value(ShareOption::writeList).text);
    }
    return out;
}

// Samba's reader prints a value of a section only where it differs from [global]'s, and that only where it differs
// from the built-in one. False when it refuses the file as a whole.
bool samba(const std::string& file, Sections& out) {
    FILE* pipe = popen(("testparm -s --debuglevel=0 '" + file + "' 2>/dev/null").c_str(), "r");
    if (pipe == nullptr) return false;
    std::map<std::string, Fields> printed;
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
    if (pclose(pipe) != 0) return false;
    const Fields global = printed["global"];
    printed.erase("global");
    for (auto& [name, fields] : printed) {
        Fields& full = out[name];
        for (const char* key : kBooleans) full[key] = "Yes";
        for (const char* key : kTexts) full[key] = "";
        for (auto& [key, value] : full) {
            if (global.contains(key)) value = global.at(key);
            if (fields.contains(key)) value = fields.at(key);
        }
    }
    return true;
}

bool isInstalled(const char* program) {
    return system((std::string("command -v ") + program + " >/dev/null").c_str()) == 0;
}

struct Fixture {
    const char* what;
    std::string text;
    std::set<std::string> differences = {};  // sections where this reader means to answer otherwise
    bool isRefusedBySamba = false;           // as a whole; then the sections listed as sound must still be read here
    std::set<std::string> sound = {};
    friend void PrintTo(const Fixture& fixture, std::ostream* out) { *out << fixture.what; }
};

const Fixture kFixtures[] = {
    {"keys without case and blanks",
     "[photo]\nPATH = /v/p\n V A L I D\tusers=alice\nReadOnly = no\n  WRITE   list = w\nBrowseAble=No\n"
     "invalidusers = i\nREADLIST = r\n",
     {}},
    {"lists",
     "[photo]\npath = /v/p\nvalid users = alice, \"bob smith\";carol\t+grp &net @\"Domain Users\" fo\"o b\"ar\n"
     "read list = a\"\"b \"c,d\" \"e;f\" \"g\th\" @\"DOM\\x y\" \"q\"w\"e r\"t\nwrite list = a,,b ; c ,\n"
     "invalid users = \"\" x\n[music]\npath = /v/m\ninvalid users = \"unterminated x, y\nvalid users = ,;\n"
     "read list = \"\"\nwrite list = 'x y' z\\,w\n",
     {}},
    {"comments and continued lines",
     "; c\n# c\n[photo] # rest\npath = \\\n  /v/p\n# comment \\\nvalid users = x\\\n; y \\\t \n z\n   ; c \\\n"
     "read list = a \\\n  b,\\\nc\\\n\\\n d\n\\\nwrite list = w\\x\\\\y\\\n[music]\npath = /v/m\\\nu\nread list = q\\",
     {}},
    {"carriage returns and blanks",
     "[photo]\r\npath = /v/p  \t q\tr\r\nvalid users = x \\\r\n y\r\n \t [two  words] path = "
     "/v/no\r\n\tpath\t=\t/v/t\t\r\n",
     {}},
    {"sections merge, and start from what was global by then",
     "read only = no\nvalid users = g\n[a]\npath = /v/a\n[global]\nread only = yes\nread list = r\n[b]\npath = /v/b\n"
     "valid users =\n[A]\nwrite list = w\n[G lobals]\nbrowseable = no\n[c]\npath = /v/c\n[B]\npath = /v/b2\n",
     {}},
    {"copies",
     "[t]\navailable = no\npath = /v/t\nvalid users = t1 t2\nread only = no\n[a]\nread only = yes\ncopy = T\npath = "
     "/v/a\n"
     "valid users =\n[b]\npath = /v/b\navailable = yes\nread list = y\nwrite list = w\n[c]\ncopy = t\ncopy = b\n"
     "path = /v/c\n[global]\ninvalid users = late\n[d]\ninvalid users = own\ncopy = c\n[e]\npath = /v/e\n",
     {}},
    {"synonyms",
     "[a]\npath = /v/a\nwriteable = yes\n[b]\ndirectory = /v/b\nwritable = 1\n[c]\npath = /v/c\nwrite ok = TRUE\n"
     "browsable = 0\n[d]\npath = /v/d\nread only = oN\navailable = Off\n[e]\npath = /v/e\nwriteable = no\n"
     "read only = off\n[f]\npath = /v/f\nread only = off\nwriteable = False\n",
     {}},
    {"values are texts",
     "[a]\npath = /v/a ; no comment\n[b]\npath = /v/b # neither\n[c]\npath = \"/v/c c\"\n[d]\npath = /v//d/\n[e]\n"
     "path = /v/%U\n[f]\npath = /v/x=y\nread list = \"a=b\" c=d\nunknown key = 1\nvexo:restriction = 0x4\n",
     {}},
    {"names of any script, without case",
     "[\xC3\xA9t\xC3\xA9]\npath = /v/e\nvalid users = \xC3\xA9ric\n[\xC3\x89T\xC3\x89]\nread list = z\n"
     "[\xD0\x9C\xD0\xB8\xD1\x80]\npath = /v/\xD0\xBC\n",
     {}},
    {"an included file goes on where it is included, and leaves its last section open",
     "[a]\npath = /v/a\ninclude = @/users.conf\nread list = after\n[b]\npath = /v/b\nInclude = @/sections.conf\n"
     "write list = inner\n[global]\ninclude = @/users.conf\n[c]\npath = /v/c\n",
     {}},
    // A name is known by its text: the blanks at its ends are nobody's intention.
    {"blanks at the ends of a name", "[ b ]\npath = /v/b\n[b]\nvalid users = x\n", {" b ", "b"}},
    // Such lines can be a restriction that was written wrong, so the section is not offered.
    {"a line that is no option", "[a]\npath = /v/a\nvalid users alice\n[b]\npath = /v/b\n", {"a"}},
    {"an included file that is missing", "[a]\npath = /v/a\ninclude = @/missing.conf\n[b]\npath = /v/b\n", {"a"}},
    // What makes Samba refuse the whole file costs one section here.
    {"no boolean", "[a]\npath = /v/a\n[b]\npath = /v/b\nread only = maybe\n[c]\npath = /v/c\n", {}, true, {"a", "c"}},
    {"unfinished and empty headers",
     "[a]\npath = /v/a\n[b\npath = /v/b\nread only = no\n[]\npath = /v/x\n[c]\npath = /v/c\n",
     {},
     true,
     {"a", "c"}},
    {"an option without a key", "[a]\npath = /v/a\n = x\n[c]\npath = /v/c\n", {}, true, {"c"}},
    {"copies of what is not above",
     "[a]\npath = /v/a\ncopy = b\n[b]\npath = /v/b\n[c]\npath = /v/c\ncopy = c\n[d]\npath = /v/d\n",
     {},
     true,
     {"b", "d"}},
    {"a file that includes itself", "[a]\npath = /v/a\n[b]\npath = /v/b\ninclude = @/loop.conf\n", {}, true, {"a"}},
};

class SambaGrammar : public ::testing::TestWithParam<Fixture> {
 protected:
    void SetUp() override {
        folder_ = "/tmp/definitions-" + std::to_string(getpid());
        support::writeFile(folder_ + "/users.conf", "valid users = included\n# no section of its own\n");
        support::writeFile(folder_ + "/sections.conf", "read list = first\n[inner]\npath = /v/inner\n");
        support::writeFile(folder_ + "/loop.conf", "include = " + folder_ + "/loop.conf\n");
    }
    void TearDown() override { fs::remove_all(folder_); }

    std::string withFolder(std::string text) const {
        for (size_t at = 0; (at = text.find("@/", at)) != std::string::npos;) text.replace(at, 1, folder_);
        return text;
    }
    static vexo::Definitions read(const std::string& text) {
        return vexo::parseDefinitions(text, [](const std::string& file) -> std::optional<std::string> {
            if (!fs::exists(file)) return std::nullopt;
            return support::readFile(file);
        });
    }
    std::string folder_;
};

TEST_P(SambaGrammar, ReadsAlike) {
    if (!isInstalled("testparm")) GTEST_SKIP() << "testparm (package samba-common-bin) is not installed";
    const Fixture& fixture = GetParam();
    const std::string text = withFolder(fixture.text);
    support::writeFile(folder_ + "/smb.conf", text);
    Sections theirs;
    const bool accepted = samba(folder_ + "/smb.conf", theirs);
    const vexo::Definitions definitions = read(text);
    ASSERT_EQ(accepted, !fixture.isRefusedBySamba);
    if (!accepted) {
        std::set<std::string> names;
        for (const auto& section : definitions.sections) {
            if (vexo::readShare(section).share) names.insert(section.name);
        }
        EXPECT_EQ(names, fixture.sound);
        return;
    }
    Sections mine = ours(definitions);
    for (const std::string& section : fixture.differences) {
        EXPECT_NE(mine[section], theirs[section]) << section << " is no difference any more";
        mine.erase(section);
        theirs.erase(section);
    }
    EXPECT_EQ(mine, theirs);
}

INSTANTIATE_TEST_SUITE_P(Files, SambaGrammar, ::testing::ValuesIn(kFixtures), [](const auto& test) {
    std::string name;
    for (const char* c = test.param.what; *c != '\0'; ++c)
        name += isalnum(static_cast<unsigned char>(*c)) != 0 ? *c : '_';
    return name;
});

// What readShare says of the section [photo].
vexo::ShareReading read(const std::string& text, std::string before = {}) {
    for (const auto& section : vexo::parseDefinitions(before.append("[photo]\n").append(text), kNoIncludes).sections) {
        if (section.name == "photo") return vexo::readShare(section);
    }
    return {std::nullopt, "no section"};
}

TEST(ShareSection, MalformedOnesSayWhy) {
    struct Case {
        std::string text;
        const char* fault;
    };
    const Case cases[] = {
        {"read only = no\n", "no path"},
        {"path =\n", "no path"},
        {"path = volume1/photo\n", "is not of the form"},
        {"path = /photo\n", "is not of the form"},
        {"path = /volume1/a/b\n", "is not of the form"},
        {"path = /volume1/..\n", "is not of the form"},
        {"path = /./photo\n", "is not of the form"},
        {"path = /volume1/" + std::string(256, 'x') + "\n", "is not of the form"},
        {std::string("path = /volume1/a\0b\n", 20), "a zero byte"},
        {"path = /v/p\nread only = 2\n", "neither yes nor no"},
        {"path = /v/p\nvexo:index =\n", "neither yes nor no"},
        {"path = /v/p\nwriteable = perhaps\n", "neither yes nor no"},
        {"path = /v/p\nvexo:restriction = 0x\n", "is no number"},
        {"path = /v/p\nvexo:restriction = -1\n", "is no number"},
        {"path = /v/p\nvexo:restriction = 4 5\n", "is no number"},
        {"path = /v/p\nvexo:restriction = 4294967296\n", "is no number or too large"},
        {"path = /v/p\nvexo:ftp = 2147483648\n", "is no number or too large"},
        {"path = /v/p\nvalid users alice\n", "line 3: neither"},
        {"path = /v/p\ninclude = gone\n", "line 3: the included file"},
        {"path = /v/p\ncopy = gone\n", "line 3: copies a section"},
    };
    for (const Case& c : cases) {
        const vexo::ShareReading reading = read(c.text);
        EXPECT_FALSE(reading.share.has_value()) << c.text;
        EXPECT_NE(reading.fault.find(c.fault), std::string::npos) << c.text << reading.fault;
    }
    // A default that cannot be read spoils whoever relies on it; so does the section that is copied.
    EXPECT_NE(read("path = /v/p\n", "vexo:restriction = high\n").fault, "");
    EXPECT_EQ(read("path = /v/p\nvexo:restriction = 2\n", "vexo:restriction = high\n").fault, "");
    EXPECT_NE(read("copy = t\npath = /v/p\n", "[t]\npath = /v/t\nvalid users alice\n").fault, "");
}

TEST(ShareSection, Names) {
    struct Case {
        std::string name;
        bool isSound;
    };
    const Case cases[] = {{"a", true},
                          {"a b.c \xFF", true},
                          {std::string(255, 'x'), true},
                          {std::string(256, 'x'), false},
                          {".", false},
                          {"..", false},
                          {"a/b", false},
                          {"a\x01", false},
                          {"HOME", false},
                          {"homes", true},
                          {"\x7F", false}};
    for (const Case& c : cases) {
        const auto sections = vexo::parseDefinitions("[" + c.name + "]\npath = /v/p\n", kNoIncludes).sections;
        ASSERT_EQ(sections.size(), 1U) << c.name;
        EXPECT_EQ(vexo::readShare(sections[0]).share.has_value(), c.isSound) << c.name;
    }
}

TEST(ShareSection, WhatIsNotOfferedIsNoFault) {
    for (const char* text :
         {"available = no\n", "printable = yes\npath = /var/tmp\n", "print ok = 1\nread only = ?\n"}) {
        const vexo::ShareReading reading = read(text);
        EXPECT_FALSE(reading.share.has_value()) << text;
        EXPECT_EQ(reading.fault, "") << text;
    }
}

TEST(ShareSection, OptionsOfItsOwn) {
    const auto share = *read(
                            "path = /v/p\nbrowseable = no\nvexo:restriction = 0x6\nVexo : Encrypted = yes\n"
                            "vexo:index = on\nvexo:synced = true\nvexo:ftp = 3\nvexo:acl = 1\n")
                            .share;
    EXPECT_EQ(share.status, unsigned{VEXO_SHARE_HIDDEN | VEXO_SHARE_ENCRYPTED});
    EXPECT_EQ(share.mask, 6U);
    EXPECT_EQ(share.ftp, 3);
    EXPECT_TRUE(share.index && share.synced && share.acl);
    const auto plain = *read("path = /v//p/\n").share;
    EXPECT_EQ(plain.path, "/v/p");
    EXPECT_EQ(plain.status | plain.mask | static_cast<unsigned>(plain.ftp), 0U);
    EXPECT_FALSE(plain.index || plain.synced || plain.acl);
}

TEST(ShareSection, VariablesOfPaths) {
    const vexo::PathVariables variables{"photo", "DOM\\alice", "alice", "DOM", "users"};
    EXPECT_EQ(vexo::replaceVariables("/%S-%U/%D%g%u%%U%x%", variables), "/photo-alice/DOMusersDOM\\alice%alice%x%");
    EXPECT_EQ(vexo::replaceVariables("%U", {"", "", "%S", "", ""}), "%S") << "a name is not looked through again";
}

// Files that include each other without end cost a section, not the process.
TEST(ShareSection, IncludesEnd) {
    int reads = 0;
    const auto definitions = vexo::parseDefinitions(
        "[a]\npath = /v/a\n[b]\npath = /v/b\ninclude = x\n[c]\npath = /v/c\n",
        [&](const std::string&) { return ++reads, std::optional<std::string>("include = x\ninclude = y\n"); });
    EXPECT_LT(reads, 1000);
    ASSERT_EQ(definitions.sections.size(), 3U);
    EXPECT_EQ(definitions.sections[0].fault, "");
    EXPECT_NE(definitions.sections[1].fault, "");
    EXPECT_EQ(definitions.sections[2].fault, "");
}

}  // namespace
