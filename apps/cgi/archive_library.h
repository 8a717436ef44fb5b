// libarchive, loaded by whoever needs it. It brings eight libraries with it, which every other request would pay for:
// at the start of a program, and with each fork of a process that stays.
#ifndef ORVEL_CGI_ARCHIVE_LIBRARY_H
#define ORVEL_CGI_ARCHIVE_LIBRARY_H

#include <archive.h>
#include <archive_entry.h>

namespace orvel::cgi {

// clang-format off
#define ORVEL_ARCHIVE_FUNCTIONS(X) \
    X(archive_entry_filetype) X(archive_entry_free) X(archive_entry_hardlink) X(archive_entry_is_encrypted) \
    X(archive_entry_mtime) X(archive_entry_mtime_is_set) X(archive_entry_mtime_nsec) X(archive_entry_new) \
    X(archive_entry_pathname) X(archive_entry_perm) X(archive_entry_set_mode) X(archive_entry_set_mtime) \
    X(archive_entry_set_pathname) X(archive_entry_set_size) X(archive_entry_size) X(archive_entry_size_is_set) \
    X(archive_entry_symlink) X(archive_errno) X(archive_filter_bytes) X(archive_format) X(archive_read_add_passphrase) \
    X(archive_read_data_block) X(archive_read_free) X(archive_read_has_encrypted_entries) X(archive_read_new) \
    X(archive_read_next_header) X(archive_read_open_fd) X(archive_read_support_filter_bzip2) \
    X(archive_read_support_filter_compress) X(archive_read_support_filter_gzip) X(archive_read_support_filter_lz4) \
    X(archive_read_support_filter_lzip) X(archive_read_support_filter_lzma) X(archive_read_support_filter_xz) \
    X(archive_read_support_filter_zstd) X(archive_read_support_format_7zip) X(archive_read_support_format_iso9660) \
    X(archive_read_support_format_rar) X(archive_read_support_format_rar5) X(archive_read_support_format_tar) \
    X(archive_read_support_format_zip) X(archive_write_add_filter_gzip) X(archive_write_add_filter_xz) \
    X(archive_write_add_filter_zstd) X(archive_write_close) X(archive_write_data) X(archive_write_finish_entry) \
    X(archive_write_free) X(archive_write_header) X(archive_write_new) X(archive_write_open_fd) \
    X(archive_write_set_bytes_in_last_block) X(archive_write_set_bytes_per_block) X(archive_write_set_format_7zip) \
    X(archive_write_set_format_pax_restricted) X(archive_write_set_format_zip) X(archive_write_set_options) \
    X(archive_write_set_passphrase)
// clang-format on

// Those of its functions that are used.
struct ArchiveLibrary {
    // NOLINTBEGIN(bugprone-macro-parentheses): a member's name takes none
#define ORVEL_ARCHIVE_MEMBER(name) decltype(&::name) name = nullptr;
    ORVEL_ARCHIVE_FUNCTIONS(ORVEL_ARCHIVE_MEMBER)
#undef ORVEL_ARCHIVE_MEMBER
    // NOLINTEND(bugprone-macro-parentheses)
};

// To be called once loadArchiveLibrary() was true.
extern const ArchiveLibrary& libarchive;

// Loads it the first time. False, with a line in the log, where it is missing or lacks a function.
[[nodiscard]] bool loadArchiveLibrary();

}  // namespace orvel::cgi

#endif
