#include "orvel/file_info.h"

#include <json/value.h>
#include <json/writer.h>

#include <limits>

#include "orvel/dir_entry.h"
#include "support/testing.h"

namespace {

std::string compact(const Json::Value& value) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return Json::writeString(builder, value);
}

DIRENTRY_INFO sample() {
    DIRENTRY_INFO info;
    info.name = "a.jpg";
    info.path = "/photo/a.jpg";
    info.realPath = "/volume1/photo/a.jpg";
    info.type = "JPG";
    info.size = 12;
    info.mode = 0100644;
    info.aclPrivilege = 0x20F;
    info.isAclMode = 1;
    info.mtime = 1;
    info.ctime = 2;
    info.crtime = 3;
    info.atime = std::numeric_limits<uint32_t>::max();
    info.uid = 20001;
    info.owner = "alice";
    info.gid = std::numeric_limits<uint32_t>::max();
    info.group = "users";
    info.mountPointType = "iso";
    info.freeSpace = 4096;
    info.totalSpace = std::numeric_limits<uint64_t>::max();
    info.readOnly = true;
    return info;
}

TEST(FileInfo, EachBitGivesItsMember) {
    for (const auto& [bits, additional] : Rows<int, const char*>{
             row(0, nullptr), row(0x100, nullptr), row(0x01, R"({"real_path":"/volume1/photo/a.jpg"})"),
             row(0x02, R"({"size":12.0})"),
             row(0x04, R"({"owner":{"gid":4294967295,"group":"users","uid":20001,"user":"alice"}})"),
             row(0x08, R"({"time":{"atime":4294967295,"crtime":3,"ctime":2,"mtime":1}})"),
             row(0x10, R"({"perm":{"acl":{"append":true,"del":true,"exec":true,"read":true,"write":true},)"
                       R"("is_acl_mode":true,"posix":644}})"),
             row(0x20, R"({"type":"JPG"})"), row(0x40, R"({"mount_point_type":"iso"})"),
             row(0x80,
                 R"({"volume_status":{"freespace":4096.0,"readonly":true,"totalspace":1.8446744073709552e+19}})")}) {
        Json::Value out;
        DumpFileInfo(bits, sample(), out);
        const std::string rest = R"("isdir":false,"name":"a.jpg","path":"/photo/a.jpg"})";
        std::string expected = "{";
        if (additional != nullptr) expected.append(R"("additional":)").append(additional).append(",");
        EXPECT_EQ(compact(out), expected + rest) << bits;
    }
}

TEST(FileInfo, ReadAndWriteShowOneBit) {
    for (unsigned bit = 1; bit < 0x2000; bit <<= 1) {
        DIRENTRY_INFO info = sample();
        info.aclPrivilege = bit;
        Json::Value out;
        DumpFileInfo(ADDITIONAL_PERM, info, out);
        const Json::Value& acl = out["additional"]["perm"]["acl"];
        for (const auto& [key, shown] :
             Rows<const char*, unsigned>{{"exec", 1}, {"write", 4}, {"read", 4}, {"append", 8}, {"del", 0x200}}) {
            EXPECT_EQ(acl[key].asBool(), bit == shown) << key << bit;
        }
    }
}

TEST(FileInfo, WhatTheCallerPutThere) {
    Json::Value out;
    out["name"] = "old";
    out["mine"] = 1;
    Json::Value& additional = out["additional"];
    for (const char* key : {"owner", "time", "perm", "volume_status"}) additional[key]["mine"] = 2;
    additional["perm"]["acl"]["mine"] = 3;
    additional["other"] = 4;
    DumpFileInfo(0xFF, sample(), out);
    EXPECT_EQ(out["name"], "a.jpg");
    EXPECT_EQ(out["mine"], 1);
    EXPECT_EQ(additional["other"], 4);
    EXPECT_EQ(additional["perm"]["mine"], 2) << "kept, the others are made anew";
    EXPECT_FALSE(additional["perm"]["acl"].isMember("mine"));
    for (const char* key : {"owner", "time", "volume_status"}) EXPECT_FALSE(additional[key].isMember("mine")) << key;

    // Wrong kinds in the way become objects instead of an exception.
    Json::Value clean;
    DumpFileInfo(0xFF, sample(), clean);
    for (Json::Value wrong : {Json::Value(), Json::Value("text"), Json::Value(5), Json::Value(Json::arrayValue)}) {
        Json::Value additionalWrong, permWrong;
        additionalWrong["additional"] = wrong;
        permWrong["additional"]["perm"] = wrong;
        for (Json::Value* value : {&wrong, &additionalWrong, &permWrong}) {
            DumpFileInfo(0xFF, sample(), *value);
            EXPECT_EQ(compact(*value), compact(clean));
        }
    }
}

void expectSameText(int bits, const DIRENTRY_INFO& info) {
    Json::Value object;
    DumpFileInfo(bits, info, object);
    std::string text = "before,";
    AppendFileInfoText(bits, info, text);
    EXPECT_EQ(text, "before," + compact(object)) << bits;
}

TEST(FileInfoText, EqualsTheObjectsTextForEveryBitSet) {
    for (int bits = 0; bits < 0x200; ++bits) expectSameText(bits, sample());
    expectSameText(-1, DIRENTRY_INFO());
}

// What jsoncpp does with bytes that are no UTF-8 is to pass them on: the result is no UTF-8 either, which is why
// callers look at names first.
TEST(FileInfoText, EqualsTheObjectsTextForEveryName) {
    std::string everyByte;
    for (int byte = 0; byte < 256; ++byte) everyByte += static_cast<char>(byte);
    const std::string names[] = {"", everyByte, "\xe6\x97\xa5\xf0\x9f\x93\xb7", std::string(5000, '\1')};
    for (const std::string& name : names) {
        DIRENTRY_INFO info = sample();
        for (std::string* field :
             {&info.name, &info.path, &info.realPath, &info.type, &info.owner, &info.group, &info.mountPointType}) {
            *field = name;
        }
        expectSameText(0xFF, info);
    }
    std::string text;
    DIRENTRY_INFO info;
    info.name = "\xff\xc3\"";
    AppendFileInfoText(0, info, text);
    EXPECT_EQ(text, "{\"isdir\":false,\"name\":\"\xff\xc3\\\"\",\"path\":\"\"}");
}

TEST(FileInfoText, EqualsTheObjectsTextForEverySize) {
    constexpr int64_t kExact = int64_t{1} << 53;
    // 17 digits end at 100000000000000000.
    const int64_t sizes[] = {0,
                             1,
                             -1,
                             9,
                             kExact - 1,
                             kExact,
                             kExact + 1,
                             kExact + 3,
                             99999999999999999,
                             100000000000000000,
                             99999999999999991,
                             100000000000000001,
                             123456789012345678,
                             INT64_MAX,
                             INT64_MIN,
                             INT64_MIN + 1};
    for (const int64_t size : sizes) {
        DIRENTRY_INFO info = sample();
        info.size = size;
        info.freeSpace = static_cast<uint64_t>(size);
        info.totalSpace = static_cast<uint64_t>(size) / 3;
        expectSameText(0xFF, info);
    }
    for (int shift = 0; shift < 64; ++shift) {
        DIRENTRY_INFO info = sample();
        info.size = static_cast<int64_t>((uint64_t{1} << shift) - 1);
        info.mode = 1U << (shift % 32);
        info.aclPrivilege = 1U << (shift % 32);
        expectSameText(0xFF, info);
    }
}

}  // namespace
