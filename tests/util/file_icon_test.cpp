#include "orvel/file_icon.h"

#include "support/testing.h"

namespace {

class FileIcon : public ApplianceTest {
 protected:
    static std::string icon(const char* name, bool isDirectory, const std::string& path, const std::string& share) {
        std::string result = "left over";
        GetImgFileExt(name, isDirectory, result, path, share);
        return result;
    }
};

TEST_F(FileIcon, Files) {
    const std::string web = systemRoot() + "/web";
    writeFile(web + "/images/files_ext/pdf.png", "");
    writeFile(web + "/images/files_ext/m\xC3\x84.png", "");
    makeFolder(web + "/program");
    ASSERT_EQ(chdir((web + "/program").c_str()), 0);
    const std::pair<const char*, const char*> cases[] = {
        {"Report.PDF", "pdf.png"}, {"a.tar.pdf", "pdf.png"}, {"x.M\xC3\x84", "m\xC3\x84.png"},
        {"a.txt", "misc.png"},     {"pdf", "misc.png"},      {".pdf", "misc.png"},
        {"a.%s%n", "misc.png"},    {"", "misc.png"},         {nullptr, "misc.png"},
    };
    for (const auto& [name, expected] : cases) EXPECT_EQ(icon(name, false, "/photo/x", "/photo"), expected);
    ASSERT_EQ(chdir(web.c_str()), 0);
    EXPECT_EQ(icon("Report.PDF", false, "/photo/x", "/photo"), "misc.png") << "looked for beside the working directory";
}

TEST_F(FileIcon, Folders) {
    addMount("/photo/iso", "udf");
    addMount("/photo/nas", "nfs4");
    addMount("/photo/disk", "ext4");
    addMount("/photo/other", "fuse.something");
    addMount("/photo/#recycle", "cifs");
    for (const auto& [path, share, expected] : Rows<const char*, const char*, const char*>{
             row("/photo/iso", "/photo", "isomountpoint.png"), row("/photo/nas", "", "remotemountpoint.png"),
             row("/photo/disk", "/photo", "folder.png"), row("/photo/other", "/photo", "folder.png"),
             row("/photo/nas/below", "/photo", "folder.png"), row("/photo/#recycle", "/photo", "remotemountpoint.png"),
             row("/music/#recycle", "/music", "recycle_bin.png"), row("/music/#recycle/", "music", "recycle_bin.png"),
             row("/music/#recycle", "", "folder.png"), row("/music/#recycle", "/", "folder.png"),
             row("/music/a/#recycle", "/music/a", "folder.png"), row("/music/#Recycle", "/music", "folder.png"),
             row("", "/music", "folder.png")})
        EXPECT_EQ(icon("x", true, path, share), expected) << path << " " << share;
    EXPECT_EQ(icon(nullptr, true, "/photo/iso", "/photo"), "misc.png");
    vexo::gate::fail("VEXOGetFSType", 0x8100);
    EXPECT_EQ(icon("iso", true, "/photo/iso", "/photo"), "folder.png");
}

}  // namespace
