// Questions that fail for a reason which may have passed a moment later.
#ifndef VEXO_LINUX_ASK_AGAIN_H
#define VEXO_LINUX_ASK_AGAIN_H

#include <cerrno>
#include <new>

namespace vexo {

inline bool mayPass(int systemCode) {
    return systemCode == EIO || systemCode == EINTR || systemCode == ENOMEM;
}

// What `ask` answers; twice more at most where `failed` says that the answer is a failure and errno, or memory that ran
// out, that it may pass. Callers take a failure for "no", which here would end a visitor's session.
template <class Ask, class Failed>
auto askAgain(const Ask& ask, const Failed& failed) {
    for (int left = 2;; --left) {
        try {
            errno = 0;
            auto answer = ask();
            if (!failed(answer) || left == 0 || !mayPass(errno)) return answer;
        } catch (const std::bad_alloc&) {
            if (left == 0) throw;
        }
    }
}

}  // namespace vexo

#endif
