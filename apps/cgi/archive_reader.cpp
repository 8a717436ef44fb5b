#include "archive_reader.h"

#include <cerrno>
#include <clocale>

#include "archive_library.h"
#include "foreign_name.h"
#include "orvel/error_state.h"
#include "text.h"

namespace orvel::cgi {
namespace {

constexpr size_t kBlock = size_t{256} * 1024;
constexpr size_t kLongestPassword = 1024;

int kindOf(archive* source) {
    return libarchive.archive_format(source) & ARCHIVE_FORMAT_BASE_MASK;
}

}  // namespace

void CloseArchive::operator()(archive* source) const {
    libarchive.archive_read_free(source);
}

OpenedArchive openArchive(int file, const std::string& password, int& code) {
    code = ORV_ERR_ARCHIVE;
    setlocale(LC_CTYPE, "C.UTF-8");  // what names are converted to
    if (!loadArchiveLibrary()) return nullptr;
    OpenedArchive source(libarchive.archive_read_new());
    if (source == nullptr) return nullptr;
    // Not all there are: some would run outside programs.
    for (const auto support :
         {libarchive.archive_read_support_format_zip, libarchive.archive_read_support_format_tar,
          libarchive.archive_read_support_format_7zip, libarchive.archive_read_support_format_rar,
          libarchive.archive_read_support_format_rar5, libarchive.archive_read_support_format_iso9660,
          libarchive.archive_read_support_filter_gzip, libarchive.archive_read_support_filter_bzip2,
          libarchive.archive_read_support_filter_compress, libarchive.archive_read_support_filter_lzip,
          libarchive.archive_read_support_filter_lzma, libarchive.archive_read_support_filter_xz,
          libarchive.archive_read_support_filter_zstd, libarchive.archive_read_support_filter_lz4}) {
        support(source.get());
    }
    if (!password.empty()) libarchive.archive_read_add_passphrase(source.get(), password.c_str());
    // The first of it is read already.
    if (libarchive.archive_read_open_fd(source.get(), file, kBlock) == ARCHIVE_OK) return source;
    if (wantsTooMuchMemory(source.get())) code = kArchiveDemanding.code;
    return nullptr;
}

bool isArchivePassword(const std::string& text) {
    return text.size() <= kLongestPassword && text.find('\0') == std::string::npos;
}

std::string nameOfMember(archive* source, archive_entry* entry) {
    const char* name = libarchive.archive_entry_pathname(entry);
    if (name == nullptr) return "";
    return kindOf(source) == ARCHIVE_FORMAT_TAR || isUtf8(name) ? std::string(name) : foreignName(name);
}

bool takesPassword(archive* source) {
    return kindOf(source) == ARCHIVE_FORMAT_ZIP;
}

bool hidesNames(archive* source) {
    return libarchive.archive_read_has_encrypted_entries(source) == 1 && !takesPassword(source);
}

bool readsThrough(archive* source) {
    return kindOf(source) == ARCHIVE_FORMAT_TAR;
}

bool wantsTooMuchMemory(archive* source) {
    return libarchive.archive_errno(source) == ENOMEM;
}

}  // namespace orvel::cgi
