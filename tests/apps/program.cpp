#include "apps/program.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <json/reader.h>
#include <poll.h>
#include <spawn.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <sstream>

#include "apps/orveld.h"
#include "support/wait.h"
#include "text.h"

namespace support {
namespace {

std::vector<char*> pointers(std::vector<std::string>& texts) {
    std::vector<char*> list;
    list.reserve(texts.size() + 1);
    for (std::string& text : texts) list.push_back(text.data());
    list.push_back(nullptr);
    return list;
}

// The text as an open file, to be read from its beginning; -1 on failure.
int bodyOf(const std::string& text) {
    const int file = memfd_create("body", MFD_CLOEXEC);
    for (size_t at = 0; file >= 0 && at < text.size();) {
        const ssize_t written = write(file, text.data() + at, text.size() - at);
        if (written <= 0) break;
        at += static_cast<size_t>(written);
    }
    if (file >= 0) lseek(file, 0, SEEK_SET);
    return file;
}

std::vector<std::string> environmentWith(std::map<std::string, std::string> variables) {
    // A process that took on another identity cannot be traced, which is how leaks are looked for.
    variables["ASAN_OPTIONS"] = "detect_leaks=0";
    std::vector<std::string> list;
    for (char** entry = environ; *entry != nullptr; ++entry) {
        const std::string text = *entry;
        if (variables.count(text.substr(0, text.find('='))) == 0) list.push_back(text);
    }
    for (const auto& [name, value] : variables) {
        if (!value.empty()) list.emplace_back(name).append("=").append(value);
    }
    return list;
}

// One for all tests of this process and for what it forks, which share their system root; a process with a limit or a
// mount namespace of its own, of which an orveld from outside knows nothing, has another.
const Orveld& orveldOfThisProcess() {
    static auto& all = *new std::map<std::string, std::unique_ptr<Orveld>>;
    std::error_code error;
    rlimit files = {};
    getrlimit(RLIMIT_FSIZE, &files);
    const std::string here = std::filesystem::read_symlink("/proc/self/ns/mnt", error).string();
    auto& orveld = all[here + " " + std::to_string(files.rlim_cur)];
    if (orveld == nullptr) orveld = std::make_unique<Orveld>();
    return *orveld;
}

// What a test orders the platform to do, in our environment or beside the request's variables.
Variables takeOrders(Variables& variables) {
    const std::string prefix = "VEXO_GATE_";
    Variables orders;
    for (char** entry = environ; *entry != nullptr; ++entry) {
        const std::string text = *entry;
        if (text.starts_with(prefix)) orders[text.substr(0, text.find('='))] = text.substr(text.find('=') + 1);
    }
    for (auto at = variables.begin(); at != variables.end();) {
        if (at->first.starts_with(prefix)) orders[at->first] = at->second;
        at = at->first.starts_with(prefix) ? variables.erase(at) : std::next(at);
    }
    return orders;
}

// A request with orders has an orveld of its own, which children have them from.
std::string throughOrveld(Variables variables, const std::string& input) {
    const Variables orders = takeOrders(variables);
    const std::unique_ptr<Orveld> ordered = orders.empty() ? nullptr : std::make_unique<Orveld>(Variables(), orders);
    const Orveld& orveld = ordered != nullptr ? *ordered : orveldOfThisProcess();
    for (auto at = variables.begin(); at != variables.end();) at = at->second.empty() ? variables.erase(at) : ++at;
    variables.emplace("CONTENT_LENGTH", "");
    variables["SCGI"] = "1";
    return orveld.ask(variables, input);
}

Variables requestVariables(const std::string& user, const std::string& method, const std::string& query,
                           const std::string& input, const Variables& more) {
    Variables variables = {{"GATEWAY_INTERFACE", "CGI/1.1"},
                           {"REQUEST_METHOD", method},
                           {"REMOTE_ADDR", "127.0.0.1"},
                           {"REMOTE_USER", user},
                           {"QUERY_STRING", query}};
    if (method != "GET" && method != "HEAD") variables["CONTENT_LENGTH"] = std::to_string(input.size());
    for (const auto& [name, value] : more) variables[name] = value;
    return variables;
}

}  // namespace

Finished runProgram(const std::vector<std::string>& words, const Variables& variables, const std::string& input) {
    int ends[2];
    const int body = bodyOf(input);
    if (body < 0 || pipe2(ends, O_CLOEXEC) != 0) return {};
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, body, 0);
    posix_spawn_file_actions_adddup2(&actions, ends[1], 1);
    std::vector<std::string> texts = words;
    std::vector<std::string> environment = environmentWith(variables);
    pid_t child = 0;
    const int failed =
        posix_spawn(&child, words[0].c_str(), &actions, nullptr, pointers(texts).data(), pointers(environment).data());
    posix_spawn_file_actions_destroy(&actions);
    close(ends[1]);
    close(body);
    Finished finished;
    char buffer[65536];
    pollfd output = {.fd = ends[0], .events = POLLIN, .revents = 0};
    for (ssize_t got = 1; failed == 0 && got > 0;) {
        if (poll(&output, 1, 120'000) == 0) {
            ADD_FAILURE() << "waited two minutes in vain for output of " << words[0];
            kill(child, SIGKILL);
            break;
        }
        got = read(ends[0], buffer, sizeof buffer);
        finished.output.append(buffer, static_cast<size_t>(std::max<ssize_t>(got, 0)));
    }
    close(ends[0]);
    if (failed != 0) return finished;
    const int status = support::waitForEnd(child, words[0]);
    finished.status = WIFEXITED(status) ? WEXITSTATUS(status) : 128 + WTERMSIG(status);
    return finished;
}

Finished orvelctl(std::vector<std::string> words) {
    words.insert(words.begin(), ORVELCTL);
    return runProgram(words);
}

Json::Value jsonOf(const std::string& text) {
    Json::CharReaderBuilder strict;
    Json::CharReaderBuilder::strictMode(&strict.settings_);
    const std::unique_ptr<Json::CharReader> reader(strict.newCharReader());
    std::string errors;
    Json::Value value;
    EXPECT_TRUE(reader->parse(text.data(), text.data() + text.size(), &value, &errors)) << errors << text;
    return value;
}

Finished finishCgi(const std::string& program, const std::string& user, const std::string& method,
                   const std::string& query, const std::string& input, const Variables& more) {
    // A web server starts a program in its folder.
    const std::string before = std::filesystem::current_path();
    std::filesystem::current_path(std::filesystem::path(program).parent_path());
    Finished finished = runProgram({program}, requestVariables(user, method, query, input, more), input);
    std::filesystem::current_path(before);
    return finished;
}

std::string runCgi(const std::string& program, const std::string& user, const std::string& method,
                   const std::string& query, const std::string& input, const Variables& more) {
    if (getenv("ORVEL_TEST_THROUGH_ORVELD") != nullptr) {
        Variables variables = requestVariables(user, method, query, input, more);
        variables["SCRIPT_NAME"] = "/cgi-bin/" + std::filesystem::path(program).filename().string();
        return throughOrveld(variables, input);
    }
    const Finished finished = finishCgi(program, user, method, query, input, more);
    EXPECT_EQ(finished.status, 0) << query;
    return finished.output;
}

RawReply::RawReply(const std::string& output) {
    const size_t end = output.find("\r\n\r\n");
    if (end == std::string::npos) {
        ADD_FAILURE() << "no header: " << output;
        return;
    }
    std::istringstream lines(output.substr(0, end));
    for (std::string line; std::getline(lines, line);) {
        if (!line.empty() && line.back() == '\r') line.pop_back();
        const size_t colon = line.find(": ");
        if (colon != std::string::npos) headers[line.substr(0, colon)] = line.substr(colon + 2);
    }
    status = atoi(headers["Status"].c_str());  // NOLINT(cert-err34-c): 0 is no status
    body = output.substr(end + 4);
}

CgiReply::CgiReply(const std::string& output) : RawReply(output) {
    EXPECT_TRUE(orvel::cgi::isUtf8(body)) << body;
    json = jsonOf(body);
}

}  // namespace support
