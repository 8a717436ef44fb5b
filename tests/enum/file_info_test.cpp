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
    std::tie(info.name, info.path, info.realPath) = std::make_tuple("a.jpg", "/photo/a.jpg", "/volume1/photo/a.jpg");
    std::tie(info.type, info.owner, info.group, info.mountPointType) = std::make_tuple("JPG", "alice", "users", "iso");
    std::tie(info.size, info.mode, info.aclPrivilege, info.isAclMode) = std::make_tuple(12, 0100644, 0x20F, 1);
    std::tie(info.mtime, info.ctime, info.crtime) = std::make_tuple(1, 2, 3);
    info.atime = info.gid = std::numeric_limits<uint32_t>::max();
    info.uid = 20001;
    info.freeSpace = 4096;
    info.totalSpace = std::numeric_limits<uint64_t>::max();
    info.readOnly = true;
    return info;
}

TEST(FileInfo, EachBitGivesItsMember) {
    for (const auto& [bits, permissions, additional] : rowsOf<int, unsigned, const char*>("enum/members_of_bits")) {
        Json::Value out;
        DIRENTRY_INFO info = sample();
        info.aclPrivilege = permissions;
        DumpFileInfo(bits, info, out);
        const std::string rest = R"("isdir":false,"name":"a.jpg","path":"/photo/a.jpg"})";
        std::string expected = "{";
        if (additional != nullptr) expected.append(R"("additional":)").append(additional).append(",");
        EXPECT_EQ(compact(out), expected + rest) << bits;
    }
}

TEST(FileInfo, WhatTheCallerPutThere) {
    Json::Value out, clean;
    out["mine"] = 1;
    Json::Value& additional = out["additional"];
    for (const char* key : {"owner", "time", "perm", "volume_status"}) additional[key]["mine"] = 2;
    additional["perm"]["acl"]["mine"] = 3;
    additional["other"] = 4;
    DumpFileInfo(0xFF, sample(), out);
    DumpFileInfo(0xFF, sample(), clean);
    Json::Value expected = clean;  // kept is what stands beside the members and in "perm", the rest is made anew
    expected["mine"] = 1;
    expected["additional"]["other"] = 4;
    expected["additional"]["perm"]["mine"] = 2;
    EXPECT_EQ(out, expected);

    // Wrong kinds in the way become objects instead of an exception.
    for (const Json::Value& wrong : {Json::Value(), Json::Value("text"), Json::Value(Json::arrayValue)}) {
        Json::Value values[3] = {wrong, {}, {}};
        values[1]["additional"] = wrong;
        values[2]["additional"]["perm"] = wrong;
        for (Json::Value& value : values) {
            DumpFileInfo(0xFF, sample(), value);
            EXPECT_EQ(value, clean);
        }
    }
}

// With every set of bits, in every field, of every size. Bytes that are no UTF-8 pass, as jsoncpp passes them.
TEST(FileInfo, TheTextIsTheObjects) {
    const auto expectSame = [](int bits, const DIRENTRY_INFO& info) {
        Json::Value object;
        DumpFileInfo(bits, info, object);
        std::string text = "before,";
        AppendFileInfoText(bits, info, text);
        EXPECT_EQ(text, "before," + compact(object)) << bits;
    };
    for (int bits = 0; bits < 0x200; ++bits) expectSame(bits, sample());
    expectSame(-1, DIRENTRY_INFO());
    DIRENTRY_INFO info = sample();
    std::string everyByte;
    for (int byte = 0; byte < 256; ++byte) everyByte += static_cast<char>(byte);
    for (const std::string& name : {std::string(), everyByte, std::string(5000, '\1')}) {
        for (std::string* field :
             {&info.name, &info.path, &info.realPath, &info.type, &info.owner, &info.group, &info.mountPointType})
            *field = name;
        expectSame(0xFF, info);
    }
    info = sample();
    std::vector<int64_t> sizes = {-1, INT64_MIN, INT64_MIN + 1};
    for (const int64_t edge : {int64_t{1} << 53, int64_t{99999999999999999}}) {  // exact as a double, seventeen digits
        for (int64_t beside = -8; beside <= 3; ++beside) sizes.push_back(edge + beside);
    }
    for (int shift = 0; shift < 64; ++shift) {
        const auto power = static_cast<int64_t>(uint64_t{1} << shift);
        sizes.insert(sizes.end(), {static_cast<int64_t>((uint64_t{1} << shift) - 1), power});
    }
    for (const int64_t size : sizes) {
        info.size = size;
        info.freeSpace = static_cast<uint64_t>(size);
        info.totalSpace = static_cast<uint64_t>(size) / 3;
        info.mode = info.aclPrivilege = static_cast<uint32_t>(size);
        expectSame(0xFF, info);
    }
}

}  // namespace
