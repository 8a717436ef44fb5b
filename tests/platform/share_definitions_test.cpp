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

// Included files are named "@/...", for the test's folder.
const char* const kAlike[] = {
    // keys without case and blanks
    "[photo]\nPATH = /v/p\n V A L I D\tusers=alice\nReadOnly = no\n  WRITE   list = w\nBrowseAble=No\n"
    "invalidusers = i\nREADLIST = r\n",
    // lists
    "[photo]\npath = /v/p\nvalid users = alice, \"bob smith\";carol\t+grp &net @\"Domain Users\" fo\"o b\"ar\n"
    "read list = a\"\"b \"c,d\" \"e;f\" \"g\th\" @\"DOM\\x y\" \"q\"w\"e r\"t\nwrite list = a,,b ; c ,\n"
    "invalid users = \"\" x\n[music]\npath = /v/m\ninvalid users = \"unterminated x, y\nvalid users = ,;\n"
    "read list = \"\"\nwrite list = 'x y' z\\,w\n",
    // comments, continued lines, carriage returns and blanks
    "; c\n# c\n[photo] # rest\npath = \\\n  /v/p\n# comment \\\nvalid users = x\\\n; y \\\t \n z\n   ; c \\\n"
    "read list = a \\\n  b,\\\nc\\\n\\\n d\n\\\nwrite list = w\\x\\\\y\\\n[music]\npath = /v/m\\\nu\nread list = q\\",
    "[photo]\r\npath = /v/p  \t q\tr\r\nvalid users = x \\\r\n y\r\n \t [two  words] path = /v/no\r\n\tpath\t=\t/v/t\t",
    // sections merge, and start from what was global by then
    "read only = no\nvalid users = g\n[a]\npath = /v/a\n[global]\nread only = yes\nread list = r\n[b]\npath = /v/b\n"
    "valid users =\n[A]\nwrite list = w\n[G lobals]\nbrowseable = no\n[c]\npath = /v/c\n[B]\npath = /v/b2\n",
    // copies
    "[t]\navailable = no\npath = /v/t\nvalid users = t1 t2\nread only = no\n[a]\nread only = yes\ncopy = T\n"
    "path = /v/a\nvalid users =\n[b]\npath = /v/b\navailable = yes\nread list = y\nwrite list = w\n[c]\ncopy = t\n"
    "copy = b\npath = /v/c\n[global]\ninvalid users = late\n[d]\ninvalid users = own\ncopy = c\n[e]\npath = /v/e\n",
    // synonyms
    "[a]\npath = /v/a\nwriteable = yes\n[b]\ndirectory = /v/b\nwritable = 1\n[c]\npath = /v/c\nwrite ok = TRUE\n"
    "browsable = 0\n[d]\npath = /v/d\nread only = oN\navailable = Off\n[e]\npath = /v/e\nwriteable = no\n"
    "read only = off\n[f]\npath = /v/f\nread only = off\nwriteable = False\n",
    // values are texts
    "[a]\npath = /v/a ; no comment\n[b]\npath = /v/b # neither\n[c]\npath = \"/v/c c\"\n[d]\npath = /v//d/\n[e]\n"
    "path = /v/%U\n[f]\npath = /v/x=y\nread list = \"a=b\" c=d\nunknown key = 1\nvexo:restriction = 0x4\n",
    // names of any script, without case
    "[\xC3\xA9t\xC3\xA9]\npath = /v/e\nvalid users = \xC3\xA9ric\n[\xC3\x89T\xC3\x89]\nread list = z\n"
    "[\xD0\x9C\xD0\xB8\xD1\x80]\npath = /v/\xD0\xBC\n",
    // an included file goes on where it is included, and leaves its last section open
    "[a]\npath = /v/a\ninclude = @/users.conf\nread list = after\n[b]\npath = /v/b\nInclude = @/sections.conf\n"
    "write list = inner\n[global]\ninclude = @/users.conf\n[c]\npath = /v/c\n",
};

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
    for (std::string text : kAlike) {
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
    for (const auto& [text, fault] : Rows<std::string, const char*>{
             {"path =\n", "no path"},
             {"path = volume1/photo\n", "is not that of a folder"},
             {"path = //\n", "is not that of a folder"},
             {"path = /volume1/..\n", "is not that of a folder"},
             {"path = /volume1/" + std::string(256, 'x') + "\n", "is not that of a folder"},
             {std::string("path = /volume1/a\0b\n", 20), "a zero or control byte"},
             {"path = /v/p\nvexo:index =\n", "neither yes nor no"},
             {"path = /v/p\nvexo:restriction = -1\n", "is no number"},
             {"path = /v/p\nvexo:restriction = 4294967296\n", "is no number or too large"},
             {"path = /v/p\nvexo:ftp = 2147483648\n", "is no number or too large"},
             {"path = /v/p\nvalid users alice\n", "neither"},
             // What is not offered is no fault.
             {"available = no\n", ""},
             {"printable = yes\npath = /var/tmp\n", ""},
             {"print ok = 1\nread only = ?\n", ""},
         }) {
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
