// Listing a flat folder of 100,000 entries, beside the floor and beside other makers' tools, in one run.
//   listing_bench [FOLDER [ROUNDS]]    without FOLDER one is made and removed; rounds interleave all contenders
#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "contest.h"

namespace fs = std::filesystem;

namespace {

constexpr int kEntries = 100000;
constexpr const char* kAllFields =
    "{\"name\":\"%f\",\"path\":\"%p\",\"type\":\"%y\",\"size\":%s,\"mode\":\"%m\",\"uid\":%U,\"user\":\"%u\",\"gid\":%"
    "G,"
    "\"group\":\"%g\",\"mtime\":%T@,\"ctime\":%C@,\"atime\":%A@}\\n";

std::string makeFolder() {
    char path[] = "/tmp/orvel-bench-XXXXXX";
    if (mkdtemp(path) == nullptr) exit(1);
    chmod(path, 0755);
    const char* const kinds[][2] = {
        {"IMG_", ".JPG"}, {"holiday picture ", ".png"}, {"Report ", " (final).pdf"}, {"", ".txt"}};
    for (int i = 0; i < kEntries; ++i) {
        // Spread, so that the order of creation is not that of the names.
        const auto& [before, after] = kinds[i % 4];
        const std::string name = before + std::to_string(i * 7919LL % kEntries) + after;
        const int fd = openat(AT_FDCWD, (std::string(path) + "/" + name).c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0644);
        if (fd < 0) exit(1);
        if (i % 100 == 0 && ftruncate(fd, i) != 0) exit(1);
        close(fd);
    }
    return path;
}

class Nginx {
 public:
    explicit Nginx(const std::string& folder) {
        char path[] = "/tmp/orvel-nginx-XXXXXX";
        if (mkdtemp(path) == nullptr) return;
        home_ = path;
        port_ = freePort();
        std::ofstream(home_ + "/nginx.conf")
            << "daemon off; master_process off; pid " << home_ << "/pid; error_log /dev/null crit; events {}\n"
            << "http { access_log off; client_body_temp_path " << home_ << "/b; proxy_temp_path " << home_
            << "/p; fastcgi_temp_path " << home_ << "/f; uwsgi_temp_path " << home_ << "/u; scgi_temp_path " << home_
            << "/s; server { listen 127.0.0.1:" << port_ << "; location / { alias " << folder
            << "/; autoindex on; autoindex_format json; } } }\n";
        child_ = fork();
        if (child_ == 0) {
            if (freopen("/dev/null", "w", stderr) == nullptr) _exit(127);
            execlp("nginx", "nginx", "-p", home_.c_str(), "-c", (home_ + "/nginx.conf").c_str(), nullptr);
            _exit(127);
        }
        for (int i = 0; i < 100 && !answers_; ++i) {
            usleep(20000);
            const int fd = connectTo();
            answers_ = fd >= 0;
            if (fd >= 0) close(fd);
        }
    }
    ~Nginx() {
        if (child_ > 0) {
            kill(child_, SIGTERM);
            waitpid(child_, nullptr, 0);
        }
        std::error_code ignored;
        if (!home_.empty()) fs::remove_all(home_, ignored);
    }
    Nginx(const Nginx&) = delete;
    Nginx& operator=(const Nginx&) = delete;

    [[nodiscard]] bool answers() const { return answers_; }

    // One request; the time until the last byte has come, and how many there were.
    double get(size_t& bytes) const {
        const auto start = std::chrono::steady_clock::now();
        const int fd = connectTo();
        static constexpr char request[] = "GET / HTTP/1.0\r\n\r\n";
        if (fd < 0 || write(fd, request, sizeof request - 1) < 0) return -1;
        static char buffer[256 * 1024];
        bytes = 0;
        for (ssize_t part; (part = read(fd, buffer, sizeof buffer)) > 0;) bytes += static_cast<size_t>(part);
        close(fd);
        return std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count();
    }

 private:
    static int freePort() {
        const int fd = socket(AF_INET, SOCK_STREAM, 0);
        sockaddr_in address = {};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t size = sizeof address;
        if (bind(fd, reinterpret_cast<sockaddr*>(&address), size) != 0) return 0;
        getsockname(fd, reinterpret_cast<sockaddr*>(&address), &size);
        close(fd);
        return ntohs(address.sin_port);
    }
    [[nodiscard]] int connectTo() const {
        const int fd = socket(AF_INET, SOCK_STREAM, 0);
        sockaddr_in address = {};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        address.sin_port = htons(static_cast<uint16_t>(port_));
        if (connect(fd, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0) return fd;
        close(fd);
        return -1;
    }

    std::string home_;
    int port_ = 0;
    pid_t child_ = -1;
    bool answers_ = false;
};

size_t outputOf(const bench::Arguments& arguments) {
    const int file = open("/tmp", O_TMPFILE | O_RDWR | O_CLOEXEC, 0600);
    bench::runProgram(arguments, file);
    struct stat status = {};
    fstat(file, &status);
    close(file);
    return static_cast<size_t>(status.st_size);
}

void printRate(const std::string& name, size_t bytes, double milliseconds) {
    const auto size = static_cast<double>(bytes);
    printf("  %-42s %9.1f MB %8.2f ns/byte\n", name.c_str(), size / 1e6, milliseconds * 1e6 / size);
}

void printRates(const std::vector<bench::Contender>& contenders) {
    for (const auto& contender : contenders) {
        if (contender.wall.empty()) continue;
        printRate(contender.name, outputOf(contender.arguments), bench::median(contender.wall));
    }
}

// One request of a server that is running against one run of the floor, in turns.
void compareWithNginx(const std::string& folder, const bench::Arguments& floor, int rounds) {
    const Nginx nginx(folder);
    if (!nginx.answers()) {
        printf("nginx is not available on this machine\n");
        return;
    }
    size_t bytes = 0;
    std::vector<double> times, ratios;
    const int null = open("/dev/null", O_WRONLY | O_CLOEXEC);
    for (int round = -1; round < rounds; ++round) {
        const double least = bench::runProgram(floor, null).wall;
        const double time = nginx.get(bytes);
        if (round < 0) continue;
        times.push_back(time);
        ratios.push_back(time / least);
    }
    close(null);
    printf("%-44s %9.1f %8.3f\n", "nginx autoindex json, four fields", bench::median(times), bench::median(ratios));
    printRate("nginx", bytes, bench::median(times));
}

}  // namespace

int main(int argc, char** argv) {
    const std::string folder = argc > 1 ? argv[1] : makeFolder();
    const int rounds = argc > 2 ? static_cast<int>(strtol(argv[2], nullptr, 10)) : 11;
    const std::string here = fs::read_symlink("/proc/self/exe").parent_path().string();
    const auto find = [&](const char* program) {
        return bench::Arguments{program, folder, "-mindepth", "1", "-maxdepth", "1", "-printf", kAllFields};
    };
    printf("A sorted page of 100, all properties\n");
    std::vector<bench::Contender> page = {
        {"floor: getdents64, statx, 100 written", {here + "/floor_list", folder, "100"}, {}, {}, {}},
        {"orvel", {here + "/orvel_list", folder, "100"}, {}, {}, {}}};
    bench::contest(page, rounds);

    printf("\nThe whole list, all properties\n");
    const bench::Arguments floor = {here + "/floor_list", folder, "0"};
    std::vector<bench::Contender> whole = {{"floor: getdents64, statx, all written", floor, {}, {}, {}},
                                           {"orvel, sorted", {here + "/orvel_list", folder, "0"}, {}, {}, {}},
                                           {"find -printf, unsorted", find("find"), {}, {}, {}},
                                           {"bfs -printf, unsorted", find("bfs"), {}, {}, {}}};
    bench::contest(whole, rounds);
    printRates(whole);
    compareWithNginx(folder, floor, rounds);
    printf("\nWhat the listing is spent on (within one process)\n");
    fflush(stdout);
    bench::runProgram({here + "/orvel_list", folder, "stages"}, STDOUT_FILENO);
    if (argc <= 1) fs::remove_all(folder);
    return 0;
}
