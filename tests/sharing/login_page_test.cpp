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
         })
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
