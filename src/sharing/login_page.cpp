#include "sharing/login_page.h"

#include <cstddef>

namespace orvel {
namespace {

constexpr std::size_t kLongestTitle = 254;

// Between braces what is filled in. Kept as it stands: the first two lines in one, the second content type behind the
// head, styles and scripts between head and body, addresses with and without "v=".
constexpr std::string_view kPage =
    "    <!DOCTYPE html>    <html>\n"
    "    <head>\n"
    "    \t<meta http-equiv='Content-Type' content='text/html; charset=utf-8'>\n"
    "        <meta http-equiv='X-UA-Compatible' content='IE=9' />\n"
    "\t\t<title>{title}</title>\n"
    "\t\t<script type='text/javascript' src='{tunnel}/webman/vexodefs.cgi?v={version}'></script>\n"
    "\t\t<script type='text/javascript' src='{tunnel}/scripts/uistrings.cgi?lang={language}&{version}'></script>\n"
    "\t\t<script type='text/javascript' src='{tunnel}/orvel/webUI/uistrings.cgi?lang={language}&{version}'></script>\n"
    "\t\t<script type='text/javascript' src='{tunnel}/webman/uistrings.cgi?lang={language}&{version}'></script>\n"
    "    \t<script type='text/javascript'>var g_Lang = '{language}';</script>\n"
    "    \t<script type='text/javascript'>var g_Tunnel = '{tunnel}';</script>\n"
    "    \t<script type='text/javascript'>var g_Version = '{version}';</script>\n"
    "    \t<script type='text/javascript'>var g_MD5 = '{check}';</script>\n"
    "    \t<script type='text/javascript'>var g_FolderPath = '{path}';</script>\n"
    "    </head>\n"
    "<meta http-equiv='Content-Type' content='text/html; charset=utf-8'>\n"
    "<link rel='stylesheet' type='text/css' href='{tunnel}/scripts/ext-3/resources/css/ext-all.css?v={token}' />\n"
    "<link rel='stylesheet' type='text/css' "
    "href='{tunnel}/scripts/ext-3/resources/css/xtheme-gray-vexo.css?v={token}' />\n"
    "<link rel='stylesheet' type='text/css' href='{tunnel}/webman/resources/css/desktop.css?v={token}' />\n"
    "<link rel='stylesheet' type='text/css' href='{tunnel}/webman/resources/css/flexcrollstyles.css?v={token}' />\n"
    "<link rel='stylesheet' type='text/css' href='{tunnel}/webman/modules/Pexlander/style.css?v={token}' />\n"
    "<link rel='stylesheet' type='text/css' "
    "href='{tunnel}/webman/modules/Pexlander/orvel/folderSharing/style.css?v={token}' />\n"
    "<script type='text/javascript' src='{tunnel}/scripts/ext-3/adapter/ext/ext-base.js?{token}'></script>\n"
    "<script type='text/javascript' src='{tunnel}/scripts/ext-3/ext-all.js?{token}'></script>\n"
    "<script type='text/javascript' src='{tunnel}/scripts/ext-3/ux/ux-all.js?{token}'></script>\n"
    "<script type='text/javascript' src='{tunnel}/scripts/scrollbar/flexcroll.js?v={token}'></script>\n"
    "<script type='text/javascript' "
    "src='{tunnel}/webman/modules/Pexlander/FolderSharingLoader.js?{token}'></script>\n"
    "<body>\n"
    "</body></html>\n";

// For a script's string between quotes. Kept: only quotes and backslashes, nothing of what HTML would need.
std::string escaped(std::string_view path) {
    std::string out;
    out.reserve(path.size());
    for (const char c : path) {
        if (c == '\'' || c == '\\' || c == '"') out += '\\';
        out += c;
    }
    return out;
}

std::string valueOf(std::string_view place, const LoginPage& page) {
    if (place == "tunnel") return page.tunnel;
    if (place == "version") return page.version;
    if (place == "token") return page.version + page.suffix;
    if (place == "language") return page.language();
    if (place == "check") return page.checkValue;
    if (place == "path") return escaped(page.folderPath);
    return std::string(pageTitle(page.folderPath));
}

}  // namespace

std::string_view pageTitle(std::string_view folderPath) {
    const std::size_t slash = folderPath.rfind('/');
    const std::string_view last = slash == std::string_view::npos ? "" : folderPath.substr(slash + 1);
    return (last.empty() ? folderPath : last).substr(0, kLongestTitle);
}

std::string pageText(const LoginPage& page) {
    std::string out;
    std::string_view rest = kPage;
    while (true) {
        const std::size_t open = rest.find('{');
        out += rest.substr(0, open);
        if (open == std::string_view::npos) return out;
        const std::size_t close = rest.find('}', open);
        out += valueOf(rest.substr(open + 1, close - open - 1), page);
        rest.remove_prefix(close + 1);
    }
}

}  // namespace orvel
