#include "sharing/login_page.h"

#include "sharing/link_window.h"
#include "support/testing.h"

using namespace orvel;

namespace {

TEST(LinkWindowTest, BothFormsOfAnEndDateAndBothEnds) {
    for (const auto& [available, expires, now, within] :
         rowsOf<std::int64_t, std::int64_t, std::int64_t, bool>("sharing/windows"))
        EXPECT_EQ(isWithin({available, expires}, now), within) << available << " " << expires << " " << now;
}

TEST(LoginPageTest, Titles) {
    const std::string longName(300, 'x');
    for (const auto& [path, title] : Rows<std::string, std::string>{
             row("/photo/2012", "2012"), row("/photo/2012/", "/photo/2012/"), row("photo", "photo"), row("/", "/"),
             row("/photo/" + longName, longName.substr(0, 254)), row(longName + "/", longName.substr(0, 254))})
        EXPECT_EQ(pageTitle(path), title);
}

}  // namespace
