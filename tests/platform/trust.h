// What somebody else may have put where a file of the platform belongs.
#ifndef ORVEL_TESTS_PLATFORM_PLANTED_FILES_H
#define ORVEL_TESTS_PLATFORM_PLANTED_FILES_H

#include "support/testing.h"

namespace support {

// Calls `check` with each kind of foreign file at `path` in turn; the content that links lead to must survive it.
inline void plantEach(const std::string& path, const std::function<void()>& check) {
    const std::string other = path + ".other";
    const std::string nothing = path + ".nothing";
    const auto writable = [&] { writeFile(path, "key,key=1\n", 0666); };
    const auto foreign = [&] {
        writeFile(path, "key,key=1\n", 0600);
        EXPECT_EQ(chown(path.c_str(), kBobUid, kUsersGid), 0);
    };
    Rows<const char*, std::function<void()>> plants = {
        {"a link", [&] { fs::create_symlink(other, path); }},
        {"a link to nothing", [&] { fs::create_symlink(nothing, path); }},
        {"a second name", [&] { fs::create_hard_link(other, path); }},
        {"a pipe", [&] { EXPECT_EQ(mkfifo(path.c_str(), 0600), 0); }},
        {"a folder", [&] { makeFolder(path); }},
        {"anybody's to write", writable}};
    if (geteuid() == 0) plants.emplace_back("somebody else's", foreign);
    for (const auto& [what, plant] : plants) {
        SCOPED_TRACE(what);
        fs::remove(path);
        writeFile(other, "key,key=1\n", 0600);
        plant();
        check();
        EXPECT_EQ(readFile(other), "key,key=1\n");
        EXPECT_FALSE(fs::exists(nothing));
    }
    fs::remove(path);
}

}  // namespace support

// The operation fails as one that was denied.
#define EXPECT_REFUSED(operation)                  \
    do {                                           \
        VLIBCErrSetEx(0, "", 0);                   \
        EXPECT_EQ(operation, -1);                  \
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED); \
    } while (false)

#endif
