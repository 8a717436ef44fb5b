// Any bytes as an archive that is unpacked: nothing appears outside the target, and nothing of it by halves.
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <memory>

#include "base/new_file.h"
#include "check.h"
#include "operation/progress.h"
#include "operation/unpack.h"
#include "vexo/task.h"

namespace {

namespace fs = std::filesystem;

// The task that the progress is told to.
KTR::Task& task() {
    static const std::unique_ptr<KTR::Task> made(KTR::TaskMgr("fuzz").createTask("Quorvane_fuzz"));
    fuzz::require(made != nullptr);
    return *made;
}

int fileOf(const std::uint8_t* data, std::size_t size) {
    const int file = memfd_create("archive", MFD_CLOEXEC);
    fuzz::require(file >= 0 && write(file, data, size) == static_cast<ssize_t>(size) && lseek(file, 0, SEEK_SET) == 0);
    return file;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const fs::path work = fs::path(fuzz::folder()) / "work", target = work / "target";
    fs::create_directories(target);
    {
        orvel::cgi::Progress progress(task(), "alice", "extract");
        const orvel::Descriptor folder(open(target.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        orvel::cgi::Unpacker unpacker(progress, {folder,
                                                 "/photo/target",
                                                 orvel::cgi::Conflict::kKeepBoth,
                                                 {static_cast<uid_t>(-1), static_cast<gid_t>(-1)},
                                                 "",
                                                 {},
                                                 {}});
        const orvel::Descriptor file(fileOf(data, size));
        static_cast<void>(unpacker.run(file.get(), {.bytes = 1 << 20, .members = 100}));
    }
    fuzz::require(std::distance(fs::directory_iterator(work), fs::directory_iterator()) == 1);
    for (const auto& entry : fs::recursive_directory_iterator(target)) {
        fuzz::require(entry.is_symlink() || entry.is_regular_file() || entry.is_directory());
        if (entry.is_symlink()) fuzz::require(!fs::read_symlink(entry.path()).is_absolute());
        fuzz::require(!orvel::isPartName(entry.path().filename().string()));
        if (!entry.is_symlink()) fs::permissions(entry.path(), fs::perms::owner_all, fs::perm_options::add);
    }
    fs::remove_all(work);
    return 0;
}
