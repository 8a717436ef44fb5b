// Checks of a visitor's session in a record file of 1,000, in turns within one run beside the floor (the file read,
// each record looked at in place, one changed, all written and renamed), beside a change that looks at no other record,
// and beside the floor's steps by lines of the C library.
//   session_bench [ROUNDS [FOLDER]]    each round makes 200 checks of each kind in FOLDER, /tmp without it
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysinfo.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "contest.h"
#include "orvel/login_records.h"
#include "vexo/process.h"

namespace fs = std::filesystem;

namespace {

constexpr int kRecords = 1000;
constexpr int kChecks = 200;

std::string root, record, temporary;

long uptime() {
    struct sysinfo info = {};
    sysinfo(&info);
    return info.uptime;
}

std::string sessionOf(int number) {
    return "abcdefgh" + std::to_string(10000 + number);
}

// An appliance with one user and a file of fresh sessions.
void make(const std::string& parent) {
    root = parent + "/orvel-bench-XXXXXX";
    if (mkdtemp(root.data()) == nullptr) exit(1);
    setenv("VEXO_ROOT", root.c_str(), 1);  // before the platform's first call
    setenv("REMOTE_ADDR", "192.168.100.200", 1);
    for (const char* made : {"/etc/vexo", "/tmp"}) fs::create_directories(root + made);
    std::ofstream(root + "/etc/passwd") << "root:x:0:0::/:/bin/sh\nalice:x:30001:30100::/:/bin/sh\n";
    std::ofstream(root + "/etc/group") << "root:x:0:\nusers:x:30100:\nadministrators:x:30101:\n";
    std::ofstream(root + "/etc/shadow") << "alice:x:1:0:9:7:::\n";
    std::ofstream(root + "/etc/vexo/shares.conf") << "[homes]\npath = /tmp/homes\n";
    std::ofstream(root + "/etc/vexoinfo.conf") << "session_timeout=\"60\"\n";
    record = root + "/tmp/foldersharing.current.users";
    temporary = record + ".tmp";
    std::ofstream out(record);
    for (int i = 0; i < kRecords; ++i) {
        out << "192.168.100.200,alice," << sessionOf(i) << "," << uptime() << "," << uptime() << ",1,0,Xy7" << i
            << "\n";
    }
    out.close();
    chmod(record.c_str(), 0600);
}

void require(bool ok, const char* what) {
    if (ok) return;
    fprintf(stderr, "%s failed\n", what);
    fs::remove_all(root);
    exit(1);
}

void checkByLibrary(int number) {
    VEXORequestBegin();  // each check is one of a request of its own
    VEXO::WebCGI cgi;
    _tag_confirm_policy policy = {.flags = 15, .keepAccessTime = 0};
    char user[64];
    const std::string session = sessionOf(number), link = "Xy7" + std::to_string(number);
    require(IsAuthorizedByPath(&cgi, session.c_str(), user, sizeof user, &policy, CGI_POSITION_FILE_MANAGER,
                               link.c_str()) == 1,
            "a check");
}

char text[1 << 20];

std::size_t readFile() {
    const int in = open(record.c_str(), O_RDONLY | O_CLOEXEC);
    const ssize_t size = read(in, text, sizeof text);
    close(in);
    require(size > 0, "the reading");
    return static_cast<std::size_t>(size);
}

void writeFile(std::size_t size) {
    const int out = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    require(write(out, text, size) == static_cast<ssize_t>(size), "the writing");
    close(out);
    require(rename(temporary.c_str(), record.c_str()) == 0, "the renaming");
}

// The time of access of the record whose session begins at `session`; the times of the bench all have one length.
void setAccess(char* session, std::size_t length) {
    const std::string now = std::to_string(uptime());
    memcpy(session + length + 2 + now.size(), now.data(), now.size());
}

// No record but one is looked at.
void bareChange(int number) {
    const std::size_t size = readFile();
    const std::string session = sessionOf(number);
    void* found = memmem(text, size, session.data(), session.size());
    require(found != nullptr, "the search");
    setAccess(static_cast<char*>(found), session.size());
    writeFile(size);
}

// Every record is looked at where it lies: its session, its times.
void scanInPlace(int number) {
    const std::size_t size = readFile();
    const std::string session = sessionOf(number);
    const long now = uptime();
    for (char *line = text, *end = text + size; line != end;) {
        char* const next = static_cast<char*>(memchr(line, '\n', static_cast<std::size_t>(end - line))) + 1;
        char* fields[8] = {line};
        for (int i = 1; i < 8; ++i) {
            fields[i] =
                static_cast<char*>(memchr(fields[i - 1], ',', static_cast<std::size_t>(next - fields[i - 1]))) + 1;
        }
        long access = 0;
        std::from_chars(fields[4], fields[5], access);
        require(now - access <= 3600 && *fields[6] == '0', "freshness");
        if (static_cast<std::size_t>(fields[3] - fields[2]) == session.size() + 1 &&
            memcmp(fields[2], session.data(), session.size()) == 0) {
            setAccess(fields[2], session.size());
        }
        line = next;
    }
    writeFile(size);
}

// The same file line by line with fgets, strtok_r, strtol and fprintf.
void changeByLines(int number) {
    FILE* in = fopen(record.c_str(), "re");
    FILE* out = fopen(temporary.c_str(), "wxe");
    require(in != nullptr && out != nullptr, "the opening");
    const std::string session = sessionOf(number);
    char line[748];
    while (fgets(line, sizeof line, in) != nullptr) {
        char* fields[8] = {};
        char* rest = nullptr;
        for (int i = 0; i < 8; ++i) fields[i] = strtok_r(i == 0 ? line : nullptr, i < 7 ? "," : ",\r\n", &rest);
        if (fields[7] == nullptr) continue;
        long access = strtol(fields[4], nullptr, 10);
        if (uptime() - access > 3600) continue;
        if (session == fields[2]) access = uptime();
        fprintf(out, "%s,%s,%s,%s,%ld,%s,%s,%s\n", fields[0], fields[1], fields[2], fields[3], access, fields[5],
                fields[6], fields[7]);
    }
    fclose(in);
    require(fclose(out) == 0 && rename(temporary.c_str(), record.c_str()) == 0, "the renaming");
}

// Of the processor, for one change: the machine may do other work meanwhile.
double millisecondsOf(void (*change)(int)) {
    const std::clock_t start = std::clock();
    for (int i = 0; i < kChecks; ++i) change(i * 7 % kRecords);
    return static_cast<double>(std::clock() - start) * 1e3 / CLOCKS_PER_SEC / kChecks;
}

}  // namespace

int main(int argc, char** argv) {
    make(argc > 2 ? argv[2] : "/tmp");
    struct Kind {
        const char* name;
        void (*change)(int);
        std::vector<double> times, rates;
    } kinds[] = {{"floor: read, scan in place, write, rename", scanInPlace, {}, {}},
                 {"bare: the same without the scan", bareChange, {}, {}},
                 {"orvel: the whole check", checkByLibrary, {}, {}},
                 {"by lines: fgets, strtok_r, fprintf", changeByLines, {}, {}}};
    for (int round = argc > 1 ? atoi(argv[1]) : 31; round >= 0; --round) {
        for (Kind& kind : kinds) {
            kind.times.push_back(millisecondsOf(kind.change));
            kind.rates.push_back(kinds[0].times.back() / kind.times.back());
        }
    }
    printf("%-44s %9s %8s\n", "", "cpu ms", "rate");
    for (const Kind& kind : kinds) {
        printf("%-44s %9.3f %8.2f\n", kind.name, bench::median(kind.times), bench::median(kind.rates));
    }
    fs::remove_all(root);
    return 0;
}
