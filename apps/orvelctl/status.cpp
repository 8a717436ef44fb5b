// orvelctl status: what orveld does and has done.
#include <json/reader.h>
#include <json/value.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <string>

#include "arguments.h"
#include "command.h"
#include "listener.h"
#include "load_limits.h"
#include "scgi.h"

namespace orvel::ctl {

bool askFigures(const std::string& socket, std::string& body, std::string& error) {
    const int fd = orveld::connectTo(socket);
    if (fd < 0) {
        error = std::strerror(errno);
        return false;
    }
    const std::string block =
        orveld::buildBlock({"CONTENT_LENGTH=0", "SCGI=1", "REQUEST_METHOD=GET",
                            std::string("SCRIPT_NAME=") + orveld::kStatusPath, "QUERY_STRING=format=json"});
    std::string reply;
    char piece[4096];
    if (send(fd, block.data(), block.size(), MSG_NOSIGNAL) == static_cast<ssize_t>(block.size())) {
        for (ssize_t got = 0; (got = read(fd, piece, sizeof piece)) > 0;) reply.append(piece, static_cast<size_t>(got));
    }
    close(fd);
    const size_t end = reply.find("\r\n\r\n");
    error = reply.substr(0, reply.find("\r\n"));
    if (error != "Status: 200 OK" || end == std::string::npos) return false;
    body = reply.substr(end + 4);
    return true;
}

namespace {

bool parse(const std::string& body, Json::Value& figures) {
    const std::unique_ptr<Json::CharReader> reader(Json::CharReaderBuilder().newCharReader());
    std::string errors;
    return reader->parse(body.data(), body.data() + body.size(), &figures, &errors) && figures.isObject();
}

void show(const Json::Value& figures) {
    for (const char* name :
         {"running", "queued", "reading", "served", "refused", "malformed", "crashed", "abandoned"}) {
        std::printf("%-10s %s\n", name, figures[name].asString().c_str());
    }
    std::printf("\n%-12s %12s %10s %10s\n", "program", "served", "p50 ms", "p99 ms");
    const Json::Value& programs = figures["programs"];
    for (const std::string& name : programs.getMemberNames()) {
        const Json::Value& one = programs[name];
        std::printf("%-12s %12s %10.2f %10.2f\n", name.c_str(), one["served"].asString().c_str(),
                    one["p50"].asDouble() * 1000, one["p99"].asDouble() * 1000);
    }
}

}  // namespace

int status(const std::vector<std::string>& words) {
    const Arguments arguments(words, "status", "", 0);
    const std::string socket = arguments.value("--socket", orveld::defaultSocket());
    std::string body, error;
    Json::Value figures;
    if (!askFigures(socket, body, error) || !parse(body, figures)) {
        fprintf(stderr, "orvelctl: orveld at %s does not answer: %s\n", socket.c_str(), terminalText(error).c_str());
        return 1;
    }
    if (arguments.has("--json")) {
        std::printf("%s\n", body.c_str());
    } else {
        show(figures);
    }
    return 0;
}

}  // namespace orvel::ctl
