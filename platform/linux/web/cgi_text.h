// The texts of a web request: forms and cookies. Pure but for what asks the environment.
#ifndef VEXO_LINUX_CGI_TEXT_H
#define VEXO_LINUX_CGI_TEXT_H

#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace vexo {

// Without blanks and tabs at both ends.
std::string_view trimBlanks(std::string_view text);
// Takes the piece up to the next `separator`, which goes too, off `text`.
std::string_view takePiece(std::string_view& text, char separator);

using FormFields = std::vector<std::pair<std::string, std::string>>;

// Percent escapes to bytes, "+" to a blank. A broken escape stays as it is, and so does "%00": no name or text
// of the appliance holds a NUL, and a text that is cut there would be another one than the one that was checked.
std::string decodeFormText(std::string_view text);

// Appends the fields of "a=1&b=2", decoded, in their order. A piece without "=" is a field with an empty value.
void parseForm(std::string_view text, FormFields& fields);

// The cookies of a Cookie header, names and values as they stand, in their order.
std::vector<std::pair<std::string, std::string>> parseCookies(std::string_view header);

// Whether the request came by HTTPS, as the environment says.
bool isSecureRequest();
// How the browser calls the cookie "id" of a session. By HTTPS it is one that no other host, and nobody who speaks to
// the browser without HTTPS, can set.
std::string sessionCookieName();
// Whatever is asked for as "id" is called sessionCookieName() in the header.
std::string cookieNameOf(const std::string& name);

// The value of the first cookie of that name in a Cookie header.
std::optional<std::string> findCookie(std::string_view header, std::string_view name);

// True for what may be the name of a cookie (a token).
bool isCookieName(std::string_view text);
// True for what may be a cookie's value or path: no control bytes, ";" or ",".
bool isCookieText(std::string_view text);

}  // namespace vexo

#endif
