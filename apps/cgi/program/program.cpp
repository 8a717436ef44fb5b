#include "program/program.h"

#include <sys/stat.h>
#include <unistd.h>

#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <limits>
#include <string>

#include "text.h"
#include "vexo/process.h"
#include "vexo/web.h"

namespace orvel::cgi {
namespace {

constexpr std::int64_t kForm = std::int64_t{1} << 20;
constexpr std::int64_t kLongForm = std::int64_t{16} << 20;  // a hundred thousand paths
constexpr std::int64_t kAnyLength = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kSmallForm = std::int64_t{64} << 10;     // a name, and a password of any length that is one
constexpr std::int64_t kPreferences = std::int64_t{256} << 10;  // percent-encoded up to three times as long
constexpr std::string_view kAsking = "GET, HEAD, POST";

constexpr Program kPrograms[] = {
    {"list", kAsking, kForm, Caller::kUser, true, serveListProgram},
    {"download", kAsking, kLongForm, Caller::kUser, true, serveDownloadProgram},
    {"link", kAsking, kForm, Caller::kUser, false, serveLinkProgram},
    {"login", kAsking, kSmallForm, Caller::kAnybody, false, serveLogInProgram},
    {"logout", "POST", kSmallForm, Caller::kAnybody, false, serveLogOutProgram},
    {"operation", kAsking, kForm, Caller::kUser, false, serveOperationProgram},
    {"preferences", kAsking, kPreferences, Caller::kUser, false, servePreferencesProgram},
    {"search", kAsking, kForm, Caller::kUser, false, serveSearchProgram},
    {"send", "POST, PUT", kAnyLength, Caller::kAnybody, false, serveSendProgram},
    {"sessions", "GET, HEAD", kForm, Caller::kAnybody, true, serveSessionsProgram},
    {"share", kAsking, kForm, Caller::kAnybody, false, serveShareProgram},
    {"thumbnail", kAsking, kForm, Caller::kUser, true, serveThumbnailProgram},
    {"tus", "OPTIONS, GET, HEAD, POST, PATCH, DELETE", kAnyLength, Caller::kUser, false, serveTusProgram},
    {"upload", "POST, PUT", kAnyLength, Caller::kUser, false, serveUploadProgram},
    {"why", kAsking, kForm, Caller::kUser, true, serveWhyProgram}};

std::string_view variable(const char* name) {
    const char* value = getenv(name);
    return value == nullptr ? std::string_view() : value;
}

bool takes(const Program& program, std::string_view method) {
    for (std::string_view rest = program.methods; !rest.empty();) {
        const size_t end = std::min(rest.find(", "), rest.size());
        if (rest.substr(0, end) == method) return true;
        rest.remove_prefix(std::min(end + 2, rest.size()));
    }
    return false;
}

// A length that is not a number is the program's to refuse, and so is any where there is no limit.
bool announcesTooMuch(const Program& program) {
    if (program.bodyLimit == kAnyLength) return false;
    const auto length = parseNumber(variable("CONTENT_LENGTH"));
    return length && *length > static_cast<unsigned long>(program.bodyLimit);
}

}  // namespace

std::span<const Program> programs() {
    return kPrograms;
}

const Program* findProgram(std::string_view name) {
    for (const Program& program : kPrograms) {
        if (program.name == name) return &program;
    }
    return nullptr;
}

void answer(const Program& program, Output& out) {
    std::signal(SIGPIPE, SIG_IGN);
    umask(022);  // whatever the web server's is
    if (!takes(program, variable("REQUEST_METHOD"))) {
        out.text() += "Allow: " + std::string(program.methods) + "\r\n";
        return replyFailure(out, Status::kMethodNotAllowed, "", ORV_ERR_PARAMETER, "");
    }
    User user;
    if (program.caller == Caller::kAnybody) {
        settleClientAddress();
    } else if (!begin(out, user)) {
        return;
    }
    if (announcesTooMuch(program)) return replyFailure(out, Status::kTooLarge, user.cookie, ORV_ERR_PARAMETER, "");
    VEXO::WebCGI web(static_cast<unsigned long>(program.bodyLimit == kAnyLength ? kForm : program.bodyLimit));
    if (web.BodyRefused()) return replyFailure(out, Status::kTooLarge, user.cookie, ORV_ERR_PARAMETER, "");
    Request request = {.user = user, .web = web};
    program.serve(request, out);
}

int serveRequest(const Program& program, void (*beginning)()) {
    VEXORequestBegin();
    Output out(STDOUT_FILENO, beginning);
    try {
        answer(program, out);
    } catch (...) {
        // Memory is out. A reply that has begun cannot become another one.
        return 1;
    }
    return out.finish() && std::fflush(stdout) == 0 ? 0 : 1;
}

}  // namespace orvel::cgi
