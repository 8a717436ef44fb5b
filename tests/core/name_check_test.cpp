#include "orvel/name_check.h"

#include "support/testing.h"

namespace {

class NameCheckTest : public ApplianceTest {};

TEST_F(NameCheckTest, NamesOfFiles) {
    const std::string fat = addShare("usb", "read only = no\n"), disk = shareRoot("photo");
    addMount(fat, "vfat");
    using Names = std::vector<const char*>;
    const auto check = [](const char* folder, int code, const Names& names) {
        for (const char* name : names) {
            SCOPED_TRACE(name == nullptr ? "(null)" : name);
            for (const bool reservedAlone : {true, false}) {
                if (reservedAlone && code == 419) continue;
                OrvLibSetErr(0);
                const bool good = reservedAlone ? OrvCheckReservedName(name) : OrvCheckFileName(folder, name) == 0;
                EXPECT_EQ(good, code == 0);
                EXPECT_EQ(OrvLibGetErr(), code);
            }
        }
    };
    check(disk.c_str(), 400, {nullptr, ""});
    check(fat.c_str(), 418, {".", "..", "a:b", "a/b", "._", "@vexoea"});
    check(disk.c_str(), 0, {".x", "_.x", "...", "@vexoea2", "a\xFF\nb", "@tmp", "a?b"});
    check(fat.c_str(), 419, {"a?b", "a\nb"});
    EXPECT_CODE(OrvCheckFileName(nullptr, "a"), -1, 400);
    vexo::gate::fail("VEXOGetFSType", VEXO_ERR_GENERAL, EIO);
    announceLog("Failed to statfs " + disk + ", reason=Input/output error");
    EXPECT_CODE(OrvCheckFileName(disk.c_str(), "a"), -1, 417);
}

TEST_F(NameCheckTest, Paths) {
    const std::string fat = addShare("usb", "read only = no\n"), dead = addShare("dead", "read only = no\n");
    addMount(fat, "vfat");
    addMount(dead + "/gone", "nfs");
    writeFile(photo_ + "/file", "x");
    ASSERT_EQ(mkfifo((photo_ + "/fifo").c_str(), 0600), 0);
    ASSERT_EQ(symlink("file", (photo_ + "/link").c_str()), 0);

    const std::string longName(256, 'n');
    // `existing` on success; `log` "" for none.
    for (const auto& [path, walkUp, code, platformError, existing, log] :
         Rows<std::string, bool, int, int, std::string, const char*>{
             row("", true, 400, 0, "", ""), row("relative/x", true, 400, VEXO_ERR_PARAMETER, "", ""),
             row("/", true, 408, VEXO_ERR_MISSING, "", ""), row("//x", false, 400, 0, "", ""),
             row("/no-such-volume/a", true, 408, VEXO_ERR_MISSING, "", ""),
             row(photo_ + "/file/", true, 0, 0, photo_ + "/file", ""),
             row(photo_ + "/new/deeper", false, 408, VEXO_ERR_MISSING, "", ""),
             row(photo_ + "/n?w/..", true, 0, 0, photo_, ""), row(photo_ + "/" + longName, true, 0, 0, photo_, ""),
             row(photo_ + "/" + longName, false, 401, VEXO_ERR_GENERAL, "", "Failed to lstat"),
             row(photo_ + "/fifo", false, 401, VEXO_ERR_GENERAL, "", "Path is not regular file and directory:"),
             row(photo_ + "/link", false, 401, VEXO_ERR_GENERAL, "", "Path is not regular file and directory:"),
             row(fat + "/a/b?c", true, 419, 0, fat, ""), row(fat + "/a/b", true, 0, 0, fat, ""),
             row(dead + "/gone", false, 410, VEXO_ERR_REMOTE_MOUNT, "", "")}) {
        SCOPED_TRACE(path + (walkUp ? " up" : ""));
        OrvLibSetErr(0);
        VLIBCErrSetEx(0, "", 0);
        std::string found;
        EXPECT_EQ(OrvCheckPath(path.c_str(), walkUp, ORV_NO_ACL_TEST, &found), code == 0 ? 0 : -1);
        EXPECT_EQ(OrvLibGetErr(), code);
        EXPECT_EQ(found, existing);
        EXPECT_TRUE(platformError == 0 || VLIBCErrGet() == platformError);
        const auto lines = takeLog();
        EXPECT_EQ(lines.size(), *log == '\0' ? 0U : 1U);
        EXPECT_TRUE(lines.empty() || lines[0].text.find(log) != std::string::npos);
    }
    EXPECT_CODE(OrvCheckPath(nullptr, true, ORV_NO_ACL_TEST, nullptr), -1, 400);
    vexo::gate::fail("VEXOGetFSType", VEXO_ERR_GENERAL, EIO);
    announceLog("Failed to statfs " + photo_ + ", reason=Input/output error");
    EXPECT_CODE(OrvCheckPath((photo_ + "/new").c_str(), true, ORV_NO_ACL_TEST, nullptr), -1, 417);
    vexo::gate::reset();
    EXPECT_EQ(OrvCheckPath((photo_ + "/new").c_str(), true, ORV_NO_ACL_TEST, nullptr), 0);
    const std::string beyond = photo_ + "/" + std::string(5000, 'x');
    EXPECT_EQ(OrvCheckPath(beyond.c_str(), true, ORV_NO_ACL_TEST, nullptr), 0) << "cut";
    addMount("/tmp", "vfat");
    EXPECT_EQ(OrvCheckPath("/tmp/orvel?missing/x", true, ORV_NO_ACL_TEST, nullptr), 0) << "a first component alone";
}

TEST_F(NameCheckTest, PathPermissions) {
    SKIP_WITHOUT_ROOT();
    const std::string folder = shareRoot("photo") + "/closed";
    makeFolder(folder, 0755);
    makeFolder(folder + "/hidden", 0700);
    makeFolder(folder + "/hidden/below", 0755);
    asUser(kBobUid, kUsersGid, [&] {
        constexpr int kWrite = 2;
        EXPECT_CODE(OrvCheckPath((folder + "/new").c_str(), true, kWrite, nullptr), -1, 407);
        EXPECT_EQ(OrvCheckPath(folder.c_str(), false, 1, nullptr), 0);
        OrvLibSetErr(0);
        EXPECT_CODE(OrvCheckPath((folder + "/hidden/below").c_str(), false, ORV_NO_ACL_TEST, nullptr), -1, 407);
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_DENIED);
        OrvLibSetErr(77);
        EXPECT_EQ(OrvCheckPath(folder.c_str(), false, 0, nullptr), -1);
        EXPECT_EQ(OrvLibGetErr(), 77) << "no bits asked: fails with the code that was there";
        EXPECT_EQ(takeLogTexts().at(0), "orvman:# Can't access " + folder + ", errno=197 ");
    });
}

TEST_F(NameCheckTest, SupportedFileSystems) {
    writeRootFile("/etc/vexo/volumes", "/usbshare1 4\n/esata1 8\n");
    addMount(shareRoot("photo"), "fuseblk");
    for (const auto& [folder, type, supported] :
         Rows<const char*, const char*, bool>{row("/usbshare1", "vfat", true), row("/usbshare1/net", "nfs", false),
                                              row("/usbshare1/odd", "fuseblk", false), row("/esata1", "cifs", true),
                                              row("/esata1/net", "nfs4", false)}) {
        addMount(folder, type);
        EXPECT_EQ(OrvLibFileSystemSupported((std::string(folder) + "/a").c_str()), supported) << folder;
    }
    EXPECT_TRUE(OrvLibFileSystemSupported(shareRoot("photo").c_str())) << "an internal volume";
    announceLog("Bad parameters: relative");
    EXPECT_TRUE(OrvLibFileSystemSupported("relative"));
    vexo::gate::fail("VEXOGetFSType", VEXO_ERR_GENERAL, EIO);
    announceLog("VEXOGetFSType got error");
    EXPECT_FALSE(OrvLibFileSystemSupported("/usbshare1"));
}

TEST(Utf8Pattern, Table) {
    // Overlong sequences and surrogates pass.
    for (const char* text :
         {static_cast<const char*>(nullptr), "", "plain", "\xC3\xA9", "\xE4\xBD\xA0", "\xF0\x9F\x98\x80",
          "\xF8\x88\x80\x80\x80", "\xFC\x84\x80\x80\x80\x80", "\xC0\x80", "\xED\xA0\x80"})
        EXPECT_TRUE(IsUnicodeString(text));
    for (const char* text :
         {"\xC3\x28", "\x80", "a\xBF", "\xE4\xBD", "\xFC\x84\x80\x80\x80", "\xFE\x80\x80\x80\x80\x80", "\xFF"})
        EXPECT_FALSE(IsUnicodeString(text)) << text;
}

TEST_F(NameCheckTest, TemporaryFoldersAreOpenToAll) {
    std::string volume = photo_, plain = photo_ + "/plain", dangling = photo_ + "/dangling",
                missing = photo_ + "/missing";
    inChild([&] {
        umask(077);
        EXPECT_EQ(OrvCreateTmpDir(volume.data()), 0);
        for (const char* made : {"/@tmp", "/@tmp/orvel"}) EXPECT_EQ(statusOf(volume + made).st_mode, S_IFDIR | 0777U);
        EXPECT_EQ(umask(022), 0U) << "it stays for later files of the folders";
        EXPECT_EQ(OrvCreateTmpDir(volume.data()), 0);
        EXPECT_EQ(umask(022), 022U) << "nothing made, nothing changed";
        writeFile(plain + "/@tmp", "a file");
        makeFolder(dangling);
        EXPECT_EQ(symlink("nowhere", (dangling + "/@tmp").c_str()), 0);
        EXPECT_EQ(OrvCreateTmpDir(plain.data()), 0);
        EXPECT_EQ(readFile(plain + "/@tmp"), "a file");
        EXPECT_EQ(OrvCreateTmpDir(dangling.data()), 0) << "a dangling link is replaced";
        EXPECT_EQ(statusOf(dangling + "/@tmp/orvel").st_mode, S_IFDIR | 0777U);
        EXPECT_EQ(OrvCreateTmpDir(nullptr), -1);
        EXPECT_EQ(OrvCreateTmpDir(missing.data()), -1);
        EXPECT_EQ(takeLogText(), "orvman(#) Bad Parameter\norvman(#)Failed to mkdir : " + missing +
                                     "/@tmp , reason=No such file or directory[2]");
    });
}

}  // namespace
