// Who deleted what into a recycle bin, and when: a file for each bin, which only root reads and writes. See
// docs/formats/recycle.md. What nobody recorded, Samba's module for one, is none of it.
#ifndef ORVEL_CGI_DELETED_LOG_H
#define ORVEL_CGI_DELETED_LOG_H

#include <cstdint>
#include <string>
#include <unordered_map>
#include <vector>

namespace orvel::cgi {

struct Deletion {
    long long time = 0;  // seconds
    uint64_t inode = 0;  // of what was deleted: another thing at its path is not meant
    std::string user;
};
using Deletions = std::unordered_map<std::string, Deletion>;  // by the path in the bin

struct RecordedBin {
    std::string share;  // as defined, "home" for homes
    std::string path;   // real, free of links
};

// Adds a record. False with errno; what was deleted is deleted all the same.
bool noteDeletion(const RecordedBin& bin, const std::string& path, uint64_t inode, const std::string& user);
// What is recorded of the bin at the real path; empty when nothing is, or it cannot be read.
Deletions deletionsIn(const std::string& bin);

// The bins that have records. As root. False with errno when they cannot be listed.
bool recordedBins(std::vector<RecordedBin>& bins);
// Keeps of a bin's records those that are in `kept`; none removes the file. As root.
bool keepDeletions(const RecordedBin& bin, const Deletions& kept);

}  // namespace orvel::cgi

#endif
