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
    writeFile(web + "/images/files_ext/m\xC3\x84.png", "");
    makeFolder(web + "/program");
    ASSERT_EQ(chdir((web + "/program").c_str()), 0);
    for (const auto& [name, expected] :
         Rows<const char*, const char*>{row("a.tar.M\xC3\x84", "m\xC3\x84.png"), row("a.txt", "misc.png"),
                                        row("pdf", "misc.png"), row("", "misc.png")})
        EXPECT_EQ(icon(name, false, "/photo/x", "/photo"), expected);
    ASSERT_EQ(chdir(web.c_str()), 0);
    EXPECT_EQ(icon("x.M\xC3\x84", false, "/photo/x", "/photo"), "misc.png")
        << "looked for beside the working directory";
}

TEST_F(FileIcon, Folders) {
    for (const auto& [folder, type] : Rows<const char*, const char*>{
             {"/photo/iso", "udf"}, {"/photo/nas", "nfs4"}, {"/photo/disk", "ext4"}, {"/photo/#recycle", "cifs"}})
        addMount(folder, type);
    for (const auto& [path, share, expected] : rowsOf<const char*, const char*, const char*>("util/folder_icons"))
        EXPECT_EQ(icon("x", true, path, share), expected) << path << " " << share;
    EXPECT_EQ(icon(nullptr, true, "/photo/iso", "/photo"), "misc.png");
}

}  // namespace
