// What somebody else may have put where a file of the platform belongs, and programs that act for users.
#ifndef ORVEL_TESTS_PLATFORM_TRUST_H
#define ORVEL_TESTS_PLATFORM_TRUST_H

#include "support/testing.h"

namespace support {

// Calls `check` with each kind of foreign file at `path` in turn, all of them of this content; that of those which
// links lead to must survive it.
inline void plantEach(const std::string& path, const std::function<void()>& check,
                      const std::string& content = "key,key=1\n") {
    const std::string other = path + ".other";
    const std::string nothing = path + ".nothing";
    const auto foreign = [&] {
        writeFile(path, content, 0600);
        EXPECT_EQ(chown(path.c_str(), kBobUid, kUsersGid), 0);
    };
    Rows<const char*, std::function<void()>> plants = {
        {"a link", [&] { fs::create_symlink(other, path); }},
        {"a link to nothing", [&] { fs::create_symlink(nothing, path); }},
        {"a second name", [&] { fs::create_hard_link(other, path); }},
        {"a pipe", [&] { EXPECT_EQ(mkfifo(path.c_str(), 0600), 0); }},
        {"a folder", [&] { makeFolder(path); }},
        {"the group's to write", [&] { writeFile(path, content, 0620); }},
        {"anybody's to write", [&] { writeFile(path, content, 0602); }}};
    if (geteuid() == 0) plants.emplace_back("somebody else's", foreign);
    for (const auto& [what, plant] : plants) {
        SCOPED_TRACE(what);
        fs::remove(path);
        writeFile(other, content, 0600);
        plant();
        check();
        EXPECT_TRUE(readFile(other) == content);
        EXPECT_FALSE(fs::exists(nothing));
    }
    fs::remove(path);
    fs::remove(other);
}

// Runs `body` in a forked child that acts for alice as the programs do: root is still behind it, and alice it must
// still be at the end.
inline void actingForAlice(const std::function<void()>& body) {
    inChild([&] {
        if (setegid(kUsersGid) != 0 || seteuid(kAliceUid) != 0) return 97;
        body();
        EXPECT_EQ(geteuid(), uid_t{kAliceUid});
        EXPECT_EQ(getegid(), gid_t{kUsersGid});
        return 0;
    });
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
