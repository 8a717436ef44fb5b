// Archives that anybody can have made, opened for reading.
#ifndef ORVEL_CGI_ARCHIVE_READER_H
#define ORVEL_CGI_ARCHIVE_READER_H

#include <cstdint>
#include <memory>
#include <string>

struct archive;
struct archive_entry;

namespace orvel::cgi {

struct CloseArchive {
    void operator()(archive* source) const;
};
using OpenedArchive = std::unique_ptr<archive, CloseArchive>;

// Reads zip, 7z, rar, iso and tar, tar also compressed as a whole. `password` is of encrypted members, as bytes; "" for
// none. Null with the code: 1401 for what is no archive, and where libarchive is missing, or of kArchiveDemanding.
OpenedArchive openArchive(int file, const std::string& password, int& code);

// What a request may give for one: up to 1,024 bytes, none of them NUL.
[[nodiscard]] bool isArchivePassword(const std::string& text);

// A member's name: the bytes that the archive has. Where formats other than tar have some that are no UTF-8, they are
// foreign (see foreign_name.h). "" for none.
std::string nameOfMember(archive* source, archive_entry* entry);

// Whether what the archive encrypts can be read with a password: of a zip.
bool takesPassword(archive* source);
// Whether it could not be read any further because names are encrypted, too.
bool hidesNames(archive* source);
// Whether what was skipped has to be read all the same.
bool readsThrough(archive* source);

// Whether it needs more memory than there is for it.
bool wantsTooMuchMemory(archive* source);

// How much a process that reads archives may take: decoders keep as much in mind as an archive says.
inline constexpr std::uint64_t kArchiveMemory = std::uint64_t{1} << 30;

// Refusals that the library has no code for, with their keys.
struct ArchiveRefusal {
    int code;
    const char* key;
};
inline constexpr ArchiveRefusal kArchiveLocked = {2301, "archive_locked"};        // encrypted in a way not understood
inline constexpr ArchiveRefusal kArchiveDemanding = {2302, "archive_demanding"};  // beyond kArchiveMemory

}  // namespace orvel::cgi

#endif
