// The plain CGI way: one process for one request, started by the web server under the program's name.
#include <sqlite3.h>

#include <cstdio>
#include <string_view>

#include "program/program.h"

int main(int count, char** words) {
    sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0);  // nobody reads the count, which takes a lock for each allocation
    const std::string_view called = count > 0 ? words[0] : "";
    const auto* program = orvel::cgi::findProgram(called.substr(called.rfind('/') + 1));
    if (program != nullptr) return orvel::cgi::serveRequest(*program);
    std::fputs("orvel-cgi: to be started by the name of a program:", stderr);
    for (const auto& known : orvel::cgi::programs()) {
        std::fprintf(stderr, " %.*s", static_cast<int>(known.name.size()), known.name.data());
    }
    std::fputs("\n", stderr);
    return 2;
}
