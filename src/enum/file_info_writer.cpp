#include "enum/file_info_writer.h"

#include <charconv>
#include <cmath>
#include <cstring>
#include <string_view>

#include "base/json_text.h"
#include "orvel/privilege.h"

namespace orvel {
namespace {

constexpr size_t kFixedText = 768;     // more than the names, numbers and marks of an object with every property
constexpr double kPlainDigits = 1e17;  // from here on 17 significant digits no longer hold every digit
constexpr size_t kNumberRoom = 32;

// Writes at a place that has room for everything to come.
class Pen {
 public:
    explicit Pen(char* at) : at_(at) {}
    [[nodiscard]] char* at() const { return at_; }

    template <size_t size>
    Pen& put(const char (&literal)[size]) {
        memcpy(at_, literal, size - 1);
        at_ += size - 1;
        return *this;
    }

    Pen& text(std::string_view value) {
        at_ = putJsonText(at_, value);
        return *this;
    }

    Pen& flag(bool value) { return value ? put("true") : put("false"); }

    template <class Integer>
    Pen& number(Integer value) {
        at_ = std::to_chars(at_, at_ + kNumberRoom, value).ptr;
        return *this;
    }

    // 17 significant digits, and ".0" where it would look like an integer.
    Pen& real(double value) {
        if (std::fabs(value) < kPlainDigits) return number(static_cast<int64_t>(value)).put(".0");
        at_ = std::to_chars(at_, at_ + kNumberRoom, value, std::chars_format::general, 17).ptr;
        return *this;
    }

    // Ends an object whose members each end with a comma.
    Pen& close() {
        at_[-1] = '}';
        return *this;
    }

 private:
    char* at_;
};

void writePermission(const DIRENTRY_INFO& info, Pen& pen) {
    const AclFlags acl = aclFlagsOf(info.aclPrivilege);
    pen.put(R"("perm":{"acl":{"append":)").flag(acl.append).put(R"(,"del":)").flag(acl.del);
    pen.put(R"(,"exec":)").flag(acl.exec).put(R"(,"read":)").flag(acl.read).put(R"(,"write":)").flag(acl.write);
    pen.put(R"(},"is_acl_mode":)").flag(info.isAclMode != 0);
    pen.put(R"(,"posix":)").number(GetPrivilege(info.mode)).put("},");
}

void writeTime(const DIRENTRY_INFO& info, Pen& pen) {
    pen.put(R"("time":{"atime":)").number(info.atime).put(R"(,"crtime":)").number(info.crtime);
    pen.put(R"(,"ctime":)").number(info.ctime).put(R"(,"mtime":)").number(info.mtime).put("},");
}

void writeOwner(const DIRENTRY_INFO& info, Pen& pen) {
    pen.put(R"("owner":{"gid":)").number(info.gid).put(R"(,"group":)").text(info.group);
    pen.put(R"(,"uid":)").number(info.uid).put(R"(,"user":)").text(info.owner).put("},");
}

void writeVolume(const DIRENTRY_INFO& info, Pen& pen) {
    pen.put(R"("volume_status":{"freespace":)").real(static_cast<double>(info.freeSpace));
    pen.put(R"(,"readonly":)").flag(info.readOnly);
    pen.put(R"(,"totalspace":)").real(static_cast<double>(info.totalSpace)).put("},");
}

// Members in ascending order of their names, as jsoncpp keeps them.
void writeAdditional(int bits, const DIRENTRY_INFO& info, Pen& pen) {
    pen.put(R"("additional":{)");
    if ((bits & ADDITIONAL_MOUNT_POINT_TYPE) != 0) {
        pen.put(R"("mount_point_type":)").text(info.mountPointType).put(",");
    }
    if ((bits & ADDITIONAL_OWNER) != 0) writeOwner(info, pen);
    if ((bits & ADDITIONAL_PERM) != 0) writePermission(info, pen);
    if ((bits & ADDITIONAL_REAL_PATH) != 0) pen.put(R"("real_path":)").text(info.realPath).put(",");
    if ((bits & ADDITIONAL_SIZE) != 0) pen.put(R"("size":)").real(static_cast<double>(info.size)).put(",");
    if ((bits & ADDITIONAL_TIME) != 0) writeTime(info, pen);
    if ((bits & ADDITIONAL_TYPE) != 0) pen.put(R"("type":)").text(info.type).put(",");
    if ((bits & ADDITIONAL_VOLUME_STATUS) != 0) writeVolume(info, pen);
    pen.close().put(",");
}

size_t roomFor(const DIRENTRY_INFO& info) {
    const size_t bytes = info.name.size() + info.path.size() + info.realPath.size() + info.type.size() +
                         info.owner.size() + info.group.size() + info.mountPointType.size();
    return kFixedText + kLongestJsonEscape * bytes;
}

}  // namespace

void appendFileInfoText(int additional, const DIRENTRY_INFO& info, std::string& out) {
    const size_t start = out.size();
    out.resize(start + roomFor(info));
    Pen pen(out.data() + start);
    pen.put("{");
    if ((additional & kWrittenBits) != 0) writeAdditional(additional, info, pen);
    pen.put(R"("isdir":)").flag(info.isDirectory).put(R"(,"name":)").text(info.name);
    pen.put(R"(,"path":)").text(info.path).put("}");
    out.resize(static_cast<size_t>(pen.at() - out.data()));
}

}  // namespace orvel
