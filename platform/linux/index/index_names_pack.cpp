// Packing the names of a share's index.
#include <sys/random.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <limits>
#include <map>
#include <optional>
#include <string>
#include <tuple>
#include <vector>

#include "base/new_file.h"
#include "failure.h"
#include "index/index_alternatives.h"
#include "index/index_names.h"
#include "index/index_names_format.h"
#include "index/index_sort.h"
#include "io/file_io.h"

namespace vexo::fileindex {
namespace {

constexpr int64_t kFewChanges = 1000;
constexpr int64_t kPartOfRecords = 100;
// So many new names are sorted in memory and merged with those that are packed already.
constexpr int64_t kMostMerged = 65536;

bool readNumber(Database& index, const char* sql, int64_t& number) {
    Statement statement;
    const bool read = statement.prepare(index.handle(), sql) && statement.step() == Statement::kRow;
    if (read) number = statement.number(0);
    return read;
}

// Makes a mark where the index has none.
bool markIndex(Database& index, int64_t& mark) {
    if (!readMark(index, mark)) return false;
    if (mark != 0) return true;
    if (!execute(index.handle(), drawMark().c_str())) return false;
    return readMark(index, mark) && mark != 0;
}

// A file at several places at once: each of its parts but the last ones begins where the one before it ends when there
// are as many names as there may be.
class Packing {
 public:
    Packing(int fd, int64_t mostNames)
        : ids_(fd, sizeof(NamesHead)),
          extensions_(fd, ids_.end() + static_cast<uint64_t>(mostNames) * sizeof(uint32_t)),
          blocks_(fd, extensions_.end() + static_cast<uint64_t>(mostNames) * sizeof(uint16_t)),
          texts_(fd, blocks_.end() + (static_cast<uint64_t>(mostNames) / kNamesOfBlock + 1) * sizeof(uint64_t)),
          extensionsAt_(extensions_.end()),
          blocksAt_(blocks_.end()),
          textsAt_(texts_.end()),
          most_(mostNames) {}

    void add(int64_t id, std::string_view name) {
        if (count_ == most_) {
            overfull_ = true;
            return;
        }
        if (count_ % static_cast<int64_t>(kNamesOfBlock) == 0) addNumber(blocks_, texts_.end() - textsAt_);
        ++count_;
        addNumber(ids_, static_cast<uint32_t>(id));
        addNumber(extensions_, numberOf(name));
        texts_.add(name);
        texts_.add(kNul);
    }
    // False with errno.
    [[nodiscard]] bool finish(int fd, int64_t mark, int64_t highest) {
        NamesHead head{{},
                       mark,
                       highest,
                       static_cast<uint64_t>(count_),
                       extensionsAt_,
                       blocksAt_,
                       textsAt_,
                       texts_.end() - textsAt_,
                       texts_.end(),
                       list_.size()};
        memcpy(head.magic, kNamesMagic, sizeof head.magic);
        texts_.add(list_);
        if (overfull_) errno = EAGAIN;
        return !overfull_ && ids_.flush() && extensions_.flush() && blocks_.flush() && texts_.flush() &&
               ftruncate(fd, static_cast<off_t>(texts_.end())) == 0 && pwrite(fd, &head, sizeof head, 0) == sizeof head;
    }

 private:
    class Stretch {
     public:
        Stretch(int fd, uint64_t at) : fd_(fd), at_(at) {}
        void add(std::string_view bytes) {
            block_ += bytes;
            if (block_.size() >= kBlock) static_cast<void>(flush());
        }
        bool flush() {
            for (std::string_view rest = block_; !rest.empty() && reason_ == 0;) {
                const ssize_t written = pwrite(fd_, rest.data(), rest.size(), static_cast<off_t>(at_));
                if (written < 0 && errno != EINTR) reason_ = errno;
                if (written == 0) reason_ = EIO;
                if (written <= 0) continue;
                at_ += static_cast<uint64_t>(written);
                rest.remove_prefix(static_cast<size_t>(written));
            }
            block_.clear();
            if (reason_ != 0) errno = reason_;
            return reason_ == 0;
        }
        [[nodiscard]] uint64_t end() const { return at_ + block_.size(); }

     private:
        static constexpr size_t kBlock = 1 << 16;
        int fd_;
        uint64_t at_;
        std::string block_;
        int reason_ = 0;
    };

    static constexpr std::string_view kNul{"\0", 1};
    static constexpr size_t kLongest = 32;  // of extensions; what is longer hardly comes twice

    template <class Number>
    static void addNumber(Stretch& stretch, Number number) {
        stretch.add({reinterpret_cast<const char*>(&number), sizeof number});
    }

    uint16_t numberOf(std::string_view name) {
        const std::optional<std::string_view> extension = extensionOf(name, buffer_);
        if (!extension) return kNoExtension;
        const auto known = numbers_.find(*extension);
        if (known != numbers_.end()) return known->second;
        if (extension->size() > kLongest || numbers_.size() == kMostExtensions) return kOtherExtension;
        list_ += *extension;
        list_ += kNul;
        const auto number = static_cast<uint16_t>(numbers_.size() + 1);
        numbers_.emplace(*extension, number);
        return number;
    }

    Stretch ids_, extensions_, blocks_, texts_;
    uint64_t extensionsAt_, blocksAt_, textsAt_;
    int64_t most_, count_ = 0;
    bool overfull_ = false;
    std::map<std::string, uint16_t, std::less<>> numbers_;
    std::string list_;  // of extensions, in the order of their numbers
    std::string buffer_;
};

// SQLite sorts in a file of its own what does not fit its cache.
bool packAll(Database& index, Packing& packing) {
    Statement statement;
    if (!statement.prepare(index.handle(), "SELECT id,name FROM record ORDER BY vexo_key(name),name,path")) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) packing.add(statement.number(0), statement.text(1));
    return step == Statement::kDone;
}

struct NewName {
    std::string key, path, name;
    int64_t id;
};

bool readNew(Database& index, int64_t after, std::vector<NewName>& names) {
    Statement statement;
    if (!statement.prepare(index.handle(), "SELECT id,name,path FROM record WHERE id>?") || !statement.bind(1, after)) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) {
        NewName one{{}, std::string(statement.text(2)), std::string(statement.text(1)), statement.number(0)};
        appendKey(one.name, false, one.key);
        names.push_back(std::move(one));
    }
    std::sort(names.begin(), names.end(),
              [](const NewName& a, const NewName& b) { return std::tie(a.key, a.path) < std::tie(b.key, b.path); });
    return step == Statement::kDone;
}

// Which ids up to the highest have a record.
bool readPresent(Database& index, int64_t highest, std::vector<bool>& present) {
    present.assign(static_cast<size_t>(highest) + 1, false);
    Statement statement;
    if (!statement.prepare(index.handle(), "SELECT id FROM record WHERE id<=?") || !statement.bind(1, highest)) {
        return false;
    }
    Statement::Step step = statement.step();
    for (; step == Statement::kRow; step = statement.step()) present[static_cast<size_t>(statement.number(0))] = true;
    return step == Statement::kDone;
}

bool packMerged(Database& index, const Names& old, Packing& packing) {
    std::vector<NewName> names;
    std::vector<bool> present;
    Statement pathOf;
    if (!readNew(index, old.highest(), names) || !readPresent(index, old.highest(), present) ||
        !pathOf.prepare(index.handle(), "SELECT path FROM record WHERE id=?")) {
        return false;
    }
    auto next = names.begin();
    std::string key;
    // Whether the next new name stands before a packed one.
    const auto isBefore = [&](int64_t id, bool& before) {
        const int difference = next->key.compare(key);
        before = difference < 0;
        if (difference != 0) return true;
        if (!pathOf.bind(1, id) || pathOf.step() != Statement::kRow) return false;
        before = next->path < pathOf.text(0);
        pathOf.reset();
        return true;
    };
    for (NamesCursor at(old, false, {}); at.next();) {
        const auto id = static_cast<size_t>(at.id());
        if (id >= present.size() || !present[id]) continue;
        if (next != names.end()) {
            key.clear();
            appendKey(at.name(), false, key);
        }
        for (bool before = true; next != names.end();) {
            if (!isBefore(at.id(), before)) return false;
            if (!before) break;
            packing.add(next->id, next->name);
            ++next;
        }
        packing.add(at.id(), at.name());
    }
    for (; next != names.end(); ++next) packing.add(next->id, next->name);
    return true;
}

bool publish(const std::string& path, int folder, orvel::NewFile& file) {
    if (file.publish(path.substr(path.rfind('/') + 1), true) && fsync(folder) == 0) return true;
    fail(errorOfErrno(errno));
    return false;
}

bool pack(const std::string& path, Database& index, Packing& packing, int64_t highest) {
    const std::unique_ptr<const Names> old = Names::open(path, index);
    const bool merges = old != nullptr && highest - old->highest() <= kMostMerged && old->highest() <= highest;
    return merges ? packMerged(index, *old, packing) : packAll(index, packing);
}

}  // namespace

std::string drawMark() {
    int32_t mark = 0;
    while (mark <= 0) {
        if (getrandom(&mark, sizeof mark, 0) != sizeof mark) mark = 0;
    }
    return "PRAGMA user_version=" + std::to_string(mark);
}

bool readMark(Database& index, int64_t& mark) {
    return readNumber(index, "PRAGMA user_version", mark);
}

bool namesAreOld(const std::string& path, Database& index) {
    const std::unique_ptr<const Names> names = Names::open(path, index);
    State state{};
    int64_t highest = 0;
    const QuietFailures quiet;
    if (names == nullptr) return true;
    if (!index.readState(state) || !index.readHighest(highest)) return false;
    const int64_t added = highest - names->highest();
    const int64_t removed = static_cast<int64_t>(names->count()) + added - state.records;
    return std::max(added, removed) >= std::max(state.records / kPartOfRecords, kFewChanges);
}

bool packNames(const std::string& path, Database& index) {
    int64_t mark = 0;
    if (!markIndex(index, mark)) return false;
    const Descriptor folder = openFile(path.substr(0, path.rfind('/')), O_RDONLY | O_DIRECTORY);
    orvel::NewFile file(folder.get());
    if (!folder || !file.create(path.substr(path.rfind('/') + 1), 0600)) {
        fail(errorOfErrno(errno));
        return false;
    }
    State state{};
    int64_t highest = 0;
    // What is read must be one state of the index.
    const bool began =
        execute(index.handle(), "PRAGMA temp_store=FILE;BEGIN") && index.readState(state) && index.readHighest(highest);
    if (began && highest > std::numeric_limits<uint32_t>::max()) {
        index.rollBack();
        return true;  // no file of this version can name them, and searches do without
    }
    Packing packing(file.get(), state.records);
    const bool packed = began && pack(path, index, packing, highest);
    const KeepErrno keep;
    index.rollBack();
    if (!packed) return false;
    if (packing.finish(file.get(), mark, highest)) return publish(path, folder.get(), file);
    fail(errorOfErrno(errno));
    return false;
}

}  // namespace vexo::fileindex
