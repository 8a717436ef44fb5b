// What an operation did, item by item, so that it can be undone: a file of its own beside the task's record, in the
// user's store /var/lib/vexo/undo. See docs/formats/undo.md.
//
// The file is the user's own, so nothing in it is believed: whoever undoes asks for every item again what may be done.
#ifndef ORVEL_CGI_OPERATION_UNDO_RECORD_H
#define ORVEL_CGI_OPERATION_UNDO_RECORD_H

#include <sys/stat.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/descriptor.h"
#include "own_store.h"

namespace orvel::cgi {

enum class Deed : char {
    kMoved = 'm',      // lies at `path`, and was at `other`
    kCopied = 'c',     // a file or link at `path`, from the one at `other`
    kMade = 'd',       // the folder at `path`
    kPermitted = 'p',  // at `path` has other permissions: `other` has those before and after, a line each
    kRemoved = 'r'     // the folder at `path`, which was empty by then
};

struct UndoItem {
    Deed deed = Deed::kMoved;
    std::string path, other;       // share-relative
    struct stat status {};         // as the operation left it; of kRemoved as it was; without a device, see fileSystem
    std::uint64_t fileSystem = 0;  // that it lay on (fileSystemOf)
};

// Whether what is now in the open `folder`, with the status `now`, is what the operation left; and has not been changed
// since.
bool isItem(const UndoItem& left, int folder, const struct stat& now);
bool isUntouched(const UndoItem& left, int folder, const struct stat& now);

// An id that a record can have: that of an operation.
bool isOperationId(std::string_view text);

// Writes the record while the operation goes on. What cannot be recorded is counted; the operation is done all the
// same.
class UndoRecord {
 public:
    UndoRecord(std::string user, std::string id) : user_(std::move(user)), id_(std::move(id)) {}

    // Nothing is to be recorded.
    void turnOff() { off_ = true; }
    // `name` in the open `folder` is what the deed left; `before`: it, as it was found, of which a move kept the rest.
    void moved(int folder, const std::string& name, const std::string& path, const std::string& other,
               const struct stat& before);
    void copied(int folder, const std::string& name, const std::string& path, const std::string& other,
                const struct stat& source);
    void made(int folder, const std::string& name, const std::string& path);
    void removed(const std::string& path, const struct stat& before);
    void permitted(int folder, const std::string& name, const std::string& path, const std::string& change);
    // Something was done that cannot be undone: another file was replaced, or it went wrong halfway.
    void leaveOut() { leftOut_ += off_ ? 0 : 1; }
    // The operation is over: whoever sees that may undo it.
    void close() { file_ = Descriptor(); }

    [[nodiscard]] const std::string& id() const { return id_; }
    // How many items can be moved back or removed again, and how many were left out.
    [[nodiscard]] long long count() const { return count_; }
    [[nodiscard]] long long leftOut() const { return leftOut_; }

 private:
    bool open();
    bool add(UndoItem item, int folder);

    std::string user_, id_;
    Descriptor file_;  // locked as long as the operation goes on
    bool off_ = false, failed_ = false;
    long long count_ = 0, leftOut_ = 0, bytes_ = 0;
};

// A record that is read to be undone, by one process at a time.
class UndoFile {
 public:
    // 0; 408 when the user has none of that id, or it was undone; 420 while the operation goes on, or is being undone.
    int open(const std::string& user, const std::string& id);
    [[nodiscard]] size_t size() const { return items_.size(); }
    // False for what is none.
    [[nodiscard]] bool item(size_t position, UndoItem& item) const;
    // Keeps the items for which `isLeft` holds, for another time; without any the record is gone.
    void keep(const std::function<bool(size_t position)>& isLeft);

 private:
    int read();

    std::string id_, text_;
    Descriptor folder_, file_;
    struct Piece {
        std::string_view facts, path, other;
    };
    std::vector<Piece> items_;  // of text_
};

// Removes records that nobody asked for within two days. As root.
[[nodiscard]] OwnSweep sweepUndoRecords();

}  // namespace orvel::cgi

#endif
