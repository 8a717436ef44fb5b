// The programs, one table of them, and the one way in which a request reaches its program.
#ifndef ORVEL_CGI_PROGRAM_PROGRAM_H
#define ORVEL_CGI_PROGRAM_PROGRAM_H

#include <cstdint>
#include <span>
#include <string_view>

#include "output.h"
#include "request.h"

namespace orvel::cgi {

enum class Caller {
    kUser,    // who is logged in and may use the file manager; requests from other sites' pages are refused
    kAnybody  // the program itself decides
};

struct Program {
    std::string_view name;
    std::string_view methods;  // as the header Allow lists them
    std::int64_t bodyLimit;    // bytes; what is announced as longer is refused unread
    Caller caller;
    bool endsWithClient;  // until it replies: nobody waits for what it does but who asked
    void (*serve)(Request& request, Output& out);
};

std::span<const Program> programs();
// Null when there is no program of that name.
const Program* findProgram(std::string_view name);

// Answers the request that the environment and standard input describe: asks what the table says (405 for a method that
// the program does not take, 413 for too long a body), then lets the program write its reply to `out`.
void answer(const Program& program, Output& out);

// answer() with the reply on standard output; `beginning` is called before the first of it is written. Returns the exit
// status of a process that has served one request.
int serveRequest(const Program& program, void (*beginning)() = nullptr);

// What stands in the table, each in the folder of its name.
void serveLogInProgram(Request& request, Output& out);
void serveLogOutProgram(Request& request, Output& out);
void serveSessionsProgram(Request& request, Output& out);
void serveListProgram(Request& request, Output& out);
void serveDownloadProgram(Request& request, Output& out);
void serveLinkProgram(Request& request, Output& out);
void serveOperationProgram(Request& request, Output& out);
void servePreferencesProgram(Request& request, Output& out);
void serveSearchProgram(Request& request, Output& out);
void serveSendProgram(Request& request, Output& out);
void serveShareProgram(Request& request, Output& out);
void serveThumbnailProgram(Request& request, Output& out);
void serveTusProgram(Request& request, Output& out);
void serveUploadProgram(Request& request, Output& out);
void serveWhyProgram(Request& request, Output& out);

}  // namespace orvel::cgi

#endif
