#include "core/given_folder.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <string_view>
#include <utility>

#include "base/beneath.h"
#include "orvel/error_state.h"

namespace orvel {
namespace {

// Where the folder of "/proc/self/fd/N" lies; every other path is its own text, and so is one whose folder lies deeper
// than a path can tell.
std::string textOf(const std::string& path) {
    constexpr std::string_view kOpened = "/proc/self/fd/";
    const bool isOpened = path.size() > kOpened.size() && path.starts_with(kOpened) &&
                          path.find_first_not_of("0123456789", kOpened.size()) == std::string::npos;
    const std::string text = isOpened ? linkedPath(path) : "";
    return text.empty() ? path : text;
}

EnteredFolder failed(EntryFailure step) {
    return {Descriptor(), step, errno};
}

}  // namespace

EntryFailure failedStep(int error) {
    return error == EMFILE || error == ENFILE ? EntryFailure::kOpen : EntryFailure::kChangeDirectory;
}

int folderCodeOf(int error) {
    switch (error) {
        case ENOENT:
        case ENOTDIR:
            return ORV_ERR_MISSING;
        case EACCES:
        case EPERM:
            return ORV_ERR_DENIED;
        default:
            return ORV_ERR_DIRECTORY;
    }
}

GivenFolder::GivenFolder(std::string path) : path_(std::move(path)), text_(textOf(path_)) {}

EnteredFolder GivenFolder::enter() const {
    const Descriptor found(place_ ? -1 : open(path_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
    const Descriptor& place = place_ ? place_ : found;
    if (!place) return failed(failedStep(errno));
    if (fchdir(place.get()) != 0) return failed(EntryFailure::kChangeDirectory);
    Descriptor folder(openat(place.get(), ".", O_RDONLY | O_DIRECTORY | O_NONBLOCK | O_CLOEXEC));
    if (!folder) return failed(EntryFailure::kOpen);
    return {std::move(folder), EntryFailure::kOpen, 0};
}

}  // namespace orvel
