// The walk behind OrvDirectoryWalker: one engine for the three orders.
#ifndef ORVEL_ENUM_TREE_WALK_H
#define ORVEL_ENUM_TREE_WALK_H

#include <cstddef>
#include <string>
#include <vector>

#include "core/owned.h"
#include "enum/folder_entry.h"
#include "enum/folder_reader.h"
#include "orvel/directory_walker.h"

namespace orvel {

enum class WalkOrder {
    kDepthFirst,
    kFirstFolderFirst,  // every entry of the starting folder ahead of anything deeper
    kFirstFolderOnly
};

struct WalkRequest {
    _enum_ignore_err_ mode;
    const int* abortFlag;
    const std::string& context;
    const std::string* extra;
    OrvDirectoryWalkerCallBack* before;
    OrvDirectoryWalkerCallBack* after;
    bool skipRecycle;
    WalkOrder order;
};

// Whether a failure with this errno is passed over silently.
[[nodiscard]] bool ignoresFailure(_enum_ignore_err_ mode, int error);

// One walk, without recursion. The names of a level are read before its entries are handled. Folders are opened
// relative to their parent's descriptor, so no path is ever too long and no link that takes a folder's place is
// followed; descriptors of levels far above are closed and opened again on the way back.
class TreeWalk {
 public:
    // Borrows all of them.
    TreeWalk(const WalkRequest& request, const std::string& displayPath, const GivenFolder& start)
        : request_(request), start_(start), display_(displayPath), real_(start.text()) {}

    [[nodiscard]] bool run();

 private:
    // A folder between its entering and its leaving. The names of its entries stand in names_ from `firstName` to
    // `endOfNames`.
    struct Level {
        Descriptor folder;        // closed while the walk is far below
        FolderIdentity identity;  // set when it is closed
        std::size_t firstName, nextName, endOfNames;
        std::size_t currentName;                // of the entry being handled
        std::size_t displayLength, realLength;  // of the folder's own paths
        int readError;                          // what ended the reading of the names early
        _tag_VEXOSTAT_ status;                  // of the entry being handled
    };

    bool enterStart();
    bool step();
    bool handleEntry();
    bool handlePending();
    bool descend();
    void push(Descriptor folder);
    static void closeFolder(Level& level);
    bool finishLevel();
    bool leaveLevel();
    void reopenDeepest(int child);
    [[nodiscard]] Descriptor openByNames(std::size_t index) const;

    void setEntry(const Level& level);
    bool call(OrvDirectoryWalkerCallBack* callback);
    bool aborted();
    [[nodiscard]] bool passOver(EntryFailure failure, int error) const;
    [[nodiscard]] bool passOverStatus(int error) const;

    const WalkRequest& request_;
    const GivenFolder& start_;
    std::string display_, real_;        // of the entry being handled, or of the level where none is
    std::string name_;                  // of that entry
    std::string names_;                 // of every level, each ended by NUL
    std::vector<Level> levels_;         // the deepest last
    std::vector<std::size_t> pending_;  // names of the folders met in the first folder, entered later
    std::size_t nextPending_ = 0;
    bool cancelled_ = false;
    FolderReader reader_;
};

// One walk; false, too, when memory runs out.
[[nodiscard]] bool walkTree(const WalkRequest& request, const std::string& displayPath, const GivenFolder& start);

}  // namespace orvel

#endif
