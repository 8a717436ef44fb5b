// Names that nothing else has.
#ifndef ORVEL_CGI_FREE_NAMES_H
#define ORVEL_CGI_FREE_NAMES_H

#include <string>
#include <unordered_map>
#include <unordered_set>

namespace orvel::cgi {

// "name (2).ext" for the number 2; a folder's name has no ending. What does not fit into 255 bytes is cut off before
// the number, never within a character. Pure.
std::string numberedName(const std::string& name, int number, bool isFolder);
// The same with another mark, of which at most 128 bytes count.
std::string markedName(const std::string& name, const std::string& mark, bool isFolder);

// Gives each member of an archive a name of its own.
class FreeNames {
 public:
    // `wanted`, or the next numbered name that was not given yet. Its cost does not grow with how often it is wanted.
    std::string take(const std::string& wanted, bool isFolder);

 private:
    std::unordered_set<std::string> taken_;
    std::unordered_map<std::string, int> numbers_;  // the last that a wanted name got
};

}  // namespace orvel::cgi

#endif
