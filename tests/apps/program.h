// Runs a program as a web server or a shell would.
#ifndef ORVEL_TESTS_APPS_PROGRAM_H
#define ORVEL_TESTS_APPS_PROGRAM_H

#include <json/value.h>
#include <json/writer.h>  // failures print values

#include <map>
#include <string>
#include <vector>

namespace support {

struct Finished {
    int status = -1;  // exit status, 128 + the signal's number
    std::string output;
};

using Variables = std::map<std::string, std::string>;

// `variables` are added to this process's environment; an empty value removes one. `input` is what the program finds on
// its standard input.
Finished runProgram(const std::vector<std::string>& words, const Variables& variables = {},
                    const std::string& input = "");

// Runs orvelctl.
Finished orvelctl(std::vector<std::string> words);
// What strict JSON says; anything else fails the test.
Json::Value jsonOf(const std::string& text);

// Runs a program for a user who is logged in, as plain CGI, with `input` as body of the request.
Finished finishCgi(const std::string& program, const std::string& user, const std::string& method,
                   const std::string& query, const std::string& input = "", const Variables& more = {});
// The same for one that is expected to end well: its output. Where the variable ORVEL_TEST_THROUGH_ORVELD is set it
// goes through an orveld.
std::string runCgi(const std::string& program, const std::string& user, const std::string& method,
                   const std::string& query, const std::string& input = "", const Variables& more = {});

// A reply cut into its header lines and its body.
struct RawReply {
    explicit RawReply(const std::string& output);
    int status = 0;
    Variables headers;
    std::string body;
};

// A reply taken apart. The constructor fails the test unless it is one: header lines, then JSON that is valid UTF-8.
struct CgiReply : RawReply {
    explicit CgiReply(const std::string& output);
    Json::Value json;
};

}  // namespace support

#endif
