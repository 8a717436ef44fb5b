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

// `variables` are added to this process's environment; an empty value removes one.
Finished runProgram(const std::vector<std::string>& words, const std::map<std::string, std::string>& variables = {});

// A reply taken apart. The constructor fails the test unless it is one: header lines, then JSON that is valid UTF-8.
struct CgiReply {
    explicit CgiReply(const std::string& output);
    int status = 0;
    std::map<std::string, std::string> headers;
    Json::Value json;
};

}  // namespace support

#endif
