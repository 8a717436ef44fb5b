// Removing files and whole folders, for good.
#ifndef ORVEL_CGI_OPERATION_TREE_REMOVE_H
#define ORVEL_CGI_OPERATION_TREE_REMOVE_H

#include "operation/item.h"
#include "operation/progress.h"

namespace orvel::cgi {

// Removes the entry with everything below it, hidden names too; links are removed, not followed. What cannot be removed
// is reported, each item for itself, and the rest goes on; another file system that is mounted in the tree stays. True
// when all of it is gone.
bool removeTree(const Entry& entry, Progress& progress);
// The same without a word, and in the system's name: nothing is kept out.
void removeTreeQuietly(int folder, const std::string& name);

}  // namespace orvel::cgi

#endif
