#include "index/index_names.h"

#include <sys/mman.h>

#include <algorithm>
#include <cstring>
#include <utility>

#include "failure.h"
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
    if (memcmp(head.magic, kNamesMagic, sizeof head.magic) != 0 || index == 0 || head.index != index) return false;
    const uint64_t blocks = (head.count + kNamesOfBlock - 1) / kNamesOfBlock;
    uint64_t from = sizeof head;
    // Whether so many things of that size lie behind those before them.
    const auto holds = [&](uint64_t at, uint64_t count, uint64_t bytes) {
        if (at < from || at > size_ || count > (size_ - at) / bytes) return false;
        from = at + count * bytes;
        return true;
    };
    const auto endsText = [&](uint64_t size) { return size == 0 || mapped_[from - 1] == '\0'; };
    if (!holds(sizeof head, head.count, sizeof(uint32_t)) || !holds(head.extensionsAt, head.count, sizeof(uint16_t)) ||
        !holds(head.blocksAt, blocks, sizeof(uint64_t)) || !holds(head.textsAt, head.textsSize, 1) ||
        !endsText(head.textsSize) || !holds(head.listAt, head.listSize, 1) || !endsText(head.listSize) ||
        from != size_) {
        return false;
    }
    count_ = head.count;
    highest_ = head.highest;
    extensionsAt_ = head.extensionsAt;
    blocksAt_ = head.blocksAt;
    texts_ = std::string_view(mapped_ + head.textsAt, head.textsSize);
    list_ = std::string_view(mapped_ + head.listAt, head.listSize);
    return true;
}

std::string_view Names::textsOfBlock(size_t block) const {
    const auto at = numberAt<uint64_t>(blocksAt_, block);
    return texts_.substr(std::min<uint64_t>(at, texts_.size()));
}

NamesCursor::NamesCursor(const Names& names, bool descending, std::vector<bool> wanted)
    : names_(&names),
      descending_(descending),
      wanted_(std::move(wanted)),
      at_(descending ? names.count() : static_cast<size_t>(-1)),
      end_(at_ + 1),
      first_(at_),
      block_(static_cast<size_t>(-1)) {}

bool NamesCursor::next() {
    return descending_ ? nextDescending() : nextAscending();
}

bool NamesCursor::nextAscending() {
    do {
        if (++at_ >= names_->count()) return false;
    } while (!isWanted(at_));
    return true;
}

// Equal names have the same extension.
bool NamesCursor::nextDescending() {
    if (++at_ < end_ && at_ < names_->count()) return true;
    do {
        if (first_ == 0) return false;
        --first_;
    } while (!isWanted(first_));
    end_ = first_ + 1;
    const std::string_view name = nameAt(first_);
    while (first_ > 0 && nameAt(first_ - 1) == name) --first_;
    at_ = first_;
    return true;
}

std::string_view NamesCursor::nameAt(size_t at) {
    if (at / kNamesOfBlock != block_) {
        block_ = at / kNamesOfBlock;
        std::string_view left = names_->textsOfBlock(block_);
        for (std::string_view& text : texts_) {
            text = left.substr(0, left.find('\0'));
            left.remove_prefix(std::min(text.size() + 1, left.size()));
        }
    }
    return texts_[at % kNamesOfBlock];
}

}  // namespace vexo::fileindex
