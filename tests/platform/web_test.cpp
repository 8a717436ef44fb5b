// One web request: its fields, cookies and header, and what of a body is refused.
#include "vexo/web.h"

#include <cstdio>

#include "support/testing.h"
#include "vexo/web_record.h"
#include "web/cgi_text.h"

namespace {

TEST(CgiText, FormsAndCookies) {
    for (const auto& [encoded, decoded] : Rows<const char*, const char*>{
             row("a+b%20c%2Bd", "a b c+d"), row("%2fphoto%2F%C3%A9", "/photo/\xC3\xA9"), row("%00", "%00"),
             row("a%2", "a%2"), row("%", "%"), row("%zz%41", "%zzA"), row("%2541", "%41")})
        EXPECT_EQ(vexo::decodeFormText(encoded), decoded) << encoded;
    vexo::FormFields fields;
    vexo::parseForm("a=1&&b=x%3Dy=z&c&=d&a=2", fields);
    const vexo::FormFields expected = {{"a", "1"}, {"b", "x=y=z"}, {"c", ""}, {"", "d"}, {"a", "2"}};
    EXPECT_EQ(fields, expected);
    for (const auto& [header, value] : Rows<const char*, const char*>{
             row("x=0;  id = 1 ;id=2", "1"), row("id=a=b", "a=b"), row("id=", ""), row("id; id=1", "1")})
        EXPECT_EQ(vexo::findCookie(header, "id"), value) << header;
    for (const char* header : {"", "id", "xid=1; ID=2", ";;=;"}) EXPECT_FALSE(vexo::findCookie(header, "id")) << header;
}

TEST(CgiText, ParseToArray) {
    Json::Value expected(Json::arrayValue);
    for (const char* piece : {"", "a:b", "", "c"}) expected.append(piece);
    EXPECT_EQ(VEXO::WebAPIUtil::ParseToArray("::a:b::::c", "::"), expected);
    EXPECT_EQ(VEXO::WebAPIUtil::ParseToArray("a,b", "")[0], "a,b");
}

class WebRequest : public ApplianceTest {
 protected:
    // Runs `body` in a process that was started as a CGI program with this body of the request.
    static void post(const std::string& type, const std::string& length, const std::string& text,
                     const std::function<void()>& body) {
        const std::string file = systemRoot() + "/body";
        writeFile(file, text);
        SCOPED_TRACE(type + " " + length);
        inChild([&] {
            setenv("REQUEST_METHOD", "POST", 1);
            setenv("CONTENT_TYPE", type.c_str(), 1);
            setenv("CONTENT_LENGTH", length.c_str(), 1);
            setenv("QUERY_STRING", "a=query", 1);
            dup2(open(file.c_str(), O_RDONLY | O_CLOEXEC), STDIN_FILENO);
            body();
        });
    }
};

TEST_F(WebRequest, FieldsOfQueryAndBody) {
    const std::string form = "a=body&b=%2Fphoto";
    post("APPLICATION/X-www-form-urlencoded; charset=UTF-8", std::to_string(form.size()), form + "ignored", [] {
        const VEXO::WebCGI web;
        EXPECT_EQ(web.GetParam("a", "none"), "query") << "query before body";
        EXPECT_EQ(web.GetParam("b", "none"), "/photo");
        EXPECT_EQ(web.GetParam("c", "none"), "none");
    });
    for (const char* type : {"multipart/form-data; boundary=x", "application/x-www-form-urlencodedx", ""})
        post(type, std::to_string(form.size()), form, [] {
            const VEXO::WebCGI web;
            EXPECT_FALSE(web.BodyRefused());
            EXPECT_FALSE(web.HasParam("b"));
            char next = 0;
            EXPECT_EQ(read(STDIN_FILENO, &next, 1), 1) << "another body is the program's to read";
        });
}

TEST_F(WebRequest, ABodyThatIsNotWholeOrTooLongIsRefused) {
    const size_t limit = size_t{1} << 20;
    const std::string longest = "b=" + std::string(limit - 2, 'x');
    for (const auto& [length, text, refused] : Rows<std::string, std::string, bool>{
             row("", "", false), row("0", "", false), row(std::to_string(limit), longest, false),
             row(std::to_string(limit + 1), longest + "x", true), row("99999999999999999999", "b=1", true),
             row("-1", "b=1", true), row("3x", "b=1", true), row("4", "b=1", true),
             row("4", std::string("b=\0x", 4), true)})
        post("application/x-www-form-urlencoded", length, text, [refuse = refused, taken = !refused && !text.empty()] {
            const VEXO::WebCGI web;
            EXPECT_EQ(web.BodyRefused(), refuse);
            EXPECT_EQ(web.HasParam("b"), taken);
            EXPECT_EQ(web.GetParam("a", "none"), "query");
        });
}

TEST_F(WebRequest, HeaderWithCookies) {
    const std::string file = systemRoot() + "/reply";
    inChild([&] {
        VEXO::WebCGI web;
        EXPECT_TRUE(web.AddCookieToHeader("/", "link-1", "a b"));
        EXPECT_TRUE(web.AddCookieToHeader("", "x", ""));
        for (const char* name : {"", "a b", "a=b", "a\n", "\xC3\xA9"})
            EXPECT_FALSE(web.AddCookieToHeader("/", name, "v")) << name;
        for (const char* text : {"a\r\nSet-Cookie: x=y", "a;b", "a,b", "\x7F"}) {
            EXPECT_FALSE(web.AddCookieToHeader("/", "n", text)) << text;
            EXPECT_FALSE(web.AddCookieToHeader(text, "n", "v")) << text;
        }
        fflush(stdout);
        dup2(open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600), STDOUT_FILENO);
        web.WriteHeader("text/html; charset=UTF-8");
        fflush(stdout);
    });
    EXPECT_EQ(readFile(file),
              "Set-Cookie: link-1=a b; Path=/; HttpOnly; SameSite=Lax\r\n"
              "Set-Cookie: x=; HttpOnly; SameSite=Lax\r\nContent-Type: text/html; charset=UTF-8\r\n\r\n");
}

}  // namespace
