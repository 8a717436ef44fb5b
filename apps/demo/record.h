// What a demo appliance consists of, kept in its own etc/vexo/demo.json: nothing else is ever removed.
#ifndef ORVEL_DEMO_RECORD_H
#define ORVEL_DEMO_RECORD_H

#include <optional>
#include <string>
#include <vector>

#include "identities.h"

namespace orvel::demo {

struct Record {
    bool whole = false;              // false while it is being made
    bool folderMade = false;         // the folder itself did not exist before
    std::vector<std::string> roots;  // of the shares
    std::vector<Person> people;      // names and passwords
};

// The record of the demo in `folder`; nothing when there is none or when it is not the caller's own file. Throws when
// it cannot be understood.
std::optional<Record> readRecord(const std::string& folder);
// Replaces the record; readable to its owner alone, since it holds the passwords.
void writeRecord(const std::string& folder, const Record& record);

// Writes a new file of the appliance with its folders. Throws std::system_error.
void writeNew(const std::string& path, const std::string& text, mode_t mode);

// Whether the share roots are all there.
bool isWhole(const Record& record);
// Removes the share roots, the appliance's trees in `folder`, and the folder itself when it was made with the demo and
// holds nothing else.
void removeDemo(const std::string& folder, const Record& record);

}  // namespace orvel::demo

#endif
