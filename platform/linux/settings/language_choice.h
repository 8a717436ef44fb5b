// Which language a request gets. Pure.
#ifndef VEXO_LINUX_LANGUAGE_CHOICE_H
#define VEXO_LINUX_LANGUAGE_CHOICE_H

#include <string_view>

namespace vexo {

constexpr const char* kEnglish = "en";

// The code for an Accept-Language header and the setting "language": a literal.
const char* chooseLanguage(std::string_view acceptLanguage, std::string_view setting);

}  // namespace vexo

#endif
