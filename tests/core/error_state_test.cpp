#include "orvel/share_path.h"
#include "support/testing.h"

namespace {

class ErrorStateTest : public ApplianceTest {};

TEST_F(ErrorStateTest, TranslatorsMapButDoNotStore) {
    for (const auto& [code, key] :
         Rows<int, const char*>{row(420, "error:error_error_system"), row(1402, "error:error_invalid_archive_data"),
                                row(399, "other:key")})
        EXPECT_STREQ(OrvParseErrorToKTRString(code, "other:key"), key) << code;
    EXPECT_STREQ(OrvParseErrorToKTRString(399, nullptr), "error:error_error_system");
    EXPECT_EQ(OrvLibSetErr(7), 7);
    for (const auto& [from, to] :
         Rows<int, int>{row(EPERM, 407), row(ENOENT, 408), row(EIO, 417), row(EACCES, 407), row(EBUSY, 420),
                        row(EEXIST, 414), row(ENOTDIR, 408), row(ENOSPC, 416), row(EROFS, 411), row(ENAMETOOLONG, 412),
                        row(ENOTEMPTY, 414), row(EDQUOT, 415), row(ENOMEM, 401), row(0, 401)})
        EXPECT_EQ(OrvParseErrnoToError(from, nullptr, nullptr), to) << from;
    for (const auto& [from, to] :
         Rows<int, int>{row(0x0300, 407), row(0x0600, 408), row(0x0700, 408), row(0x2400, 415), row(0x2900, 416),
                        row(0x8400, 411), row(0xA500, 419), row(0xC300, 412), row(0x1400, 401), row(0, 401)})
        EXPECT_EQ(OrvParseVexoErrToError(from, nullptr), to) << from;
    EXPECT_EQ(OrvLibGetErr(), 7);
    // A busy one asks the mount table, and no other.
    addMount("/volume1/disc", "iso9660", "ro");
    EXPECT_EQ(OrvParseErrnoToError(EBUSY, "photo", "/volume1/disc"), 421);
    EXPECT_EQ(OrvParseErrnoToError(EBUSY, "photo", "/volume1/disc/sub"), 420);
    EXPECT_EQ(OrvParseErrnoToError(ENOENT, nullptr, "/volume1/disc"), 408);
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
    EXPECT_CODE(OrvLibCheckEncryptShare("photo", nullptr), 0, 400);
}

}  // namespace
