#include "orvel/directory_walker.h"

#include "core/boundary.h"
#include "enum/tree_walk.h"

namespace {

bool walk(const orvel::WalkRequest& request, const std::string& displayPath, const std::string& realPath) {
    return orvel::guardedQuietly(false,
                                 [&] { return orvel::walkTree(request, displayPath, orvel::GivenFolder(realPath)); });
}

}  // namespace

OrvDirectoryWalkerCallBack::~OrvDirectoryWalkerCallBack() = default;

OrvDirectoryWalker::OrvDirectoryWalker(_enum_ignore_err_ mode, int* abortFlag) : mode_(mode), abortFlag_(abortFlag) {}

bool OrvDirectoryWalker::Walk(const std::string& displayPath, const std::string& context, const std::string& realPath,
                              OrvDirectoryWalkerCallBack* before, OrvDirectoryWalkerCallBack* after,
                              const std::string* extra, bool skipRecycle) {
    return walk({mode_, abortFlag_, context, extra, before, after, skipRecycle, orvel::WalkOrder::kDepthFirst},
                displayPath, realPath);
}

bool OrvDirectoryWalker::Walk_TopDown(const std::string& displayPath, const std::string& context,
                                      const std::string& realPath, OrvDirectoryWalkerCallBack& callback,
                                      const std::string* extra, bool skipRecycle) {
    return Walk(displayPath, context, realPath, &callback, nullptr, extra, skipRecycle);
}

bool OrvDirectoryWalker::Walk_FirstFolder_First(const std::string& displayPath, const std::string& context,
                                                const std::string& realPath, OrvDirectoryWalkerCallBack& callback,
                                                const std::string* extra, bool skipRecycle, bool firstFolderOnly) {
    const auto order = firstFolderOnly ? orvel::WalkOrder::kFirstFolderOnly : orvel::WalkOrder::kFirstFolderFirst;
    return walk({mode_, abortFlag_, context, extra, &callback, nullptr, skipRecycle, order}, displayPath, realPath);
}
