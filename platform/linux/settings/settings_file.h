// A settings file as a whole: read without a lock, changed in place.
//
// The file keeps its inode, since callers lock the file itself, and so it is overwritten; a writer that is killed
// within its write leaves part of the old and part of the new text (the kernel looks for signals at each page).
// Therefore the change lies whole beside the file, in FILE.pending, while it is made: a reader that finds the file on
// the way from one text to the other takes the new one, and the next writer ends the change.
#ifndef VEXO_LINUX_SETTINGS_FILE_H
#define VEXO_LINUX_SETTINGS_FILE_H

#include <functional>
#include <optional>
#include <string>
#include <string_view>

#include "io/file_io.h"

namespace vexo {

struct PendingChange {
    std::string before;
    std::string after;

    bool operator==(const PendingChange&) const = default;
};

// The text of a pending file, docs/formats/settings.md, and back; empty for one that is torn.
std::string buildPendingChange(std::string_view before, std::string_view after);
std::optional<PendingChange> parsePendingChange(std::string_view text);

// True when a file with this text is on the way from `before` to `after`, both included. Anything else was written by
// somebody since, who is right.
bool isOnTheWay(std::string_view text, const PendingChange& change);

// Reads a settings file, all of it before or after any change. False with errno when it cannot be read.
[[nodiscard]] bool readSettingsFile(const std::string& path, std::string& text, FileVersion& version);

// Puts what `edit` makes of its text into the file; `create` makes a missing one, mode 0644. False with errno, the file
// as it was (a missing one may be there, empty).
[[nodiscard]] bool changeSettingsFile(const std::string& path, bool create,
                                      const std::function<std::string(std::string_view)>& edit);

}  // namespace vexo

#endif
