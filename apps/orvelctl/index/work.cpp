#include "index/work.h"

#include <sys/stat.h>

#include <cerrno>
#include <cstdio>
#include <stdexcept>

#include "command.h"
#include "vexo/error.h"
#include "vexo/filesystem.h"
#include "vexo/index.h"

namespace orvel::ctl {

void refuse(const std::string& share, const std::string& reason) {
    throw std::runtime_error(terminalText(share) + ": " + reason);
}

const char* platformReason() {
    switch (VLIBCErrGet()) {
        case VEXO_ERR_SHARE_MISSING:
            return "no such share";
        case VEXO_ERR_MISSING:
            return "has no index to update";
        case VEXO_ERR_EXISTS:
            return "another process is working on its index";
        case VEXO_ERR_NO_SPACE:
            return "no space is left for its index";
        default:
            return "its index cannot be used";
    }
}

ShareFiles filesOf(const SDK::Share& share, int* stop) {
    const std::string root = share.GetFullPath();
    if (VEXOFSIsRemoteFS(VEXOGetFSType(root.c_str(), 0)) == 1) refuse(share.GetName(), "lies on a network mount");
    ShareFiles files(root, stop);
    _tag_VEXOSTAT_ status;
    if (files.status("", status) != Presence::kThere || !S_ISDIR(status.st_mode)) {
        refuse(share.GetName(), "its folder is not there");
    }
    return files;
}

IndexWork::IndexWork(const SDK::Share& share, bool build) : share_(share.GetName()), builds_(build) {
    if (begin()) return;
    if (builds_ || VLIBCErrGet() != VEXO_ERR_GENERAL || errno == EBUSY) refuse(share_, platformReason());
    printf("%s: its index is damaged, of another version or of other veto files, and is built anew\n",
           terminalText(share_).c_str());
    builds_ = true;
    if (!begin()) refuse(share_, platformReason());
}

IndexWork::~IndexWork() {
    if (open_) FILEIDXIndexEnd(share_.c_str(), 0);
}

bool IndexWork::begin() {
    char path[4096];
    open_ = FILEIDXIndexBegin(share_.c_str(), builds_ ? FI_INDEX_BUILD : FI_INDEX_UPDATE, path, sizeof path) >= 0;
    database_ = open_ ? path : "";
    return open_;
}

void IndexWork::mark(int state) const {
    if (FILEIDXIndexMark(share_.c_str(), state) < 0) refuse(share_, platformReason());
}

void IndexWork::done() {
    open_ = false;
    if (FILEIDXIndexEnd(share_.c_str(), 1) < 0) refuse(share_, platformReason());
}

}  // namespace orvel::ctl
