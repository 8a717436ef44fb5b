#include "sharing/login_page.h"

#include <limits>

#include "sharing/link_window.h"
#include "support/testing.h"

using namespace orvel;

namespace {

TEST(LinkWindowTest, BothFormsOfAnEndDateAndBothEnds) {
    constexpr std::int64_t kDay = 1700006400;  // a day's first second
    constexpr std::int64_t kMax = std::numeric_limits<std::int64_t>::max();
    constexpr std::int64_t kMin = std::numeric_limits<std::int64_t>::min();
    for (const auto& [available, expires, now, within] : Rows<std::int64_t, std::int64_t, std::int64_t, bool>{
             {kDay + 500, 0, kDay, true},  // no window, whatever the begin
             {kDay, kDay, kDay, true},
             {kDay, kDay, kDay - 1, false},
             {kDay, kDay, kDay + 86399, true},
             {kDay, kDay, kDay + 86400, false},
             {kDay, kDay + 86399, kDay + 86399, true},  // the day's last second means the same
             {kDay, kDay + 86399, kDay + 86400, false},
             {kDay, kDay + 10, kDay + 86409, true},  // any multiple of 10 is a first second
             {0, 86399, kDay, true},                 // the last second of the first day of all: 0 again
             {0, kMax - 7, kDay, true},
             {0, kMin, kDay, false},
             {0, -1, kDay, false},
         }) {
        EXPECT_EQ(isWithin({available, expires}, now), within) << available << " " << expires << " " << now;
    }
}

TEST(LoginPageTest, Titles) {
    const std::string longName(300, 'x');
    for (const auto& [path, title] : Rows<std::string, std::string>{
             row("/photo/2012", "2012"), row("/photo/2012/", "/photo/2012/"), row("photo", "photo"), row("/", "/"),
             row("/photo/" + longName, longName.substr(0, 254)), row(longName + "/", longName.substr(0, 254))}) {
        EXPECT_EQ(pageTitle(path), title);
    }
}

TEST(LoginPageTest, ThePageByteForByte) {
    static int asked;
    asked = 0;
    const LoginPage page = {.tunnel = "/t{path}",
                            .version = "1700",
                            .suffix = "42",
                            .checkValue = "c'h</script>",
                            .folderPath = "/photo/a'b\\c\"d<{tunnel}>\n&\xFF",
                            .language = [] { return "l" + std::to_string(++asked); }};
    const std::string wanted = R"(    <!DOCTYPE html>    <html>
    <head>
    )"
                               "\t"
                               R"(<meta http-equiv='Content-Type' content='text/html; charset=utf-8'>
        <meta http-equiv='X-UA-Compatible' content='IE=9' />
		<title>a'b\c"d<{tunnel}>
&)"
                               "\xFF"
                               R"(</title>
		<script type='text/javascript' src='/t{path}/webman/vexodefs.cgi?v=1700'></script>
		<script type='text/javascript' src='/t{path}/scripts/uistrings.cgi?lang=l1&1700'></script>
		<script type='text/javascript' src='/t{path}/orvel/webUI/uistrings.cgi?lang=l2&1700'></script>
		<script type='text/javascript' src='/t{path}/webman/uistrings.cgi?lang=l3&1700'></script>
    	<script type='text/javascript'>var g_Lang = 'l4';</script>
    	<script type='text/javascript'>var g_Tunnel = '/t{path}';</script>
    	<script type='text/javascript'>var g_Version = '1700';</script>
    	<script type='text/javascript'>var g_MD5 = 'c'h</script>';</script>
    	<script type='text/javascript'>var g_FolderPath = '/photo/a\'b\\c\"d<{tunnel}>
&)"
                               "\xFF"
                               R"(';</script>
    </head>
<meta http-equiv='Content-Type' content='text/html; charset=utf-8'>
<link rel='stylesheet' type='text/css' href='/t{path}/scripts/ext-3/resources/css/ext-all.css?v=170042' />
<link rel='stylesheet' type='text/css' href='/t{path}/scripts/ext-3/resources/css/xtheme-gray-vexo.css?v=170042' />
<link rel='stylesheet' type='text/css' href='/t{path}/webman/resources/css/desktop.css?v=170042' />
<link rel='stylesheet' type='text/css' href='/t{path}/webman/resources/css/flexcrollstyles.css?v=170042' />
<link rel='stylesheet' type='text/css' href='/t{path}/webman/modules/Pexlander/style.css?v=170042' />
<link rel='stylesheet' type='text/css' href='/t{path}/webman/modules/Pexlander/orvel/folderSharing/style.css?v=170042' />
<script type='text/javascript' src='/t{path}/scripts/ext-3/adapter/ext/ext-base.js?170042'></script>
<script type='text/javascript' src='/t{path}/scripts/ext-3/ext-all.js?170042'></script>
<script type='text/javascript' src='/t{path}/scripts/ext-3/ux/ux-all.js?170042'></script>
<script type='text/javascript' src='/t{path}/scripts/scrollbar/flexcroll.js?v=170042'></script>
<script type='text/javascript' src='/t{path}/webman/modules/Pexlander/FolderSharingLoader.js?170042'></script>
<body>
</body></html>
)";
    EXPECT_EQ(pageText(page), wanted);
}

}  // namespace
