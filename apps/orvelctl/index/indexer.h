// Brings the index of one share in step with its files.
#ifndef ORVEL_ORVELCTL_INDEX_INDEXER_H
#define ORVEL_ORVELCTL_INDEX_INDEXER_H

#include <map>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "index/file_events.h"
#include "index/index_rows.h"
#include "index/progress.h"
#include "index/share_files.h"

namespace orvel::ctl {

struct IndexCounts {
    unsigned long long folders = 0;   // looked at
    unsigned long long compared = 0;  // of these, entry by entry
    unsigned long long added = 0;
    unsigned long long changed = 0;
    unsigned long long removed = 0;
    unsigned long long unread = 0;  // folders and files that are there and could not be read
};

// A folder's own row is written behind everything below it, and has a time that is not the folder's as long as the
// folder may change without showing it: where the work is broken off, the next update goes on.
class Indexer {
 public:
    // A nonzero `*stop` breaks the work off.
    Indexer(const ShareFiles& files, IndexRows& rows, const int* stop) : files_(files), rows_(rows), stop_(stop) {}

    // Fills an empty index. False when it was broken off; throws what IndexRows throws, and Unreadable.
    bool build();
    // Looks at every folder of the index and compares those that changed, with `everything` all of them. What cannot be
    // read stays in the index as it is, is counted, and is looked at again by the next update.
    bool update(bool everything);
    // Compares what was touched, and nothing else: reads first, and writes then, so that the disk is waited for once.
    void follow(const Touched& touched);
    // Writes the own rows of folders that have been quiet since they were followed. `asOf`: what changed before that
    // (kernel's clock) has been followed, or is less than two seconds old.
    void settleQuiet(int64_t asOf);
    [[nodiscard]] const IndexCounts& counts() const { return counts_; }
    // The first that could not be read, and why; "" for none.
    [[nodiscard]] const std::string& unread() const { return unread_; }

 private:
    // A folder that the index does not have yet.
    struct NewFolder {
        Entry own;
        int64_t seen;               // kernel's clock before it was listed
        std::vector<Entry> inside;  // its folders that are still to be read
        bool whole = true;          // all of it could be read
    };

    // A name as it is, and as the index has it.
    struct Look {
        std::string path;
        std::optional<Entry> now;
        std::optional<Row> before;
        bool replaced;
    };

    [[nodiscard]] bool isLeftOut(const std::string& folder, const std::string& name) const;
    bool look(const std::string& folder, const std::string& name, bool replaced, std::vector<Look>& looks);
    bool lookAtAll(const std::string& folder, const std::map<std::string, bool>& names, std::vector<Look>& looks);
    [[nodiscard]] bool lookAtOwn(const std::string& folder);
    bool lookInto(const std::string& folder, const std::map<std::string, bool>& names, std::vector<Look>& looks);
    void forgetOwn(const std::string& folder);
    void take(Look& look);
    void postpone();
    [[nodiscard]] bool stopped() const { return *stop_ != 0; }
    bool list(const std::string& folder, std::vector<Entry>& entries);
    void noteUnread(const std::string& what);
    NewFolder read(Entry folder);
    void addTree(Entry top);
    void add(const Entry& entry);
    void writeOwnRow(Entry folder, int64_t seen);
    void writeOwnRows();
    void removeTree(const std::string& path, bool isFolder);
    void compareEntry(const Entry& entry, const Row* row);
    bool compare(const std::string& folder);
    void visit(const std::string& folder, const Row& stored, bool everything);
    void settle();
    void rest();

    const ShareFiles& files_;
    IndexRows& rows_;
    const int* stop_;
    bool updating_ = false;
    Progress progress_;
    IndexCounts counts_;
    std::string unread_;
    std::map<std::string, Row> known_;                 // the folders of the index
    std::set<std::string> changed_;                    // folders that did change
    std::set<std::string> replaced_;                   // all folders below these are compared
    std::vector<std::pair<Entry, int64_t>> compared_;  // folders whose own rows are to be written, and when seen
    std::set<std::string> unsettled_;                  // folders that may change without showing it
    std::map<std::string, int64_t> quietFrom_;         // those that were followed, and when they may be quiet
    std::set<std::string> renewed_;                    // written whole while touched names are followed
};

}  // namespace orvel::ctl

#endif
