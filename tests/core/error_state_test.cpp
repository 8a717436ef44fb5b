#include "support/log_texts.h"
#include "support/testing.h"

namespace {

class ErrorStateTest : public ApplianceTest {};

TEST_F(ErrorStateTest, EveryCodeHasItsKey) {
    for (const auto& [code, key] : Rows<int, const char*>{row(400, "error_error_system"),
                                                          row(401, "error_error_system"),
                                                          row(402, "error_error_system"),
                                                          row(403, "error_invalid_user_group"),
                                                          row(404, "error_invalid_user_group"),
                                                          row(405, "error_invalid_user_group"),
                                                          row(406, "error_testjoin"),
                                                          row(407, "error_privilege_not_enough"),
                                                          row(408, "error_no_path"),
                                                          row(409, "error_privilege_not_enough"),
                                                          row(410, "conn_rv_fail"),
                                                          row(411, "error_fs_ro"),
                                                          row(412, "error_long_path"),
                                                          row(413, "error_encryption_long_path"),
                                                          row(414, "error_file_exist"),
                                                          row(415, "error_quota_not_enough"),
                                                          row(416, "error_space_not_enough"),
                                                          row(417, "error_io"),
                                                          row(418, "error_reserved_name"),
                                                          row(419, "error_fat_reserved_name"),
                                                          row(420, "error_error_system"),
                                                          row(421, "error_folder_busy"),
                                                          row(1004, "error_overwrite_fail"),
                                                          row(1005, "error_select_conflict"),
                                                          row(1006, "mvcp_filename_illegal"),
                                                          row(1007, "mvcp_file_too_big"),
                                                          row(1400, "error_error_system"),
                                                          row(1401, "error_invalid_archive"),
                                                          row(1402, "error_invalid_archive_data"),
                                                          row(1403, "extract_passwd_missing"),
                                                          row(1404, "error_error_system"),
                                                          row(1405, "error_error_system")}) {
        EXPECT_EQ(OrvParseErrorToKTRString(code, "other:key"), std::string("error:") + key) << code;
    }
    for (const int code : {0, -1, 399, 422, 1003, 1008, 1399, 1406, 1800, 1803, 1804, 1805}) {
        EXPECT_STREQ(OrvParseErrorToKTRString(code, "other:key"), "other:key") << code;
        EXPECT_STREQ(OrvParseErrorToKTRString(code, nullptr), "error:error_error_system") << code;
    }
}

TEST_F(ErrorStateTest, SetReturnsItsArgument) {
    for (const int code : {408, 0, -5}) {
        EXPECT_EQ(OrvLibSetErr(code), code);
        EXPECT_EQ(OrvLibGetErr(), code);
    }
}

TEST_F(ErrorStateTest, TranslatorsMapButDoNotStore) {
    struct Case {
        int from, to;
    };
    const Case errnos[] = {{EPERM, 407},     {ENOENT, 408},  {EIO, 417},    {EACCES, 407}, {EBUSY, 420},
                           {EEXIST, 414},    {ENOTDIR, 408}, {ENOSPC, 416}, {EROFS, 411},  {ENAMETOOLONG, 412},
                           {ENOTEMPTY, 414}, {EDQUOT, 415},  {ENOMEM, 401}, {0, 401},      {ELOOP, 401}};
    OrvLibSetErr(7);
    for (const Case& c : errnos) EXPECT_EQ(OrvParseErrnoToError(c.from, nullptr, nullptr), c.to) << c.from;
    const Case platform[] = {{0x0300, 407}, {0x0600, 408}, {0x0700, 408}, {0x2400, 415}, {0x2900, 416}, {0x8400, 411},
                             {0xA500, 419}, {0xC300, 412}, {0x2500, 401}, {0x1400, 401}, {0, 401}};
    for (const Case& c : platform) EXPECT_EQ(OrvParseVexoErrToError(c.from, nullptr), c.to) << c.from;
    EXPECT_EQ(OrvLibGetErr(), 7);
}

TEST_F(ErrorStateTest, BusyAsksTheMountTable) {
    addMount("/volume1/disc", "iso9660", "ro");
    EXPECT_EQ(OrvParseErrnoToError(EBUSY, "photo", "/volume1/disc"), 421);
    EXPECT_EQ(OrvParseErrnoToError(EBUSY, "photo", "/volume1/disc/sub"), 420);
    EXPECT_EQ(OrvParseErrnoToError(ENOENT, nullptr, "/volume1/disc"), 408) << "asked for EBUSY alone";
}

TEST_F(ErrorStateTest, LongPathAsksWhetherTheShareIsEncrypted) {
    addShare("secret", "valid users = alice\nvexo:encrypted = yes\n");
    for (const auto& [share, code, left, log] : Rows<const char*, int, int, const char*>{
             row("secret", 413, 0, ""), row("photo", 412, 0, ""), row("home", 412, 0, ""),
             row("nowhere", 412, 408, "orveldir:# VEXOShareGet fail nowhere"),
             row("no\nwhere", 412, 408, "orveldir:# VEXOShareGet fail no\\x0Awhere")}) {
        OrvLibSetErr(0);
        EXPECT_EQ(OrvParseErrnoToError(ENAMETOOLONG, share, nullptr), code) << share;
        EXPECT_EQ(OrvLibGetErr(), left) << share;
        EXPECT_EQ(takeLogText(), log);
        EXPECT_EQ(OrvParseVexoErrToError(0xC300, share), code) << share;
        EXPECT_EQ(takeLogText(), log);
    }
}

}  // namespace
