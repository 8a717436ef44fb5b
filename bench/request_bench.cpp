// What a request costs, without a web server around it: through orveld, as a plain CGI program, and beside them the
// least that a process for each request costs and a resident process that does nothing.
//
//   request_bench BUILD [ROUNDS [SECONDS]]
//
// Four connections ask at a time. Contestants take turns; ratios are of rates within a round. "cpu us" is the processor
// time of a server and its children for one request.
#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <iostream>
#include <iterator>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include "contest.h"

namespace {

using Clock = std::chrono::steady_clock;
using Texts = std::vector<std::string>;
constexpr int kConnections = 4;
constexpr const char* kFollow = "100 rows, nothing changed";

std::string quoted(const std::string& text) {
    return "'" + text + "'";
}

std::string outputOf(const std::string& command) {
    std::string text;
    FILE* pipe = popen(command.c_str(), "r");
    char piece[4096];
    for (size_t got = 0; pipe != nullptr && (got = fread(piece, 1, sizeof piece, pipe)) > 0;) text.append(piece, got);
    if (pipe != nullptr) pclose(pipe);
    return text;
}

std::vector<char*> pointers(Texts& texts) {
    std::vector<char*> list;
    for (std::string& text : texts) list.push_back(text.data());
    list.push_back(nullptr);
    return list;
}

pid_t start(Texts words, Texts environment) {
    const auto argv = pointers(words), envp = pointers(environment);
    const pid_t child = fork();
    if (child == 0) {
        const int null = open("/dev/null", O_WRONLY);
        dup2(null, STDOUT_FILENO);
        execve(argv[0], argv.data(), envp.data());
        _exit(127);
    }
    return child;
}

int connectTo(const std::string& path) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) return fd;
    close(fd);
    return -1;
}

std::string readAll(int fd) {
    std::string all;
    char piece[65536];
    for (ssize_t got = 0; (got = read(fd, piece, sizeof piece)) > 0;) all.append(piece, static_cast<size_t>(got));
    return all;
}

std::string exchange(const std::string& socket, const std::string& request) {
    const int fd = connectTo(socket);
    if (fd < 0) return "";
    std::string reply;
    if (write(fd, request.data(), request.size()) == static_cast<ssize_t>(request.size())) reply = readAll(fd);
    close(fd);
    return reply;
}

std::string scgi(const Texts& variables) {
    std::string body(
        "CONTENT_LENGTH\0"
        "0\0"
        "SCGI\0"
        "1\0",
        24);
    for (const std::string& variable : variables) {
        const size_t end = variable.find('=');
        body.append(variable, 0, end).append(1, '\0').append(variable, end + 1).append(1, '\0');
    }
    return std::to_string(body.size()) + ":" + body + ",";
}

std::string fastCgi() {
    const unsigned char begin[16] = {1, 1, 0, 1, 0, 8, 0, 0, 0, 1}, parameters[8] = {1, 4, 0, 1},
                        input[8] = {1, 5, 0, 1};
    std::string request(reinterpret_cast<const char*>(begin), sizeof begin);
    request.append(reinterpret_cast<const char*>(parameters), sizeof parameters);
    return request.append(reinterpret_cast<const char*>(input), sizeof input);
}

std::string runCgi(const std::string& program, const Texts& environment) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) return "";
    Texts words = {program}, variables = environment;
    const auto argv = pointers(words), envp = pointers(variables);
    const std::string folder = program.substr(0, program.rfind('/'));
    const pid_t child = vfork();
    if (child == 0) {
        dup2(ends[1], STDOUT_FILENO);
        if (chdir(folder.c_str()) == 0) execve(argv[0], argv.data(), envp.data());
        _exit(127);
    }
    close(ends[1]);
    const std::string reply = readAll(ends[0]);
    close(ends[0]);
    waitpid(child, nullptr, 0);
    return reply;
}

struct Contestant {
    std::string name;
    std::function<std::string()> ask;
    std::string wanted;  // what each reply must hold
    pid_t server = 0;    // 0 for none
    std::vector<double> rates = {}, ratios = {}, latencies = {}, costs = {};
};

// Of a process and the children it has waited for, in microseconds.
double processorTime(pid_t process) {
    std::ifstream file("/proc/" + std::to_string(process) + "/stat");
    const std::string text(std::istreambuf_iterator<char>(file), {});
    double ticks = 0;
    std::istringstream fields(text.substr(std::min(text.rfind(')') + 2, text.size())));
    std::string word;
    for (int i = 3; fields >> word; ++i) {
        if (i >= 14 && i <= 17) ticks += atof(word.c_str());
    }
    return ticks * 1e6 / static_cast<double>(sysconf(_SC_CLK_TCK));
}

// Milliseconds of each request.
std::vector<double> measure(const Contestant& contestant, std::chrono::milliseconds length) {
    std::vector<std::vector<double>> times(kConnections);
    std::vector<std::thread> threads;
    const auto until = Clock::now() + length;
    for (auto& own : times) {
        threads.emplace_back([&] {
            for (auto begin = Clock::now(); begin < until;) {
                if (contestant.ask().find(contestant.wanted) == std::string::npos) {
                    std::fprintf(stderr, "%s: wrong reply: %s\n", contestant.name.c_str(), contestant.ask().c_str());
                    exit(1);
                }
                const auto end = Clock::now();
                own.push_back(std::chrono::duration<double, std::milli>(end - begin).count());
                begin = end;
            }
        });
    }
    std::vector<double> all;
    for (int i = 0; i < kConnections; ++i) {
        threads[i].join();
        all.insert(all.end(), times[i].begin(), times[i].end());
    }
    return all;
}

double quantile(std::vector<double>& values, double part) {
    std::sort(values.begin(), values.end());
    return values[std::min(values.size() - 1, static_cast<size_t>(static_cast<double>(values.size()) * part))];
}

void compete(std::vector<Contestant>& contestants, int rounds, std::chrono::milliseconds length) {
    for (int round = -1; round < rounds; ++round) {
        double floor = 0;
        for (Contestant& contestant : contestants) {
            const double before = processorTime(contestant.server);
            const auto times = measure(contestant, round < 0 ? length / 4 : length);
            const double rate = static_cast<double>(times.size()) / std::chrono::duration<double>(length).count();
            if (&contestant == &contestants.front()) floor = rate;
            if (round < 0) continue;
            contestant.rates.push_back(rate);
            contestant.costs.push_back((processorTime(contestant.server) - before) / static_cast<double>(times.size()));
            contestant.ratios.push_back(rate / floor);
            contestant.latencies.insert(contestant.latencies.end(), times.begin(), times.end());
        }
    }
    std::printf("%-40s %9s %8s %8s %8s %8s\n", "", "per s", "ratio", "p50 ms", "p99 ms", "cpu us");
    for (Contestant& contestant : contestants) {
        std::printf("%-40s %9.0f %8.3f %8.2f %8.2f %8.0f\n", contestant.name.c_str(), bench::median(contestant.rates),
                    bench::median(contestant.ratios), quantile(contestant.latencies, 0.5),
                    quantile(contestant.latencies, 0.99), bench::median(contestant.costs));
    }
}

struct Place {
    std::string build, root, orveld, floor, linked, resident;
};

Texts variablesOf(const std::string& user, const std::string& query, const std::string& cookie) {
    Texts variables = {"REQUEST_METHOD=GET",        "QUERY_STRING=" + query, "REMOTE_ADDR=127.0.0.1",
                       "SCRIPT_NAME=/cgi-bin/list", "HTTP_HOST=localhost",   "SERVER_PROTOCOL=HTTP/1.1",
                       "HTTP_COOKIE=" + cookie};
    if (!user.empty()) variables.push_back("REMOTE_USER=" + user);
    return variables;
}

void addRequest(std::vector<Contestant>& contestants, const Place& place, pid_t server, const std::string& what,
                const Texts& variables, const std::string& wanted) {
    const std::string request = scgi(variables);
    contestants.push_back({"orveld, " + what, [=] { return exchange(place.orveld, request); }, wanted, server});
    Texts environment = variables;
    environment.push_back("VEXO_ROOT=" + place.root);
    contestants.push_back({"CGI, " + what, [=] { return runCgi(place.build + "/cgi/list", environment); }, wanted, 0});
}

void makeAppliance(const Place& place) {
    outputOf(quoted(place.build + "/bin/orvel-demo") + " " + quoted(place.root));
    std::ofstream settings(place.root + "/etc/vexoinfo.conf", std::ios::app);
    settings << "orveld_trusted_logins=\"" << getuid() << "\"\n";
    const std::string shares =
        outputOf(quoted(place.build + "/apps/orvelctl/orvelctl") + " --root " + quoted(place.root) +
                 " ls / --user alice --json --additional real_path 2>/dev/null");
    const std::string key = "\"real_path\":\"";
    const size_t end = shares.find("-photo\"") + 6, at = shares.rfind(key, end) + key.size();
    const std::string folder = shares.substr(at, end - at) + "/hundred";
    mkdir(folder.c_str(), 0755);
    for (int i = 0; i < 100; ++i) std::ofstream(folder + "/file " + std::to_string(i) + ".txt") << i;
}

// The text of a member of a reply.
std::string valueIn(const std::string& reply, const std::string& member) {
    const std::string key = "\"" + member + "\":\"";
    const size_t at = reply.find(key);
    return at == std::string::npos ? ""
                                   : reply.substr(at + key.size(), reply.find('"', at + key.size()) - at - key.size());
}

// What a thousand open tabs come to. A page asks 1.2 s after the last answer while somebody is at it, each 10 s when
// nobody has been for long, each 30 s in a hidden tab.
void tellTabs(const std::vector<Contestant>& contestants) {
    struct Mix {
        double active, seen, hidden;
    };
    for (const Contestant& contestant : contestants) {
        const bool floor = &contestant == &contestants.front();
        if (!floor && contestant.name != std::string("orveld, ") + kFollow) continue;
        for (const Mix& mix : {Mix{1000, 0, 0}, Mix{100, 200, 700}, Mix{50, 100, 850}, Mix{0, 0, 1000}}) {
            const double rate = mix.active / 1.2 + mix.seen / 10 + mix.hidden / 30;
            std::printf("%-40s %4.0f active %4.0f seen %4.0f hidden: %4.0f a second, %5.1f %% of a processor\n",
                        contestant.name.c_str(), mix.active, mix.seen, mix.hidden, rate,
                        rate * bench::median(contestant.costs) / 1e4);
        }
    }
}

}  // namespace

int main(int count, char** words) {
    if (count < 2) {
        std::fputs("usage: request_bench BUILD [ROUNDS [SECONDS]]\n", stderr);
        return 2;
    }
    const int rounds = count > 2 ? atoi(words[2]) : 7;
    const std::chrono::milliseconds length(static_cast<int>((count > 3 ? atof(words[3]) : 1.0) * 1000));
    std::string work = "/tmp/request-bench-XXXXXX";
    if (mkdtemp(work.data()) == nullptr) return 1;
    chmod(work.c_str(), 0755);
    const Place place = {words[1],        work + "/root",   work + "/orveld",
                         work + "/floor", work + "/linked", work + "/resident"};
    makeAppliance(place);
    const std::string floor = place.build + "/bench/floor_request";
    const Texts environment = {"PATH=/usr/bin:/bin", "VEXO_ROOT=" + place.root, "LD_BIND_NOW=1"};  // as its unit has it
    const pid_t servers[] = {start({floor, "fork", place.floor}, environment),
                             start({floor + "_linked", "fork", place.linked}, environment),
                             start({floor, "resident", place.resident}, environment),
                             start({place.build + "/bin/orveld", "--socket", place.orveld}, environment)};
    for (const std::string& path : {place.floor, place.linked, place.resident, place.orveld}) {
        int fd = -1;
        while ((fd = connectTo(path)) < 0) usleep(10000);
        close(fd);
    }
    const std::string first = exchange(place.orveld, scgi(variablesOf("alice", "action=shares", "")));
    const size_t at = first.find("Set-Cookie: id=");
    const std::string cookie = at == std::string::npos ? "" : first.substr(at + 12, first.find(';', at) - at - 12);

    const std::string hello = scgi({});
    const std::string page = "action=folder&path=%2Fphoto%2Fhundred&limit=100&additional=size,time,owner,perm";
    std::vector<Contestant> contestants;
    contestants.push_back(
        {"floor: SCGI, fork, 100 bytes", [&] { return exchange(place.floor, hello); }, "890123", servers[0]});
    contestants.push_back(
        {"the same, mapping what orveld maps", [&] { return exchange(place.linked, hello); }, "890123", servers[1]});
    contestants.push_back(
        {"resident FastCGI, 100 bytes", [&] { return exchange(place.resident, fastCgi()); }, "890123", 0});
    addRequest(contestants, place, servers[3], "shares", variablesOf("alice", "action=shares", cookie),
               "\"success\":true");
    addRequest(contestants, place, servers[3], "page of 100 rows", variablesOf("alice", page, cookie),
               "\"success\":true");
    addRequest(contestants, place, servers[3], "refusal", variablesOf("", "action=shares", ""), "401");
    const auto ask = [&](const std::string& query) {
        return exchange(place.orveld, scgi(variablesOf("alice", query, cookie)));
    };
    const std::string id = valueIn(ask("action=folder&keep=1&limit=1&path=%2Fphoto%2Fhundred"), "listing");
    const std::string follow = "action=changes&limit=100&listing=" + id + "&state=";
    const std::string state = valueIn(ask(follow), "state");
    addRequest(contestants, place, servers[3], kFollow, variablesOf("alice", follow + state, cookie),
               "\"changed\":false}}");
    compete(contestants, rounds, length);
    tellTabs(contestants);

    for (const pid_t server : servers) {
        kill(server, SIGTERM);
        waitpid(server, nullptr, 0);
    }
    outputOf(quoted(place.build + "/bin/orvel-demo") + " " + quoted(place.root) + " --remove; rm -rf " + quoted(work));
    return 0;
}
