#include "index/index_names.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstring>

#include "failure.h"
#include "index/index_names_format.h"
#include "io/file_io.h"

namespace vexo::fileindex {

std::unique_ptr<const Names> Names::open(const std::string& path, Database& index) {
    const KeepErrno keep;
    const QuietFailures quiet;
    int64_t mark = 0;
    struct stat status {};
    const Descriptor file = openFile(path, O_RDONLY | O_NOFOLLOW | O_NONBLOCK);
    if (!file || fstat(file.get(), &status) != 0 || !isTrusted(status, S_IFREG) || !readMark(index, mark)) {
        return nullptr;
    }
    const auto size = static_cast<size_t>(status.st_size);
    if (size < sizeof(NamesHead)) return nullptr;
    void* mapped = mmap(nullptr, size, PROT_READ, MAP_SHARED, file.get(), 0);
    if (mapped == MAP_FAILED) return nullptr;
    std::unique_ptr<Names> names(new Names(static_cast<const char*>(mapped), size));
    return names->read(mark) ? std::move(names) : nullptr;
}

Names::~Names() {
    munmap(const_cast<char*>(mapped_), size_);
}

bool Names::read(int64_t index) {
    NamesHead head;
    memcpy(&head, mapped_, sizeof head);
    const uint64_t most = (size_ - sizeof head) / sizeof(uint32_t);
    if (memcmp(head.magic, kNamesMagic, sizeof head.magic) != 0 || index == 0 || head.index != index) return false;
    if (head.count > most || head.textsAt < sizeof head + head.count * sizeof(uint32_t) || head.textsAt > size_ ||
        head.textsSize != size_ - head.textsAt || (head.textsSize > 0 && mapped_[size_ - 1] != '\0')) {
        return false;
    }
    count_ = head.count;
    highest_ = head.highest;
    texts_ = std::string_view(mapped_ + head.textsAt, head.textsSize);
    return true;
}

int64_t Names::id(size_t position) const {
    uint32_t id = 0;
    memcpy(&id, mapped_ + sizeof(NamesHead) + position * sizeof id, sizeof id);
    return id;
}

NamesCursor::NamesCursor(const Names& names, bool descending)
    : names_(&names),
      descending_(descending),
      left_(names.texts()),
      at_(descending ? names.count() : static_cast<size_t>(-1)),
      end_(at_ + 1),
      first_(at_) {}

bool NamesCursor::next() {
    return descending_ ? nextDescending() : nextAscending();
}

bool NamesCursor::nextAscending() {
    if (left_.empty() || ++at_ >= names_->count()) return false;
    name_ = left_.substr(0, left_.find('\0'));
    left_.remove_prefix(name_.size() + 1);
    return true;
}

bool NamesCursor::nextDescending() {
    if (++at_ < end_ && at_ < names_->count()) return true;
    const auto last = [this] {
        const std::string_view texts = left_.substr(0, left_.size() - 1);
        return texts.substr(texts.rfind('\0') + 1);  // of npos + 1: from the beginning
    };
    if (left_.empty() || first_ == 0) return false;
    end_ = first_;
    name_ = last();
    do {
        left_.remove_suffix(name_.size() + 1);
        --first_;
    } while (!left_.empty() && first_ > 0 && last() == name_);
    at_ = first_;
    return true;
}

}  // namespace vexo::fileindex
