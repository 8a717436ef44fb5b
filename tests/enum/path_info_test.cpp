#include <json/value.h>

#include "orvel/file_info.h"
#include "support/testing.h"

namespace {

class PathInfoTest : public ApplianceTest {};

TEST_F(PathInfoTest, TrailingSlashesGo) {
    for (const char* path : {"/photo/2012", "/photo/2012///"}) {
        PathInfo info;
        EXPECT_TRUE(PathInfoFactory::create("alice", path, info)) << path;
        EXPECT_TRUE(PathInfoFactory::create("alice", info.path, info)) << "its own path is an argument";
        EXPECT_EQ(info.path + info.realPath, "/photo/2012" + shareRoot("photo") + "/2012");
        EXPECT_EQ(info.shareName + info.volumePath + info.shareRoot, "photo/tmp" + shareRoot("photo"));
    }
}

TEST_F(PathInfoTest, FailuresLeaveBothNumbers) {
    for (const auto& [user, path, code, platform, kept, log] :
         rowsOf<const char*, const char*, int, int, std::string, const char*>("enum/path_failures")) {
        PathInfo info;
        EXPECT_FALSE(PathInfoFactory::create(user, path, info)) << path;
        EXPECT_EQ(OrvLibGetErr(), code) << path;
        EXPECT_EQ(VLIBCErrGet(), platform) << path;
        EXPECT_EQ(info.path, kept);
        EXPECT_EQ(info.realPath, "");
        EXPECT_EQ(takeLogText(), log);
    }
}

TEST_F(PathInfoTest, JoinedPaths) {
    Json::Value paths(Json::arrayValue);
    std::string out = "before";
    EXPECT_TRUE(ParseJsonPathToString(paths, out));
    EXPECT_EQ(out, "");
    for (const char* path : {"/a/b", "x/c", "d"}) paths.append(path);
    EXPECT_TRUE(ParseJsonPathToString(paths, out));
    EXPECT_EQ(out, "/a/b, /c, d");
    for (const Json::Value& more : {Json::Value(5), Json::Value(), Json::Value(""), Json::Value("/\xff")})
        paths.append(more);
    EXPECT_TRUE(ParseJsonPathToString(paths, out));
    EXPECT_EQ(out, "/a/b, /c, d, , /\xff");

    for (const Json::Value& wrong : {Json::Value(), Json::Value("text"), Json::Value(Json::objectValue)}) {
        out = "before";
        OrvLibSetErr(0);
        EXPECT_FALSE(ParseJsonPathToString(wrong, out));
        EXPECT_EQ(out, "before");
        EXPECT_EQ(OrvLibGetErr(), 401);
        EXPECT_EQ(takeLogText(), "orvelmisc:# Wrong JSON format");
    }
}

}  // namespace
