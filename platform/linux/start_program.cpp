#include "start_program.h"

#include <fcntl.h>
#include <spawn.h>

#include <cerrno>
#include <csignal>

#include "base/descriptor.h"

namespace vexo {
namespace {

constexpr int kFirstOther = 3;  // descriptor behind standard input, output and error

class Actions {
 public:
    Actions() { posix_spawn_file_actions_init(&actions_); }
    ~Actions() { posix_spawn_file_actions_destroy(&actions_); }
    Actions(const Actions&) = delete;
    Actions& operator=(const Actions&) = delete;
    // Nothing of this process's other files reaches the program: its standard output is a reply under way.
    int give(const std::vector<int>& descriptors) {
        int failure = 0;
        for (int fd = 0; fd < kFirstOther && failure == 0; ++fd) {
            failure = posix_spawn_file_actions_addopen(&actions_, fd, "/dev/null", O_RDWR, 0);
        }
        int next = kFirstOther;
        // Copies above those that are taken, so that none is overwritten before it is given.
        const int above = kFirstOther + static_cast<int>(descriptors.size());
        for (const int fd : descriptors) {
            copies_.emplace_back(fcntl(fd, F_DUPFD_CLOEXEC, above));
            if (!copies_.back()) return errno;
            if (failure == 0) failure = posix_spawn_file_actions_adddup2(&actions_, copies_.back().get(), next++);
        }
        return failure != 0 ? failure : posix_spawn_file_actions_addclosefrom_np(&actions_, next);
    }
    [[nodiscard]] const posix_spawn_file_actions_t* get() const { return &actions_; }

 private:
    posix_spawn_file_actions_t actions_{};
    std::vector<orvel::Descriptor> copies_;
};

class Attributes {
 public:
    explicit Attributes(bool session) {
        posix_spawnattr_init(&attributes_);
        sigset_t all;
        sigset_t none;
        sigfillset(&all);
        sigemptyset(&none);
        posix_spawnattr_setsigdefault(&attributes_, &all);
        posix_spawnattr_setsigmask(&attributes_, &none);
        const int flags = POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK | (session ? POSIX_SPAWN_SETSID : 0);
        posix_spawnattr_setflags(&attributes_, static_cast<short>(flags));
    }
    ~Attributes() { posix_spawnattr_destroy(&attributes_); }
    Attributes(const Attributes&) = delete;
    Attributes& operator=(const Attributes&) = delete;
    [[nodiscard]] const posix_spawnattr_t* get() const { return &attributes_; }

 private:
    posix_spawnattr_t attributes_{};
};

// posix_spawn only reads the texts.
std::vector<char*> pointersTo(const std::vector<std::string>& texts) {
    std::vector<char*> pointers;
    pointers.reserve(texts.size() + 1);
    for (const std::string& text : texts) pointers.push_back(const_cast<char*>(text.c_str()));
    pointers.push_back(nullptr);
    return pointers;
}

}  // namespace

int startProgram(const ProgramStart& what, pid_t& child) {
    Actions actions;
    const Attributes attributes(what.session);
    if (const int failure = actions.give(what.descriptors)) return failure;
    const std::vector<char*> words = pointersTo(what.words), environment = pointersTo(what.environment);
    return posix_spawn(&child, words[0], actions.get(), attributes.get(), words.data(), environment.data());
}

}  // namespace vexo
