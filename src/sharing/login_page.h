// The page that a sharing link opens: no content of its own, only what the visitor's scripts need. Pure.
#ifndef ORVEL_SHARING_LOGIN_PAGE_H
#define ORVEL_SHARING_LOGIN_PAGE_H

#include <string>
#include <string_view>

namespace orvel {

struct LoginPage {
    std::string tunnel;   // in front of every address
    std::string version;  // of the web desktop
    std::string suffix;   // behind the version, "" or a number against caches
    std::string checkValue;
    std::string folderPath;
    std::string (*language)();  // asked at each place that shows it
};

// The title of the page: the last component of the path, or all of it when that is empty; at most 254 bytes.
std::string_view pageTitle(std::string_view folderPath);

std::string pageText(const LoginPage& page);

}  // namespace orvel

#endif
