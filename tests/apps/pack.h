// Archives made for tests.
#ifndef ORVEL_TESTS_APPS_PACK_H
#define ORVEL_TESTS_APPS_PACK_H

#include <archive.h>
#include <archive_entry.h>
#include <sys/sysmacros.h>

#include <clocale>

#include "apps/task_fixture.h"

// One member of an archive made for a test.
struct Packed {
    const char* name;
    unsigned type;     // AE_IF...
    std::string text;  // content, or where a link leads
    bool hard = false;
};

inline void pack(const std::string& path, const char* format, const char* filter, const std::vector<Packed>& members,
                 const char* password = nullptr) {
    setlocale(LC_CTYPE, "C");  // names are written as they are, whatever ran before
    archive* out = archive_write_new();
    ASSERT_EQ(archive_write_set_format_by_name(out, format), ARCHIVE_OK);
    if (filter != nullptr) {
        ASSERT_EQ(archive_write_add_filter_by_name(out, filter), ARCHIVE_OK);
    }
    if (password != nullptr) {
        ASSERT_EQ(archive_write_set_options(out, "zip:encryption=zipcrypt"), ARCHIVE_OK);
        ASSERT_EQ(archive_write_set_passphrase(out, password), ARCHIVE_OK);
    }
    ASSERT_EQ(archive_write_open_filename(out, path.c_str()), ARCHIVE_OK);
    for (const Packed& member : members) {
        archive_entry* entry = archive_entry_new();
        archive_entry_copy_pathname(entry, member.name);
        archive_entry_set_filetype(entry, member.type);
        archive_entry_set_perm(entry, 04777);
        archive_entry_set_mtime(entry, 1000000000, 0);
        if (member.hard) archive_entry_copy_hardlink(entry, member.text.c_str());
        if (member.type == AE_IFLNK) archive_entry_copy_symlink(entry, member.text.c_str());
        if (member.type == AE_IFCHR) archive_entry_set_rdev(entry, makedev(1, 3));
        archive_entry_set_size(
            entry, member.type == AE_IFREG && !member.hard ? static_cast<la_int64_t>(member.text.size()) : 0);
        EXPECT_GE(archive_write_header(out, entry), ARCHIVE_WARN) << member.name << archive_error_string(out);
        if (member.type == AE_IFREG && !member.hard) archive_write_data(out, member.text.data(), member.text.size());
        archive_entry_free(entry);
    }
    archive_write_close(out);
    archive_write_free(out);
}

#endif
