// One web request as the CGI environment gives it.
#ifndef VEXO_WEB_H
#define VEXO_WEB_H

#include <json/value.h>

#include <string>
#include <vector>

#include "vexo/export.h"

namespace VEXO {

class VEXO_API WebCGI {
 public:
    // Reads QUERY_STRING and HTTP_COOKIE, and from standard input the body of a POST of type
    // application/x-www-form-urlencoded: as many bytes as CONTENT_LENGTH says, at most 1 MiB. A longer one is not read;
    // then, and for one that is cut short or holds a NUL byte, BodyRefused() is true and no field of it counts.
    WebCGI();
    // The same for a body of at most `longestForm` bytes.
    explicit WebCGI(unsigned long longestForm);
    ~WebCGI();
    WebCGI(const WebCGI&) = delete;
    WebCGI& operator=(const WebCGI&) = delete;

    // The first value of the parameter, percent-decoded ("+" is a blank; "%00" and broken escapes stay as they are);
    // `def` when absent. Query before body.
    std::string GetParam(const std::string& name, const std::string& def) const;
    // Every value of the parameter, in the order of the request.
    std::vector<std::string> GetParams(const std::string& name) const;
    bool HasParam(const std::string& name) const;
    bool BodyRefused() const;
    // The value of the first cookie of that name, `def` when absent ("id" answers for "__Host-id" by HTTPS).
    std::string GetCookie(const std::string& name, const std::string& def) const;
    // Keeps a Set-Cookie header for WriteHeader ("name=value; Path=...; HttpOnly; SameSite=Lax", and "; Secure" in a
    // request by HTTPS). False, and nothing kept, for a name that is no cookie token or a value
    // or path with control bytes, ";" or ",".
    bool AddCookieToHeader(const std::string& path, const std::string& name, const std::string& value);
    // Writes the response header to standard output: the kept cookies and the content type, then the empty line.
    void WriteHeader(const std::string& type);

 private:
    struct Impl;
    Impl* impl_;
};

namespace WebAPIUtil {
// Cuts `text` at each `separator` into an array of strings; empty pieces are kept, so an empty text gives one of them.
// A null text gives an empty array, a null or empty separator the whole text.
VEXO_API Json::Value ParseToArray(const char* text, const char* separator);
}  // namespace WebAPIUtil

}  // namespace VEXO

#endif
