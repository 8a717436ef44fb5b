// Memory that runs out inside an operation: it fails like any other failure, and no exception leaves the platform.
#include <new>

#include "support/testing.h"
#include "vexo/acl.h"
#include "vexo/auto_block.h"
#include "vexo/copy.h"
#include "vexo/ddns.h"
#include "vexo/filesystem.h"
#include "vexo/line_file.h"
#include "vexo/process.h"
#include "vexo/settings.h"
#include "vexo/xferlog.h"

namespace {

int untilRefusal = 0;  // 1: the next allocation is refused; 0 and below: none is

}  // namespace

// For the whole test program: the C++ allocator that can be told to refuse. Not inlined: the compiler would see free()
// called on what an operator made.
[[gnu::noinline]] void* operator new(size_t size) {
    if (untilRefusal > 0 && --untilRefusal == 0) throw std::bad_alloc();
    void* memory = malloc(size == 0 ? 1 : size);
    if (memory == nullptr) throw std::bad_alloc();
    return memory;
}
// The sanitizers bring one of their own, whose memory is not freed as ours is.
[[gnu::noinline]] void* operator new(size_t size, const std::nothrow_t& /*tag*/) noexcept {
    try {
        return operator new(size);
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, size_t /*size*/) noexcept {
    free(memory);
}

namespace {

using MemoryTest = ApplianceTest;

// Runs `operation` with its allocation 1, 2, 3... refused, until one run needs no more of them: the others fail. How
// many were refused.
int refuseEach(const std::function<int()>& operation) {
    constexpr int kLimit = 1000;
    for (int nth = 1; nth < kLimit; ++nth) {
        SCOPED_TRACE("allocation " + std::to_string(nth) + " is refused");
        VLIBCErrSetEx(0, "", 0);
        int result = 0;
        bool escaped = false;
        untilRefusal = nth;
        try {
            result = operation();
        } catch (const std::bad_alloc&) {
            escaped = true;
        }
        const bool refused = untilRefusal == 0;
        untilRefusal = 0;
        EXPECT_FALSE(escaped);
        EXPECT_EQ(result < 0, refused);
        if (!refused || escaped) return nth - 1;
        EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_GENERAL);
    }
    return kLimit;
}

TEST_F(MemoryTest, OperationsFailWithoutAnException) {
    const std::string source = photo_ + "/a source with a long name";
    const std::string target = photo_ + "/a target with a long name";
    const std::string made = photo_ + "/a folder with a long name/and one below it";
    writeFile(source, "new");
    writeFile(target, "old");
    writeRootFile("/etc/vexo/ddns.conf", "[provider]\nhostname=\"a.host.with.a.long.name\"\n");
    unsigned permission = 0;
    VOLUMEPATHINFO volume;
    VEXODDNS entry;
    char line[64];
    const VEXOCOPYOPT overwrite{static_cast<uid_t>(-1), static_cast<gid_t>(-1), nullptr, VEXO_COPY_OVERWRITE};
    for (const auto& [name, run] : Rows<const char*, std::function<int()>>{
             {"acl", [&] { return VEXOACLPermGet(source.c_str(), &permission); }},
             {"mounts", [&] { return VEXOGetFSType(photo_.c_str(), 0); }},
             {"folder", [&] { return VEXOFSMkdirP(made.c_str(), nullptr, 1, overwrite.uid, overwrite.gid, 0755); }},
             {"volume", [&] { return VolumePathParse("/a-volume-with-a-long-name/a", &volume); }},
             {"copy", [&] { return VEXOFileCopy(source.c_str(), target.c_str(), &overwrite); }},
             {"process", [] { return VLIBCExec("/bin/true", nullptr); }},
             {"log", [] { return VEXOLogKTRFMXferLog("::1", "alice", "download", 1, "/photo/a", false); }},
             {"ddns", [&] { return VEXODDNSConfigGet("provider", &entry); }},
             {"add line", [] { return VLIBCFileAddLine("/etc/a-record-file", "a line that is no short one", 512); }},
             {"get line", [&] { return VLIBCFileGetLine("/etc/a-record-file", "a", line, sizeof line, " "); }},
             {"failed log-in", [] { return AutoBlockFailLoginSet("2001:db8:1234:5678::1", "FOLDER_SHARING"); }},
             {"blocked", [] { return VexoCgiIsDeniedIP("2001:db8:1234:5678::1"); }},
             {"change",
              [] { return VLIBCFileSetKeyValue("/etc/x.conf", "a_key", "a value with a long text", nullptr); }}}) {
        SCOPED_TRACE(name);
        ASSERT_GE(run(), 0);
        const int before = openDescriptors();
        EXPECT_GT(refuseEach(run), 0);
        EXPECT_EQ(openDescriptors(), before);
    }
}

}  // namespace
