#include "list/archive_index.h"

#include <sys/mman.h>
#include <syslog.h>
#include <unistd.h>

#include <charconv>

#include "archive_library.h"
#include "archive_reader.h"
#include "base/descriptor.h"
#include "base/file.h"
#include "request.h"
#include "thumbnail/sandbox.h"
#include "vexo/settings.h"

namespace orvel::cgi {
namespace {

constexpr size_t kMostBytes = size_t{16} << 20;
constexpr size_t kLongestEnd = 32;

constexpr char kLetters[] = {'f', 'd', 'l', 'o'};  // of Kind

std::string headOf(const struct stat& status) {
    std::string head = "ORVARC1";
    for (const long long number :
         {static_cast<long long>(status.st_dev), static_cast<long long>(status.st_ino),
          static_cast<long long>(status.st_size), static_cast<long long>(status.st_ctim.tv_sec),
          static_cast<long long>(status.st_ctim.tv_nsec)}) {
        head += ' ' + std::to_string(number);
    }
    return head + '\0';
}

std::string recordOf(archive* source, archive_entry* entry) {
    char letter = 'o';
    const bool further = libarchive.archive_entry_hardlink(entry) != nullptr;
    const auto type = libarchive.archive_entry_filetype(entry);
    if (type == AE_IFREG || further) letter = 'f';
    if (type == AE_IFDIR) letter = 'd';
    if (type == AE_IFLNK) letter = 'l';
    const bool sized = libarchive.archive_entry_size_is_set(entry) != 0 && !further;
    const bool dated = libarchive.archive_entry_mtime_is_set(entry) != 0;
    return std::string(1, letter) + (libarchive.archive_entry_is_encrypted(entry) != 0 ? "e " : "- ") +
           std::to_string(sized ? libarchive.archive_entry_size(entry) : -1) + ' ' +
           std::to_string(dated ? static_cast<long long>(libarchive.archive_entry_mtime(entry)) : 0) + ' ' +
           nameOfMember(source, entry) + '\0';
}

// Each record at once: whoever stops this process reads what it found. Returns why it ended.
const char* writeRecords(archive* source, long most) {
    size_t bytes = 0;
    for (long members = 0;; ++members) {
        archive_entry* entry = nullptr;
        const int result = libarchive.archive_read_next_header(source, &entry);
        if (result == ARCHIVE_EOF) return "";
        if (result == ARCHIVE_RETRY) continue;
        if (result < ARCHIVE_WARN) {
            if (wantsTooMuchMemory(source)) return "demanding";
            if (hidesNames(source) && members == 0) return "locked";
            return members == 0 ? "none" : "damaged";
        }
        if (members == most) return "members";
        const std::string record = recordOf(source, entry);
        bytes += record.size();
        if (bytes > kMostBytes) return "members";
        if (!writeAll(STDOUT_FILENO, record)) return "damaged";
    }
}

int work(long most) {
    int code = 0;
    const OpenedArchive source = openArchive(STDIN_FILENO, "", code);
    std::string end = code == kArchiveDemanding.code ? "demanding" : "none";
    if (source != nullptr) end = writeRecords(source.get(), most);
    const bool written = writeAll(STDOUT_FILENO, "= " + end + '\0');
    _exit(written ? 0 : 1);  // what the library holds goes with the process
}

long setting(const char* key, long fallback, long most) {
    const auto value = parseNumber(VexoConf::Info().Get(key, ""));
    return value && *value > 0 && *value <= static_cast<unsigned long>(most) ? static_cast<long>(*value) : fallback;
}

template <class Number>
bool takeNumber(std::string_view& text, Number& number) {
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end == text.data() + text.size() || *end != ' ') return false;
    text.remove_prefix(static_cast<size_t>(end - text.data()) + 1);
    return true;
}

bool parse(std::string_view record, ArchiveMember& member) {
    if (record.size() < 3 || record[2] != ' ') return false;
    const auto letter = std::string_view(kLetters, sizeof kLetters).find(record[0]);
    if (letter == std::string_view::npos) return false;
    member.kind = static_cast<ArchiveMember::Kind>(letter);
    member.encrypted = record[1] == 'e';
    member.name = record.substr(3);
    return takeNumber(member.name, member.size) && takeNumber(member.name, member.modified);
}

}  // namespace

bool ArchiveIndex::look(int file, const struct stat& status) {
    const Descriptor found(memfd_create("orvel-archive", MFD_CLOEXEC));
    if (!found || !loadArchiveLibrary() || lseek(file, 0, SEEK_SET) != 0) return false;
    const long seconds = setting("archive_look_seconds", 10, 3600);
    const long members = setting("archive_look_members", 100000, 10000000);
    const SandboxLimits limits = {.memory = kArchiveMemory,
                                  .output = kMostBytes + kLongestEnd,
                                  .processor = static_cast<unsigned>(seconds) + 1,
                                  .time = std::chrono::seconds(seconds)};
    const SandboxEnd ended = runInSandbox([members] { return work(members); }, file, found.get(), limits);
    std::string records;
    if (ended == SandboxEnd::kFailed || lseek(found.get(), 0, SEEK_SET) != 0 ||
        !readAll(found.get(), records, limits.output)) {
        return false;
    }
    bytes_ = headOf(status) + records;
    if (readEnd()) return true;
    bytes_.resize(bytes_.rfind('\0') + 1);  // a record may be half written
    bytes_ += std::string("= ") + (ended == SandboxEnd::kTimeOut ? "seconds" : "damaged") + '\0';
    return readEnd();
}

bool ArchiveIndex::take(std::string bytes, const struct stat& status) {
    bytes_ = std::move(bytes);
    return bytes_.starts_with(headOf(status)) && readEnd();
}

// The last record says how the look ended.
bool ArchiveIndex::readEnd() {
    if (bytes_.empty() || bytes_.back() != '\0') return false;
    const size_t before = bytes_.rfind('\0', bytes_.size() - 2);
    if (bytes_.size() < 2 || before == std::string::npos) return false;
    const std::string_view last(bytes_.data() + before + 1, bytes_.size() - before - 2);
    if (!last.starts_with("= ") || last.size() > kLongestEnd) return false;
    end_ = last.substr(2);
    return true;
}

void ArchiveIndex::each(const std::function<void(const ArchiveMember& member)>& take) const {
    for (size_t begin = bytes_.find('\0') + 1; begin < bytes_.size();) {
        const size_t end = bytes_.find('\0', begin);
        ArchiveMember member;
        if (parse(std::string_view(bytes_).substr(begin, end - begin), member)) take(member);
        begin = end + 1;
    }
}

}  // namespace orvel::cgi
