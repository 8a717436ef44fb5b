#include "tus/record.h"

#include <fcntl.h>
#include <json/reader.h>
#include <json/value.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <thread>

#include "base/file.h"
#include "base/hex.h"
#include "base/new_file.h"
#include "folder_names.h"
#include "orvel/error_state.h"
#include "request.h"
#include "search_task.h"
#include "text.h"
#include "user_folder.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace orvel::cgi {
namespace {

constexpr size_t kIdLength = 32;
constexpr size_t kLongestRecord = 64 * 1024;
constexpr std::string_view kMagic = "ORVTUS1 ";
constexpr size_t kHead = 31;  // the first line: magic, state, blank, twenty digits, line feed
constexpr int kMostUnfinished = 100;
constexpr int kMostRecords = 300;  // with those that are over
constexpr std::chrono::milliseconds kLookAgain{20};
constexpr long long kDefaultGiB = 1024, kMostGiB = 1 << 20;
constexpr std::array<std::string_view, 4> kConflicts = {"error", "skip", "overwrite", "keep_both"};
// What makes room does so here, not in makeRoom: an unfinished upload is nobody's to forget.
constexpr OwnStore kStore = {"/var/lib/vexo/uploads", kMostRecords, 0, kUploadKeptSeconds, isUploadId};

int codeOf(int error) {
    return OrvParseErrnoToError(error, nullptr, nullptr);
}

std::string headOf(UploadState state, long long number) {
    char text[kHead + 1];
    snprintf(text, sizeof text, "%s%c %020lld\n", kMagic.data(), static_cast<char>(state), number);
    return text;
}

bool parseHead(std::string_view text, UploadState& state, long long& number) {
    if (text.size() < kHead || !text.starts_with(kMagic) || text[kMagic.size() + 1] != ' ' || text[kHead - 1] != '\n')
        return false;
    const char letter = text[kMagic.size()];
    const auto digits = parseNumber(text.substr(kMagic.size() + 2, kHead - 1 - kMagic.size() - 2));
    if (std::string_view("gcnds").find(letter) == std::string_view::npos || !digits || *digits > INT64_MAX)
        return false;
    state = static_cast<UploadState>(letter);
    number = static_cast<long long>(*digits);
    return true;
}

std::string textOf(const std::string& user, const UploadFacts& facts) {
    Json::Value value;
    value["user"] = percentEncode(user);
    value["path"] = percentEncode(facts.path);
    value["size"] = static_cast<Json::Int64>(facts.size);
    value["conflict"] = facts.conflict;
    if (facts.modified) value["mtime"] = static_cast<Json::Int64>(*facts.modified);
    value["search"] = facts.search;
    value["metadata"] = facts.metadata;
    value["folder"] = facts.folder;
    value["created"] = static_cast<Json::Int64>(facts.created);
    std::string text;
    appendJson(value, text);
    return text;
}

bool areStrings(const Json::Value& value, std::initializer_list<const char*> names) {
    return std::all_of(names.begin(), names.end(), [&](const char* name) { return value[name].isString(); });
}

bool parseJson(std::string_view text, Json::Value& value) try {
    Json::CharReaderBuilder builder;
    Json::CharReaderBuilder::strictMode(&builder.settings_);
    builder["stackLimit"] = 4;
    const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    return reader->parse(text.data(), text.data() + text.size(), &value, nullptr) && value.isObject();
} catch (const Json::Exception&) {
    return false;  // the reader's way of reporting too many levels
}

bool isNumber(const Json::Value& value) {
    return value.isInt64() && value.asInt64() >= 0;
}

bool lockWithin(int fd, std::chrono::seconds wait) {
    const auto end = std::chrono::steady_clock::now() + wait;
    while (!lockFile(fd, LOCK_EX | LOCK_NB)) {
        if (errno != EWOULDBLOCK || std::chrono::steady_clock::now() >= end) return false;
        std::this_thread::sleep_for(kLookAgain);
    }
    return true;
}

// What is more than may be kept, of those that are over, oldest first.
void forget(const Descriptor& folder, std::vector<UploadRecord>& over) {
    std::sort(over.begin(), over.end(),
              [](const UploadRecord& a, const UploadRecord& b) { return a.expires() < b.expires(); });
    for (size_t i = 0; i + (kMostRecords - kMostUnfinished) <= over.size(); ++i) {
        static_cast<void>(removeUnheld(folder, over[i].id()));
    }
}

std::vector<UploadRecord> recordsOf(const std::string& user, const Descriptor& folder) {
    std::vector<std::string> names;
    std::vector<UploadRecord> records;
    static_cast<void>(namesIn(folder.get(), Hidden::kInclude, names));
    for (const std::string& name : names) {
        UploadRecord record;
        if (isUploadId(name) && record.open(user, name, false) == ORV_ERR_NONE) records.push_back(std::move(record));
    }
    return records;
}

// Whether the user may begin one more of this size; those that are over make room.
bool hasRoom(const std::string& user, const Descriptor& folder, long long size) {
    std::vector<UploadRecord> records = recordsOf(user, folder), over;
    long long sum = size, most = mostUnfinishedBytes();
    int unfinished = 0;
    for (UploadRecord& record : records) {
        if (record.isOver()) {
            over.push_back(std::move(record));
            continue;
        }
        ++unfinished;
        if (record.facts().size > most - sum) return false;
        sum += record.facts().size;
    }
    forget(folder, over);
    return unfinished < kMostUnfinished && sum <= most;
}

}  // namespace

bool isConflict(std::string_view word) {
    return std::find(kConflicts.begin(), kConflicts.end(), word) != kConflicts.end();
}

bool isUploadId(std::string_view text) {
    return text.size() == kIdLength && text.find_first_not_of(kLowerHex) == std::string_view::npos;
}

long long mostUnfinishedBytes() {
    const VexoConf::Info settings;
    const auto set = parseNumber(settings.Get("unfinished_upload_gib", ""));
    return std::min(set ? static_cast<long long>(std::min<unsigned long>(*set, kMostGiB)) : kDefaultGiB, kMostGiB)
           << 30;
}

long long UploadRecord::counted(long long size) const {
    return state_ == UploadState::kChecked ? std::min(size, number_) : size;
}

int UploadRecord::create(const std::string& user, const std::string& id, UploadFacts facts) {
    folder_ = openUserFolder(kStore.path, user, true);
    // What is begun at the same time is counted, too.
    if (!folder_ || !lockFile(folder_.get(), LOCK_EX)) return codeOf(errno);
    if (!hasRoom(user, folder_, facts.size)) return ORV_ERR_QUOTA;
    NewFile file(folder_.get());
    const std::string text = headOf(UploadState::kGoing, 0) + textOf(user, facts);
    if (text.size() > kLongestRecord) return ORV_ERR_PARAMETER;
    const bool made = file.create(id, 0600) && writeAll(file.get(), text) && fdatasync(file.get()) == 0 &&
                      file.publish(id, false) && syncName(folder_.get(), id);
    const int code = made ? static_cast<int>(ORV_ERR_NONE) : codeOf(errno);
    static_cast<void>(lockFile(folder_.get(), LOCK_UN));
    return made ? open(user, id, true) : code;
}

int UploadRecord::take(const Descriptor& folder, bool lock, std::chrono::seconds wait) {
    file_ = openFile(folder.get(), id_.c_str(), (lock ? O_RDWR : O_RDONLY) | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY);
    struct stat status {};
    if (!file_) return errno == ENOENT ? static_cast<int>(ORV_ERR_MISSING) : codeOf(errno);
    if (lock && !lockWithin(file_.get(), wait)) return errno == EWOULDBLOCK ? ORV_ERR_BUSY : codeOf(errno);
    if (fstat(file_.get(), &status) != 0) return codeOf(errno);
    if (!S_ISREG(status.st_mode) || status.st_nlink == 0 || kStore.isOver(status)) return ORV_ERR_MISSING;
    touched_ = status.st_mtim.tv_sec;
    return ORV_ERR_NONE;
}

bool UploadRecord::parse(const std::string& text, const std::string& user) {
    Json::Value value;
    if (!parseHead(text, state_, number_) || !parseJson(std::string_view(text).substr(kHead), value)) return false;
    if (!areStrings(value, {"user", "path", "conflict", "search", "metadata", "folder"})) return false;
    const auto path = percentDecode(value["path"].asString()), owner = percentDecode(value["user"].asString());
    const Json::Value& modified = value["mtime"];
    if (!path || owner != user || !isNumber(value["size"]) || !isNumber(value["created"])) return false;
    if (!modified.isNull() && (!isNumber(modified) || modified.asInt64() > UINT32_MAX)) return false;
    facts_ = {.path = *path,
              .size = value["size"].asInt64(),
              .conflict = value["conflict"].asString(),
              .modified = std::nullopt,
              .search = value["search"].asString(),
              .metadata = value["metadata"].asString(),
              .folder = value["folder"].asString(),
              .created = static_cast<time_t>(value["created"].asInt64())};
    if (!modified.isNull()) facts_.modified = static_cast<time_t>(modified.asInt64());
    // These go into a reply's header, and into what searches are looked for by.
    const bool printable =
        std::all_of(facts_.metadata.begin(), facts_.metadata.end(), [](char c) { return c >= ' ' && c < 0x7F; });
    return printable && (facts_.search.empty() || isTaskId(facts_.search)) && isConflict(facts_.conflict);
}

int UploadRecord::open(const std::string& user, const std::string& id, bool lock, std::chrono::seconds wait) {
    id_ = id;
    errno = ENOENT;
    folder_ = isUploadId(id) ? openUserFolder(kStore.path, user, false) : Descriptor();
    if (!folder_) return errno == ENOENT ? static_cast<int>(ORV_ERR_MISSING) : codeOf(errno);
    const int code = take(folder_, lock, wait);
    if (code != ORV_ERR_NONE) return code;
    std::string text;
    if (!readAll(file_.get(), text, kLongestRecord) || !parse(text, user)) return ORV_ERR_MISSING;
    if (lock) return ORV_ERR_NONE;
    file_.reset();
    folder_.reset();
    return ORV_ERR_NONE;
}

// In one write within the first block of the file, which is there or not.
bool UploadRecord::setState(UploadState state, long long number) {
    const std::string head = headOf(state, number);
    const ssize_t written = pwrite(file_.get(), head.data(), head.size(), 0);
    if (written >= 0 && written != static_cast<ssize_t>(head.size())) errno = EIO;
    if (written != static_cast<ssize_t>(head.size()) || fdatasync(file_.get()) != 0) return false;
    state_ = state;
    number_ = number;
    touched_ = time(nullptr);
    return true;
}

void UploadRecord::remove() {
    unlinkat(folder_.get(), id_.c_str(), 0);
}

std::vector<UploadRecord> unfinishedUploads(const std::string& user) {
    const Descriptor folder = openUserFolder(kStore.path, user, false);
    std::vector<UploadRecord> records = folder ? recordsOf(user, folder) : std::vector<UploadRecord>();
    std::erase_if(records, [](const UploadRecord& record) { return record.isOver(); });
    std::sort(records.begin(), records.end(), [](const UploadRecord& a, const UploadRecord& b) {
        return a.facts().created != b.facts().created ? a.facts().created < b.facts().created : a.id() < b.id();
    });
    return records;
}

OwnSweep sweepUploadRecords() {
    return sweepOwn(kStore);
}

std::optional<std::set<std::string>> keptUploadIds() {
    std::set<std::string> ids;
    constexpr int kOpenFolder = O_RDONLY | O_DIRECTORY | O_NOFOLLOW;
    const Descriptor store = openFile(VEXO::SystemPath(kStore.path), kOpenFolder);
    std::vector<std::string> users, names;
    if (!store) return errno == ENOENT ? std::optional(ids) : std::nullopt;
    if (!namesIn(store.get(), Hidden::kLeaveOut, users)) return std::nullopt;
    for (const std::string& user : users) {
        const Descriptor folder = openFile(store.get(), user.c_str(), kOpenFolder);
        names.clear();
        if (!folder || !namesIn(folder.get(), Hidden::kInclude, names)) return std::nullopt;
        ids.insert(names.begin(), names.end());
    }
    return ids;
}

}  // namespace orvel::cgi
