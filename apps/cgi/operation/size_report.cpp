#include "operation/size_report.h"

#include <algorithm>
#include <utility>

#include "orvel/error_state.h"
#include "reply.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostUnreadable = 10;  // said by name
// What the lists may come to as they are written: together with the errors of the items they fit into the record.
constexpr size_t kPartsRoom = size_t{256} * 1024;
constexpr size_t kLargestRoom = size_t{96} * 1024;
constexpr size_t kUnreadableRoom = size_t{4} * 1024;  // for each of them
constexpr size_t kMembers = 200;                      // numbers and names of members

// At most: JSON writes some bytes as "\uXXXX", and a path that is no text comes twice.
size_t writtenLength(const std::string& path) {
    constexpr size_t kEscaped = 9;
    size_t length = kMembers;
    for (const char one : path) length += one >= ' ' && one < 0x7f && one != '"' && one != '\\' ? 1 : kEscaped;
    return length;
}

const char* wordOf(SizeKind kind) {
    switch (kind) {
        case SizeKind::kFile:
            return "file";
        case SizeKind::kFolder:
            return "folder";
        case SizeKind::kOther:
            return "other";
        default:
            return "mount";
    }
}

void put(const Amount& amount, Json::Value& out) {
    out["size"] = Json::Int64{amount.size};
    out["disk"] = Json::Int64{amount.disk};
    out["files"] = Json::Int64{amount.files};
    out["folders"] = Json::Int64{amount.folders};
}

Json::Value valueOf(const Sized& one) {
    Json::Value value;
    putPath(value, "path", one.path);
    value["kind"] = wordOf(one.kind);
    put(one.amount, value);
    if (one.amount.unreadable > 0) value["unreadable"] = Json::Int64{one.amount.unreadable};
    return value;
}

// As many as there is room for; what is left over goes to `left`.
template <class Left>
Json::Value listOf(const std::vector<Sized>& all, size_t room, Left&& left) {
    Json::Value list(Json::arrayValue);
    for (const Sized& one : all) {
        const size_t length = writtenLength(one.path);
        if (length > room) {
            left(one);
            continue;
        }
        room -= length;
        list.append(valueOf(one));
    }
    return list;
}

// The larger one first; of two that are equal the one whose path comes first.
bool isLarger(const Sized& a, const Sized& b) {
    return a.amount.size != b.amount.size ? a.amount.size > b.amount.size : a.path < b.path;
}

}  // namespace

void Amount::add(const Amount& more) {
    size += more.size;
    disk += more.disk;
    files += more.files;
    folders += more.folders;
    others += more.others;
    mounts += more.mounts;
    unreadable += more.unreadable;
}

bool Largest::takes(long long size) const {
    return heap_.size() < most_ || size >= heap_.front().amount.size;
}

Sized Largest::add(Sized one) {
    heap_.push_back(std::move(one));
    std::push_heap(heap_.begin(), heap_.end(), isLarger);
    if (heap_.size() <= most_) return {};
    std::pop_heap(heap_.begin(), heap_.end(), isLarger);
    Sized least = std::move(heap_.back());
    heap_.pop_back();
    return least;
}

std::vector<Sized> Largest::sorted() const {
    std::vector<Sized> all = heap_;
    std::sort(all.begin(), all.end(), isLarger);
    return all;
}

LinkedFiles::Met LinkedFiles::meet(dev_t device, ino_t inode, std::uint64_t links) {
    const auto found = left_.find({device, inode});
    if (found != left_.end()) {
        if (--found->second == 0) left_.erase(found);
        return Met::kAgain;
    }
    if (left_.size() >= most_) return Met::kUnknown;
    left_.emplace(Key{device, inode}, links - 1);
    return Met::kFirst;
}

void SizeReport::part(Sized one) {
    const Sized least = parts_.add(std::move(one));
    if (least.path.empty()) return;
    rest_.add(least.amount);
    ++restCount_;
}

bool SizeReport::keeps(SizeKind kind, long long size) const {
    if (size == 0 || (kind != SizeKind::kFile && kind != SizeKind::kFolder)) return false;
    return (kind == SizeKind::kFolder ? folders_ : files_).takes(size);
}

void SizeReport::largest(Sized one) {
    (one.kind == SizeKind::kFolder ? folders_ : files_).add(std::move(one));
}

void SizeReport::unreadable(const std::string& path, int error) {
    if (unreadable_.size() >= kMostUnreadable || writtenLength(path) > kUnreadableRoom) return;
    const int code = OrvParseErrnoToError(error, nullptr, nullptr);
    Json::Value one;
    putPath(one, "path", path);
    one["code"] = code;
    one["key"] = OrvParseErrorToKTRString(code, nullptr);
    unreadable_.append(one);
}

Json::Value SizeReport::json(bool lists) const {
    Json::Value out;
    put(total, out);
    if (!folder_.empty()) putPath(out, "path", folder_);
    out["others"] = Json::Int64{total.others};
    out["mounts"] = Json::Int64{total.mounts};
    out["linked"] = Json::Int64{linked};
    out["links_unknown"] = Json::Int64{linksUnknown};
    out["unreadable"] = Json::Int64{total.unreadable};
    if (!lists) return out;
    out["unreadable_first"] = unreadable_;
    Amount rest = rest_;
    long long count = restCount_;
    out["parts"] = listOf(parts_.sorted(), kPartsRoom, [&](const Sized& one) {
        rest.add(one.amount);
        ++count;
    });
    put(rest, out["rest"]);
    out["rest"]["count"] = Json::Int64{count};
    const auto forget = [](const Sized&) {};
    out["largest_files"] = listOf(files_.sorted(), kLargestRoom, forget);
    out["largest_folders"] = listOf(folders_.sorted(), kLargestRoom, forget);
    return out;
}

void leaveOutLists(Json::Value& measured) {
    for (const char* list : {"parts", "largest_files", "largest_folders", "unreadable_first"}) {
        measured.removeMember(list);
    }
}

}  // namespace orvel::cgi
