// Languages, tables of texts, salts.
#include "vexo/language.h"

#include "settings/language_choice.h"
#include "support/testing.h"
#include "vexo/user.h"

namespace {

TEST(LanguageChoice, TheBestThatIsOurs) {
    for (const auto& [header, setting, code] : rowsOf<const char*, const char*, const char*>("platform/languages"))
        EXPECT_STREQ(vexo::chooseLanguage(header, setting), code) << header << " and " << setting;
}

using LanguageTest = ApplianceTest;

TEST_F(LanguageTest, TablesOfTexts) {
    writeRootFile("/usr/vexo/texts/en/filetable.conf", "name=\"Name\"\nsay=\"\"Hi\"\"\n");
    writeRootFile("/usr/vexo/texts/de/filetable.conf", "name=\"Gr\xC3\xB6\xC3\x9F\x65\"\n");
    writeRootFile("/usr/vexo/texts/en/other.conf", "a=b\n");
    setSetting("language", "de");
    for (const auto& [wanted, module, key, text] : Rows<const char*, const char*, const char*, const char*>{
             row("en-GB", "filetable", "say", "\"Hi\""), row("", "filetable", "name", "Gr\xC3\xB6\xC3\x9F\x65"),
             row("", "filetable", "say", nullptr), row("de", "other", "a", "b")}) {
        setenv("HTTP_ACCEPT_LANGUAGE", wanted, 1);
        PVEXOSTRINGS bundle = VexoCgiStringBundleOpen(module);
        EXPECT_STREQ(VexoCgiStringBundleGet(bundle, key), text) << module;
        VexoCgiStringBundleClose(bundle);
    }
    for (const auto& [name, code] : Rows<const char*, int>{
             {"none", VEXO_ERR_FILE}, {"", VEXO_ERR_PARAMETER}, {"../en/other", VEXO_ERR_PARAMETER}}) {
        EXPECT_EQ(VexoCgiStringBundleOpen(name), nullptr);
        EXPECT_EQ(VLIBCErrGet(), code);
    }
}

std::string saltsOf(long count) {
    std::string salts;
    for (long number = -count; number < count; ++number) salts += VEXOUserRandomNumMap2Seed(number);
    return salts;
}

TEST(Salts, AreOfTheAlphabetAndInNoOrder) {
    const std::string salts = saltsOf(5000);
    EXPECT_EQ(std::set<char>(salts.begin(), salts.end()).size(), 63U);
    for (const char salt : salts) ASSERT_TRUE(isalnum(salt) != 0 || salt == '.') << salt;
    EXPECT_EQ(saltsOf(5000), salts);
    EXPECT_NE(salts.substr(0, 63), salts.substr(63, 63)) << "one known salt tells nothing of others";
}

}  // namespace
