#include "tus/resumable.h"

#include <cerrno>
#include <ctime>

#include "base/random.h"
#include "free_names.h"
#include "orvel/error_state.h"
#include "upload/body.h"

namespace orvel::cgi {
namespace {

_tag__type_ modeOf(const std::string& conflict) {
    if (conflict == "skip") return OVERWRITE_MODE_SKIP;
    return conflict == "overwrite" ? OVERWRITE_MODE_OVERWRITE : OVERWRITE_MODE_ERROR;
}

}  // namespace

int Resumable::enter() {
    const UploadFacts& facts = record_.facts();
    const std::string& conflict = conflict_.empty() ? facts.conflict : conflict_;
    upload_.emplace(user_, facts.path, modeOf(conflict), facts.search, facts.modified);
    if (conflict == "keep_both") upload_->keepBoth();
    upload_->expectFolder(facts.folder);
    return upload_->enter();
}

int Resumable::create(UploadFacts facts) {
    record_ = UploadRecord(facts);
    int code = enter();
    if (code == ORV_ERR_NONE) code = upload_->check();
    if (code != ORV_ERR_NONE) return code;
    if (upload_->skipped()) return ORV_ERR_EXISTS;
    facts.path = upload_->path();
    facts.folder = upload_->folderNow();
    facts.created = time(nullptr);
    upload_->expectFolder(facts.folder);
    const std::string id = draw<16>();
    if (id.empty()) return uploadCodeOf(errno);
    Spool& spool = upload_->spool();
    code = spool.openKept(upload_->volumePath(), id, true);
    if (code != ORV_ERR_NONE) return code;
    const long long left = spool.freeBytes();
    if (left >= 0 && left < facts.size) code = uploadCodeOf(ENOSPC);
    if (code == ORV_ERR_NONE) code = record_.create(user_.name, id, std::move(facts));
    if (code != ORV_ERR_NONE) spool.removeKept();
    return code;
}

int Resumable::open(const std::string& id, bool lock, std::chrono::seconds wait) {
    // As the user, who could put anything in place of the record.
    int code = actAs(user_.sid.c_str(), user_.name, false);
    if (code == ORV_ERR_NONE) code = record_.open(user_.name, id, lock, wait);
    locked_ = lock && code == ORV_ERR_NONE;
    if (code != ORV_ERR_NONE || record_.isOver()) return code;
    code = enter();
    if (code != ORV_ERR_NONE) return code;
    code = upload_->spool().openKept(upload_->volumePath(), id, false);
    // They went to where the file is now: the process ended before it could say so.
    const bool gone = code == ORV_ERR_MISSING && record_.state() == UploadState::kNaming;
    if (!gone) return code;
    if (!lock) return open(id, true);
    return record_.setState(UploadState::kDone, record_.number()) ? ORV_ERR_NONE : uploadCodeOf(errno);
}

long long Resumable::offset() const {
    return record_.isOver() || !upload_ ? record_.facts().size : record_.counted(upload_->size());
}

std::string Resumable::path() const {
    const std::string& path = record_.facts().path;
    const size_t name = path.rfind('/') + 1;
    const bool beside = record_.number() > 1 && record_.state() == UploadState::kDone;
    return beside ? path.substr(0, name) + numberedName(path.substr(name), static_cast<int>(record_.number()), false)
                  : path;
}

// False, with the code, when a piece could not be written.
bool Resumable::receive(long long length, std::optional<Checksum>& checksum, bool& whole, int& code) {
    return readBody(length, whole, [&](std::string_view data) {
        if (checksum) checksum->add(data);
        code = upload_->write(data);
        return code == ORV_ERR_NONE;
    });
}

// What must have a checksum counts once it has it, whatever ends the process before that.
int Resumable::take(long long offset, long long length, std::optional<Checksum>& checksum, Piece& piece) {
    Spool& spool = upload_->spool();
    if (spool.size() != offset && !spool.cut(offset)) return uploadCodeOf(errno);
    if (!record_.setState(checksum ? UploadState::kChecked : UploadState::kGoing, offset)) return uploadCodeOf(errno);
    int code = ORV_ERR_NONE;
    bool whole = false;
    static_cast<void>(receive(length, checksum, whole, code));
    if (code == ORV_ERR_NONE && !whole) piece = Piece::kCut;
    if (checksum && (!whole || !checksum->holds())) {
        if (whole) piece = Piece::kMismatch;
        if (!spool.cut(offset)) return uploadCodeOf(errno);
    }
    if (!spool.sync() && code == ORV_ERR_NONE) code = uploadCodeOf(errno);
    if (!record_.setState(UploadState::kGoing) && code == ORV_ERR_NONE) code = uploadCodeOf(errno);
    return code;
}

int Resumable::append(long long offset, long long length, std::optional<Checksum> checksum, Piece& piece) {
    piece = offset == this->offset() ? Piece::kTaken : Piece::kOtherOffset;
    if (piece == Piece::kTaken && length > record_.facts().size - offset) piece = Piece::kTooLong;
    if (piece != Piece::kTaken || record_.isOver()) return ORV_ERR_NONE;
    const int code = length > 0 ? take(offset, length, checksum, piece) : static_cast<int>(ORV_ERR_NONE);
    if (code != ORV_ERR_NONE) piece = Piece::kFailed;
    if (piece != Piece::kTaken || !isWhole()) return code;
    const int completed = complete();
    if (completed != ORV_ERR_NONE) piece = Piece::kFailed;
    return completed;
}

int Resumable::complete() {
    if (record_.isOver() || !isWhole()) return ORV_ERR_NONE;
    int code = upload_->check();
    if (code == ORV_ERR_NONE) {
        code = upload_->finish([&](int number) { return record_.setState(UploadState::kNaming, number); });
    }
    if (code != ORV_ERR_NONE) {
        // The bytes stay, for as long as those of any other.
        static_cast<void>(upload_->spool().setModified(time(nullptr)));
        static_cast<void>(record_.setState(UploadState::kGoing));
        return code;
    }
    upload_->spool().removeKept();
    const UploadState state = upload_->skipped() ? UploadState::kSkipped : UploadState::kDone;
    return record_.setState(state, record_.number()) ? ORV_ERR_NONE : uploadCodeOf(errno);
}

int Resumable::remove() {
    if (upload_) upload_->spool().removeKept();
    record_.remove();
    return ORV_ERR_NONE;
}

}  // namespace orvel::cgi
