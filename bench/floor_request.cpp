// The least that a request can cost: answers 100 bytes to whatever comes through a Unix socket.
//
//   floor_request fork SOCKET      SCGI, a process forked for each request
//   floor_request resident SOCKET  FastCGI, one process for all
//   floor_request sendfile SOCKET FILE  SCGI, a process forked for each request, which sends FILE
#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>

namespace {

constexpr char kReply[] =
    "Status: 200 OK\r\nContent-Type: text/plain\r\n\r\n"
    "0123456789012345678901234567890123456789012345678901234567890123456789012345678901234567890123456789";
constexpr size_t kReplySize = sizeof kReply - 1;

bool readWhole(int fd, void* to, size_t size) {
    auto* at = static_cast<char*>(to);
    while (size > 0) {
        const ssize_t got = read(fd, at, size);
        if (got <= 0) return false;
        at += got;
        size -= static_cast<size_t>(got);
    }
    return true;
}

bool readBlock(int fd) {
    static char block[65536];
    size_t length = 0;
    for (char digit = 0; read(fd, &digit, 1) == 1 && digit >= '0' && digit <= '9';) {
        length = length * 10 + static_cast<size_t>(digit - '0');
    }
    return length < sizeof block && readWhole(fd, block, length + 1);
}

void answer(int fd, const char* file) {
    if (!readBlock(fd)) return;
    if (file == nullptr) {
        static_cast<void>(!write(fd, kReply, kReplySize));
        return;
    }
    const int opened = open(file, O_RDONLY | O_CLOEXEC);
    struct stat status {};
    fstat(opened, &status);
    char header[200];
    const int size =
        std::snprintf(header, sizeof header,
                      "Status: 200 OK\r\nContent-Type: application/octet-stream\r\nContent-Length: %lld\r\n\r\n",
                      static_cast<long long>(status.st_size));
    if (write(fd, header, static_cast<size_t>(size)) != size) return;
    for (off_t at = 0; at < status.st_size;) {
        if (sendfile(fd, opened, &at, static_cast<size_t>(status.st_size - at)) <= 0) return;
    }
}

// One request at a time, which is all that the bench sends through a connection.
void answerFastCgi(int fd) {
    unsigned char header[8];
    static char content[65536 + 256];
    while (readWhole(fd, header, sizeof header)) {
        const size_t length = static_cast<size_t>(header[4]) << 8 | header[5];
        if (!readWhole(fd, content, length + header[6])) return;
        if (header[1] != 5 || length != 0) continue;  // until the end of standard input
        std::string reply;
        const unsigned char out[8] = {1, 6, 0, 1, kReplySize >> 8, kReplySize & 255, 0, 0};
        const unsigned char end[16] = {1, 3, 0, 1, 0, 8};
        reply.append(reinterpret_cast<const char*>(out), sizeof out).append(kReply, kReplySize);
        reply.append(reinterpret_cast<const char*>(end), sizeof end);
        static_cast<void>(!write(fd, reply.data(), reply.size()));
        return;
    }
}

int listenAt(const char* path) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path, sizeof address.sun_path - 1);
    unlink(path);
    const int fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 || listen(fd, 4096) != 0) exit(1);
    return fd;
}

}  // namespace

int main(int count, char** words) {
    if (count < 3) return 2;
    const bool resident = std::strcmp(words[1], "resident") == 0;
    const char* file = count > 3 ? words[3] : nullptr;
    const int listener = listenAt(words[2]);
    for (;;) {
        const int fd = accept4(listener, nullptr, nullptr, SOCK_CLOEXEC);
        if (fd < 0) continue;
        if (resident) {
            answerFastCgi(fd);
        } else if (fork() == 0) {
            answer(fd, file);
            _exit(0);
        }
        close(fd);
        while (waitpid(-1, nullptr, WNOHANG) > 0) continue;  // their time counts as this process's
    }
}
