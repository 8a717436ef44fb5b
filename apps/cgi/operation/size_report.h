// What a walk through chosen items comes to, and the part of it that a task's record has room for.
#ifndef ORVEL_CGI_OPERATION_SIZE_REPORT_H
#define ORVEL_CGI_OPERATION_SIZE_REPORT_H

#include <json/value.h>
#include <sys/types.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

namespace orvel::cgi {

struct Amount {
    long long size = 0;        // what files hold
    long long disk = 0;        // what everything takes on its file system
    long long files = 0;       // names of regular files
    long long folders = 0;     // those that were chosen among them
    long long others = 0;      // links, devices and the like
    long long mounts = 0;      // folders where another file system is mounted: not entered
    long long unreadable = 0;  // folders and entries that could not be looked at
    void add(const Amount& more);
};

enum class SizeKind { kFile, kFolder, kOther, kMount };

struct Sized {
    std::string path;  // share-relative
    SizeKind kind = SizeKind::kFile;
    Amount amount;
};

// The largest of many, in little memory.
class Largest {
 public:
    explicit Largest(size_t most) : most_(most) {}
    // Gives back what is not kept: the least of all, or nothing yet (a path that is empty).
    Sized add(Sized one);
    // Whether one of this size would be kept.
    [[nodiscard]] bool takes(long long size) const;
    // Takes all of it, the largest first.
    std::vector<Sized> sorted() const;

 private:
    size_t most_;
    std::vector<Sized> heap_;  // the least one first
};

// Files of several names that were met, until all their names were.
class LinkedFiles {
 public:
    explicit LinkedFiles(size_t most = size_t{200} * 1000) : most_(most) {}
    enum class Met { kFirst, kAgain, kUnknown };  // kUnknown: there was no room to remember it
    Met meet(dev_t device, ino_t inode, std::uint64_t links);

 private:
    struct Key {
        dev_t device;
        ino_t inode;
        bool operator==(const Key& other) const { return device == other.device && inode == other.inode; }
    };
    struct Hash {
        size_t operator()(const Key& key) const { return std::hash<ino_t>()(key.inode * 31 + key.device); }
    };
    size_t most_;
    std::unordered_map<Key, std::uint64_t, Hash> left_;  // how many names are still to come
};

class SizeReport {
 public:
    // `folder`: the only one that was chosen, whose entries are the parts; without it these are what was chosen.
    void describe(const std::string& folder) { folder_ = folder; }
    Amount total;
    long long linked = 0;        // names of files that were counted under another name
    long long linksUnknown = 0;  // names of files that may have been counted more than once

    void part(Sized one);
    // Files and folders alone have a place among the largest; whether one of this size would be kept there.
    [[nodiscard]] bool keeps(SizeKind kind, long long size) const;
    void largest(Sized one);
    // The folder or entry, and the errno.
    void unreadable(const std::string& path, int error);

    // As the task's member "measured"; see docs/programs.md. `lists`: also those that are complete only in the end.
    [[nodiscard]] Json::Value json(bool lists) const;

 private:
    std::string folder_;
    Largest parts_{1000}, files_{100}, folders_{100};
    Amount rest_;
    long long restCount_ = 0;
    Json::Value unreadable_{Json::arrayValue};
};

// Leaves the sums alone in such a member: whoever asks for all tasks asks often.
void leaveOutLists(Json::Value& measured);

}  // namespace orvel::cgi

#endif
