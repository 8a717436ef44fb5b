// Any query, form and Cookie header: no byte comes out that did not go in, and the first cookie of a name counts.
#include <algorithm>

#include "check.h"
#include "web/cgi_text.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view input = fuzz::text(data, size);
    const auto nulls = [](std::string_view text) { return std::count(text.begin(), text.end(), '\0'); };
    const std::string decoded = vexo::decodeFormText(input);
    fuzz::require(decoded.size() <= input.size() && nulls(decoded) <= nulls(input));

    vexo::FormFields fields;
    vexo::parseForm(input, fields);
    std::size_t bytes = 0;
    for (const auto& [name, value] : fields) bytes += name.size() + value.size();
    fuzz::require(bytes <= input.size() && fields.size() <= input.size() + 1);

    const auto cookies = vexo::parseCookies(input);
    for (const auto& [name, value] : cookies) {
        const auto first =
            std::find_if(cookies.begin(), cookies.end(), [&key = name](const auto& one) { return one.first == key; });
        fuzz::require(vexo::findCookie(input, name) == first->second);
        fuzz::require(input.find(name) != std::string_view::npos && input.find(value) != std::string_view::npos);
    }
    static_cast<void>(vexo::isCookieName(input));
    static_cast<void>(vexo::isCookieText(input));
    return 0;
}
