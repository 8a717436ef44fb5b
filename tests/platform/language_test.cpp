// Languages, tables of texts, request records, salts.
#include "vexo/language.h"

#include <cstdlib>
#include <set>
#include <string>

#include "language_choice.h"
#include "support/appliance.h"
#include "vexo/error.h"
#include "vexo/user.h"
#include "vexo/web_record.h"

namespace {

TEST(LanguageChoice, TheBestThatIsOurs) {
    struct Case {
        const char *header, *setting, *code;
    };
    const Case cases[] = {
        {"", "", "en"},
        {"", "de", "de"},
        {"", "xx", "en"},
        {"de", "", "de"},
        {"DE-at", "", "de"},
        {"den, dex", "", "en"},
        {"fr, de;q=0.5, en;q=0.4", "", "de"},
        {"en;q=0.8, de;q=0.9", "", "de"},
        {"en, de", "de", "en"},
        {"de;q=1.000 , en;q=0.999", "", "de"},
        {"fr, *", "de", "de"},
        {"de;q=0", "de", "en"},
        {"de;q=0, en;q=0.1", "de", "en"},
        {"de;q=2, en;q=0.1", "", "en"},
        {"de;q=0.12345, en;q=0.1", "", "en"},
        {"de;level=1;q=0.3, en;q=0.2", "", "de"},
        {";;,,q=,de;q", "", "de"},
    };
    for (const auto& [header, setting, code] : cases) {
        EXPECT_STREQ(vexo::chooseLanguage(header, setting), code) << header << " and " << setting;
    }
}

class LanguageTest : public support::ApplianceTest {
 protected:
    void TearDown() override {
        unsetenv("HTTP_ACCEPT_LANGUAGE");
        unsetenv("HTTP_COOKIE");
        ApplianceTest::TearDown();
    }
};

TEST_F(LanguageTest, TablesOfTexts) {
    writeRootFile("/usr/vexo/texts/en/filetable.conf", "name=\"Name\"\nsay=\"\"Hi\"\"\n");
    writeRootFile("/usr/vexo/texts/de/filetable.conf", "name=\"Gr\xC3\xB6\xC3\x9F\x65\"\n");
    writeRootFile("/usr/vexo/texts/en/other.conf", "a=b\n");
    setSetting("language", "de");
    EXPECT_STREQ(VexoCgiSelectDefLang(), "de");
    setenv("HTTP_ACCEPT_LANGUAGE", "en-GB", 1);
    PVEXOSTRINGS bundle = VexoCgiStringBundleOpen("filetable");
    EXPECT_STREQ(VexoCgiStringBundleGet(bundle, "say"), "\"Hi\"");
    EXPECT_EQ(VexoCgiStringBundleGet(bundle, "none"), nullptr);
    VexoCgiStringBundleClose(bundle);
    unsetenv("HTTP_ACCEPT_LANGUAGE");
    bundle = VexoCgiStringBundleOpen("filetable");
    EXPECT_STREQ(VexoCgiStringBundleGet(bundle, "name"), "Gr\xC3\xB6\xC3\x9F\x65");
    VexoCgiStringBundleClose(bundle);
    bundle = VexoCgiStringBundleOpen("other");
    EXPECT_STREQ(VexoCgiStringBundleGet(bundle, "a"), "b") << "English where a language has no table";
    VexoCgiStringBundleClose(bundle);
    EXPECT_EQ(VexoCgiStringBundleOpen("none"), nullptr);
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    for (const char* name : {"", "../en/other", "other.conf", "a b", static_cast<const char*>(nullptr)}) {
        EXPECT_EQ(VexoCgiStringBundleOpen(name), nullptr);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_PARAMETER);
    }
    EXPECT_EQ(VexoCgiStringBundleGet(nullptr, "a"), nullptr);
    VexoCgiStringBundleClose(nullptr);
}

TEST_F(LanguageTest, RequestRecordsAndSalts) {
    setenv("HTTP_COOKIE", "a=1; id=abc=d ;id=2;; x", 1);
    _tag_VexoCgi request;
    ASSERT_EQ(VexoCgiInit(&request), 0);
    EXPECT_EQ(request.szLockFile, request.szRecordFile + ".lock");
    EXPECT_STREQ(VexoCgiGetInCookies(&request, "id"), "abc=d");
    EXPECT_EQ(VexoCgiGetInCookies(&request, "x"), nullptr);
    EXPECT_EQ(VexoCgiGetInCookies(nullptr, "id"), nullptr);
    EXPECT_EQ(VexoCgiInit(nullptr), -1);

    std::set<char> salts;
    for (long number = -100; number < 100; ++number) salts.insert(VEXOUserRandomNumMap2Seed(number));
    EXPECT_EQ(salts.size(), 63U);
    for (const char salt : salts) EXPECT_TRUE(isalnum(salt) != 0 || salt == '.') << salt;
}

}  // namespace
