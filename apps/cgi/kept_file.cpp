#include "kept_file.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <utility>

#include "vexo/filesystem.h"

namespace orvel::cgi {
namespace {

constexpr std::string_view kMagic = "ORVLIST1";
constexpr size_t kHeader = 88;          // with the checksum at its end
constexpr size_t kTableEntry = 12;      // length and checksum of a block
constexpr size_t kLongestMeta = 65536;  // path and pattern
constexpr size_t kLongestName = 255;
constexpr size_t kLongestBlock = KeptFile::kRowsInBlock * (kLongestName + 2);
constexpr uint32_t kMostRows = uint32_t{1} << 26;

// FNV-1a: against accidents, not against the owner of the file.
uint64_t hashOf(std::string_view bytes, uint64_t hash = 0xcbf29ce484222325U) {
    for (const char byte : bytes) hash = (hash ^ static_cast<unsigned char>(byte)) * 0x100000001b3U;
    return hash;
}

// A block in the place of another one is damage, too.
uint64_t hashOfBlock(std::string_view bytes, uint64_t number) {
    return hashOf(bytes, (0xcbf29ce484222325U ^ number) * 0x100000001b3U);
}

void put(std::string& out, uint64_t value, size_t bytes) {
    for (size_t i = 0; i < bytes; ++i) out += static_cast<char>(value >> (8 * i) & 0xFF);
}

uint64_t take(std::string_view& bytes, size_t count) {
    uint64_t value = 0;
    for (size_t i = 0; i < count; ++i) value |= uint64_t{static_cast<unsigned char>(bytes[i])} << (8 * i);
    bytes.remove_prefix(count);
    return value;
}

void putState(std::string& out, const FolderState& state) {
    put(out, state.device, 8);
    put(out, state.inode, 8);
    for (const int64_t time : {state.modified, state.modifiedNs, state.changed, state.changedNs})
        put(out, static_cast<uint64_t>(time), 8);
}

FolderState takeState(std::string_view& bytes) {
    FolderState state;
    state.device = take(bytes, 8);
    state.inode = take(bytes, 8);
    for (int64_t* time : {&state.modified, &state.modifiedNs, &state.changed, &state.changedNs})
        *time = static_cast<int64_t>(take(bytes, 8));
    return state;
}

bool readAt(int fd, uint64_t offset, size_t length, std::string& bytes) {
    bytes.resize(length);
    for (size_t got = 0; got < length;) {
        const ssize_t part = pread(fd, bytes.data() + got, length - got, static_cast<off_t>(offset + got));
        if (part < 0 && errno == EINTR) continue;
        if (part <= 0) return false;
        got += static_cast<size_t>(part);
    }
    return true;
}

// A name that a listing can have shown.
bool isShownName(const std::string& name) {
    return !name.empty() && name != "." && name != ".." && name.find('/') == std::string::npos &&
           name.find('\0') == std::string::npos && VEXOEAIsHiddenFile(name.c_str()) == 0;
}

bool parseRows(std::string_view bytes, size_t count, std::vector<KeptRow>& rows) {
    rows.clear();
    for (size_t i = 0; i < count; ++i) {
        if (bytes.size() < 2) return false;
        const uint64_t kind = take(bytes, 1);
        const uint64_t length = take(bytes, 1);
        if (kind > 1 || length > bytes.size()) return false;
        rows.push_back({std::string(bytes.substr(0, length)), kind == 1});
        bytes.remove_prefix(length);
        if (!isShownName(rows.back().name)) return false;
    }
    return bytes.empty();
}

}  // namespace

bool stateOf(const Descriptor& folder, FolderState& state) {
    struct stat status {};
    if (fstat(folder.get(), &status) != 0) return false;
    state = {status.st_dev,          status.st_ino,         status.st_mtim.tv_sec,
             status.st_mtim.tv_nsec, status.st_ctim.tv_sec, status.st_ctim.tv_nsec};
    return true;
}

void KeptText::add(std::string_view name, bool isFolder) {
    put(blocks_, isFolder ? 1 : 0, 1);
    put(blocks_, name.size(), 1);
    blocks_ += name;
    if (++rows_ % KeptFile::kRowsInBlock == 0) closeBlock();
}

void KeptText::closeBlock() {
    const std::string_view block = std::string_view(blocks_).substr(begin_);
    put(table_, block.size(), 4);
    put(table_, hashOfBlock(block, table_.size() / kTableEntry), 8);
    begin_ = blocks_.size();
}

std::string KeptText::finish(const KeptAbout& about) {
    if (rows_ % KeptFile::kRowsInBlock != 0) closeBlock();
    std::string meta = about.path;
    meta += '\0';
    meta += about.pattern;
    std::string whole(kMagic);
    put(whole, rows_, 4);
    put(whole, meta.size(), 4);
    put(whole, static_cast<uint64_t>(about.type), 8);
    putState(whole, about.folder);
    put(whole, 0, 8);  // of no meaning yet
    put(whole, hashOf(table_, hashOf(meta, hashOf(whole))), 8);
    whole.reserve(whole.size() + meta.size() + table_.size() + blocks_.size());
    return whole.append(meta).append(table_).append(blocks_);
}

bool KeptFile::open(Descriptor file) {
    loadedBlock_ = UINT32_MAX;
    struct stat status {};
    std::string header;
    if (fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) return false;
    if (!readAt(file.get(), 0, kHeader, header) || !header.starts_with(kMagic)) return false;
    std::string_view rest = std::string_view(header).substr(kMagic.size());
    rows_ = static_cast<uint32_t>(take(rest, 4));
    const size_t metaLength = take(rest, 4);
    const uint64_t type = take(rest, 8);
    about_.folder = takeState(rest);
    take(rest, 8);
    const uint64_t hash = take(rest, 8);
    if (rows_ > kMostRows || metaLength > kLongestMeta || type > 2) return false;
    about_.type = static_cast<int>(type);

    const size_t tableLength = (size_t{rows_} + kRowsInBlock - 1) / kRowsInBlock * kTableEntry;
    const uint64_t blocksBegin = kHeader + metaLength + tableLength;
    if (status.st_size < 0 || blocksBegin > static_cast<uint64_t>(status.st_size)) return false;
    std::string bytes;
    if (!readAt(file.get(), kHeader, metaLength + tableLength, bytes)) return false;
    if (hashOf(bytes, hashOf(std::string_view(header).substr(0, kHeader - 8))) != hash) return false;
    const std::string_view meta = std::string_view(bytes).substr(0, metaLength);
    const size_t end = meta.find('\0');
    if (end == std::string_view::npos || meta.find('\0', end + 1) != std::string_view::npos) return false;
    about_.path = meta.substr(0, end);
    about_.pattern = meta.substr(end + 1);
    file_ = std::move(file);
    return readTable(std::string_view(bytes).substr(metaLength), blocksBegin, static_cast<uint64_t>(status.st_size));
}

bool KeptFile::readTable(std::string_view table, uint64_t begin, uint64_t size) {
    blocks_.clear();
    while (!table.empty()) {
        const auto length = static_cast<uint32_t>(take(table, 4));
        if (length > kLongestBlock) return false;
        blocks_.push_back({begin, take(table, 8), length});
        begin += length;
    }
    return begin == size;
}

bool KeptFile::load(uint32_t block) {
    if (block == loadedBlock_) return true;
    loadedBlock_ = UINT32_MAX;
    const Block& wanted = blocks_[block];
    std::string bytes;
    if (!readAt(file_.get(), wanted.offset, wanted.length, bytes)) return false;
    if (hashOfBlock(bytes, block) != wanted.hash) return false;
    const size_t before = size_t{block} * kRowsInBlock;
    if (!parseRows(bytes, std::min<size_t>(kRowsInBlock, rows_ - before), loaded_)) return false;
    loadedBlock_ = block;
    return true;
}

bool KeptFile::row(uint32_t number, KeptRow& row) {
    if (number >= rows_ || !load(number / kRowsInBlock)) return false;
    row = loaded_[number % kRowsInBlock];
    return true;
}

bool KeptFile::each(uint32_t first, uint32_t end,
                    const std::function<bool(uint32_t number, const KeptRow& row)>& take) {
    for (uint32_t number = first; number < std::min(end, rows_); ++number) {
        if (!load(number / kRowsInBlock)) return false;
        if (!take(number, loaded_[number % kRowsInBlock])) break;
    }
    return true;
}

}  // namespace orvel::cgi
