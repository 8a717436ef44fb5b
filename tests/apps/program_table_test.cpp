// What the table of programs decides before a program sees the request.
#include "apps/program.h"
#include "program/program.h"
#include "support/testing.h"

namespace {

using orvel::cgi::Program;

class ProgramTable : public ApplianceTest {
 protected:
    static bool takes(const Program& program, const std::string& method) {
        const std::string methods = ", " + std::string(program.methods) + ",";
        return !method.empty() && method.find(',') == std::string::npos &&
               methods.find(" " + method + ",") != std::string::npos;
    }
    static RawReply ask(const Program& program, const std::string& method, const Variables& more = {},
                        const std::string& user = "alice") {
        const std::string folder = std::string(PROGRAM_LIST).substr(0, std::string(PROGRAM_LIST).rfind('/') + 1);
        return RawReply(runCgi(folder + std::string(program.name), user, method, "", "", more));
    }
};

TEST_F(ProgramTable, EveryProgramTakesItsMethodsAlone) {
    for (const Program& program : orvel::cgi::programs()) {
        for (const std::string method : {"GET", "PUT", "DELETE", "TRACE", "OPTIONS", "PATCH", "get", "GET, HEAD", ""}) {
            const bool taken = takes(program, method);
            RawReply reply = ask(program, method);
            EXPECT_EQ(reply.status == 405, !taken) << program.name << " " << method;
            if (taken) continue;
            EXPECT_EQ(reply.headers["Allow"], program.methods);
            EXPECT_NE(reply.body.find("\"code\":400"), std::string::npos) << reply.body;
        }
    }
}

TEST_F(ProgramTable, NobodyIsServedButByThoseForAll) {
    const std::set<std::string> forAll = {"send", "share", "login", "logout"};
    for (const Program& program : orvel::cgi::programs()) {
        const std::string methods(program.methods);
        const RawReply reply = ask(program, methods.substr(0, methods.find(',')), {}, "");
        EXPECT_EQ(reply.status == 401, forAll.count(std::string(program.name)) == 0) << program.name << reply.body;
    }
}

TEST_F(ProgramTable, ABodyTooLargeIsRefusedUnread) {
    for (const Program& program : orvel::cgi::programs()) {
        if (!takes(program, "POST")) continue;
        const bool bounded = program.name != "upload" && program.name != "tus" && program.name != "send";
        const std::string most = std::to_string(program.bodyLimit);
        const std::string more = bounded ? std::to_string(program.bodyLimit + 1) : most;
        EXPECT_EQ(ask(program, "POST", {{"CONTENT_LENGTH", more}}).status == 413, bounded) << program.name;
        EXPECT_NE(ask(program, "POST", {{"CONTENT_LENGTH", most}}).status, 413) << program.name;
        // A form that was announced, but not sent.
        const Variables form = {{"CONTENT_TYPE", "application/x-www-form-urlencoded"}, {"CONTENT_LENGTH", "9"}};
        EXPECT_EQ(ask(program, "POST", form).status, 413) << program.name;
    }
}

}  // namespace
