// What every program does before its own work: who asks, as whom it acts, and what the parameters say.
#ifndef ORVEL_CGI_REQUEST_H
#define ORVEL_CGI_REQUEST_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "orvel/dir_entry.h"
#include "reply.h"
#include "vexo/web.h"

namespace orvel::cgi {

// The logged-in user of a request.
struct User {
    std::string name;
    std::string sid;     // login session
    std::string cookie;  // what the reply must set, "" for nothing
};

// A request on its way to its program.
struct Request {
    const User& user;  // nobody, with a program that anybody may call
    VEXO::WebCGI& web;
};

// Leaves the client's address, where trusted proxies handed the request on, as the only text of the environment
// variable HTTP_X_FORWARDED_FOR, and removes it, and HTTP_CLIENT_IP, elsewhere: anybody can send such headers. The
// setting "trusted_proxies" lists the addresses of proxies whose word counts, comma-separated; that the client came to
// them by HTTPS (X-Forwarded-Proto) makes HTTPS "on".
void settleClientAddress();

// The client's address, once that was called; "" where nobody says.
std::string clientAddress();

// Whether a page of another site sends the request. Browsers add the log-in by themselves, whoever makes them ask, but
// say whose page it was where something could be changed.
bool isForeign();

// Whether the request says that it is meant for another user than `user`: the header Orvel-User names one, as a page
// does that must not act for whoever has logged in by now.
bool isMeantForAnother(const std::string& user);

// Logs the request in through the platform's session and asks for the file manager's application privilege. kOk with
// `user` filled, kNotLoggedIn or kForbidden.
Status admit(User& user);

// Both of the above; what another site's page sends is refused.
// False once the refusal is written to `out`.
bool begin(Output& out, User& user);

// Takes on the user's identity for the rest of the process; `sid` may be null. His home folder is made first when
// `needsHome`, as the folder that holds all homes is not his to write in. 0, or the library code of the failure; a
// process that is still root's, or kept a group of root's, although the user is no administrator is one, 401.
int actAs(const char* sid, const std::string& user, bool needsHome);

// The status of a request that was refused with the library code: 400 for a parameter, however late it showed.
Status statusOf(int code);

// A parameter that is a number: `fallback` when absent, nothing when it is anything but decimal digits that fit.
std::optional<unsigned long> numberParam(const VEXO::WebCGI& cgi, const char* name, unsigned long fallback);
std::optional<unsigned long> parseNumber(std::string_view text);

// Whether the request is a POST: a link that somebody follows must change nothing.
bool isPosted();

// "filetype": "dir", "file" or "all" (default); "sort_direction": true for "asc" (default), false for "desc". Nothing
// for any other word.
std::optional<_tag_dir_entry_type_> typeParam(const VEXO::WebCGI& cgi);
std::optional<bool> ascendingParam(const VEXO::WebCGI& cgi);

// A name or path in a request: parameter `name` + "_raw", percent-encoded once more so that its bytes can be anything,
// or `name` itself. Nothing for what cannot be one: a NUL byte or a broken "%".
std::optional<std::string> bytesParam(const VEXO::WebCGI& cgi, const std::string& name);
// The share-relative path of a request, "path_raw" or "path".
std::optional<std::string> pathParam(const VEXO::WebCGI& cgi);
// The lines of a parameter, however they end; without the empty ones.
std::vector<std::string> linesParam(const VEXO::WebCGI& cgi, const char* name);
// Those of a request that takes several: of "paths_raw", every "path_raw", then every "path". "paths_raw" is a list for
// thousands: percent-encoded like "path_raw", one a line, where a line without a "/" is a name in the folder of the
// line before. Nothing when one cannot be a path.
std::optional<std::vector<std::string>> pathParams(const VEXO::WebCGI& cgi);

}  // namespace orvel::cgi

#endif
