#include "filesystem/copy_data.h"

#include <linux/fs.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <vector>

namespace vexo {
namespace {

constexpr off_t kPiece = off_t{4} << 20;  // between two questions whether to go on
constexpr size_t kBuffer = size_t{256} << 10;

off_t copied = 0;

class DataCopy {
 public:
    DataCopy(int source, int target, off_t size, int (*isCancelled)())
        : source_(source), target_(target), size_(size), isCancelled_(isCancelled) {}

    bool run() {
        copied = 0;
        if (cancelled()) return false;
        if (ioctl(target_, FICLONE, source_) == 0) return finish(target_);
        off_t from = 0;
        while (from < size_) {
            const off_t begin = dataFrom(from);
            const off_t end = holeFrom(begin);
            if (!copyRange(begin, end)) return false;
            from = end;
        }
        return finish(source_);
    }

 private:
    bool cancelled() {
        if (isCancelled_ == nullptr || isCancelled_() == 0) return false;
        errno = ECANCELED;
        return true;
    }

    // Cuts or extends the target (a hole at the end) to the size that was announced. `judged` must be at least as long:
    // a clone that is shorter, or a source that shrank, would leave zeros where there was data.
    bool finish(int judged) {
        const off_t held = lseek(judged, 0, SEEK_END);
        copied = std::min(held, size_);
        if (held >= size_) return ftruncate(target_, size_) == 0;
        if (held >= 0) errno = EIO;
        return false;
    }

    // Where data begins at or after `from`; the whole rest counts as data where the file system does not say.
    off_t dataFrom(off_t from) {
        const off_t found = lseek(source_, from, SEEK_DATA);
        if (found >= 0) return std::min(found, size_);
        return errno == ENXIO ? size_ : from;
    }

    off_t holeFrom(off_t from) {
        const off_t found = lseek(source_, from, SEEK_HOLE);
        return found > from ? std::min(found, size_) : size_;
    }

    bool copyRange(off_t from, off_t end) {
        while (from < end) {
            copied = from;
            if (cancelled()) return false;
            const size_t piece = static_cast<size_t>(std::min(end - from, kPiece));
            const ssize_t done = inKernel_ ? copyInKernel(from, piece) : copyBuffered(from, piece);
            if (done < 0) return false;
            from += done;
        }
        return true;
    }

    // Bytes copied, -1 with errno. 0 means that the kernel does not do it for these two files.
    ssize_t copyInKernel(off_t from, size_t count) {
        off_t to = from;
        const ssize_t done = copy_file_range(source_, &from, target_, &to, count, 0);
        if (done > 0) return done;
        if (done < 0 && errno == EINTR) return 0;
        if (done < 0 && (errno == ENOSPC || errno == EDQUOT || errno == EFBIG)) return -1;
        inKernel_ = false;  // what is really wrong shows when the bytes go through the buffer
        return 0;
    }

    ssize_t copyBuffered(off_t from, size_t count) {
        buffer_.resize(kBuffer);
        const ssize_t got = pread(source_, buffer_.data(), std::min(count, kBuffer), from);
        if (got < 0) return errno == EINTR ? 0 : -1;
        if (got == 0) {
            errno = EIO;
            return -1;
        }
        return writeAt(from, static_cast<size_t>(got)) ? got : -1;
    }

    bool writeAt(off_t to, size_t count) {
        size_t written = 0;
        while (written < count) {
            const ssize_t put =
                pwrite(target_, buffer_.data() + written, count - written, to + static_cast<off_t>(written));
            if (put > 0) {
                written += static_cast<size_t>(put);
            } else if (put < 0 && errno != EINTR) {
                return false;
            }
        }
        return true;
    }

    int source_;
    int target_;
    off_t size_;
    int (*isCancelled_)();
    bool inKernel_ = true;
    std::vector<char> buffer_;
};

}  // namespace

off_t copiedBytes() {
    return copied;
}

bool copyData(int source, int target, off_t size, int (*isCancelled)()) {
    return DataCopy(source, target, size, isCancelled).run();
}

}  // namespace vexo
