// What the visitor's page is filled with, and its way to standard output.
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <string>

#include "core/boundary.h"
#include "core/owned.h"
#include "orvel/sharing_link.h"
#include "sharing/login_page.h"
#include "vexo/filesystem.h"
#include "vexo/language.h"
#include "vexo/system_root.h"
#include "vexo/web.h"

namespace orvel {
namespace {

constexpr const char* kWebDesktop = "/usr/vexo/vexoman/webman/";

std::string language() {
    const char* code = VexoCgiSelectDefLang();
    return code == nullptr ? "" : code;
}

void writePage(VEXO::WebCGI& cgi, const std::string& checkValue, const std::string& folderPath) {
    const StringBundle texts(VexoCgiStringBundleOpen("filetable"));  // kept: no text of it is shown
    srand(static_cast<unsigned>(time(nullptr)));
    const std::string suffix = std::to_string(rand() % 1000 + 1);
    const LoginPage page = {.tunnel = cgi.GetParam("tunnel", ""),
                            .version = WebUtils::GetModifyTime(VEXO::SystemPath(kWebDesktop).c_str()),
                            .suffix = cgi.GetParam("noCache", "").empty() ? "" : suffix,
                            .checkValue = checkValue,
                            .folderPath = folderPath,
                            .language = language};
    const std::string text = pageText(page);
    cgi.WriteHeader("text/html; charset=\"UTF-8\"");
    fwrite(text.data(), 1, text.size(), stdout);  // the stream that the header went to
    fflush(stdout);
}

}  // namespace
}  // namespace orvel

void OrvelLogin::FolderSharingLoginManager::WriteWebPage(VEXO::WebCGI& cgi, const std::string& checkValue,
                                                         const std::string& folderPath) {
    orvel::guardedQuietly(0, [&] {
        orvel::writePage(cgi, checkValue, folderPath);
        return 0;
    });
}
