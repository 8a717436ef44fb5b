// Files and folders of a share, opened so that nothing in their path leads out of the share.
#ifndef ORVEL_CGI_CONFINED_H
#define ORVEL_CGI_CONFINED_H

#include <optional>
#include <string>

#include "base/beneath.h"
#include "orvel/file_info.h"

namespace orvel::cgi {

// What symbolic links below a share root may do. Setting "link_policy_<share>" (the share's name as defined, "home" for
// home folders): "inside", which is also the default, or "none"; any other value counts as "none".
LinkPolicy linkPolicyOf(const std::string& shareName);

// A share's name as it is defined, since shares answer to any spelling; "home" for home folders, "" for no share.
std::string definedShareName(const std::string& shareName);

// What a path names is opened once, and everything that follows is done with what is open. The library takes the folder
// as Descriptor::path(): it enters that one, and calls it by where it lies.

// Opens the folder that `info` resolved to as a place (O_PATH), as the calling identity, beneath its share root, and
// puts its path without links, "." or ".." into `realPath`. 0; 407 when the path leaves the share (".." or a link) or
// the policy forbids a link in it, 408 missing or no folder, 410 a network mount that does not answer, 402 else.
int confinedFolder(const PathInfo& info, LinkPolicy policy, Descriptor& folder, std::string& realPath);

// Opens what `info` resolved to, as the calling identity, with the flags of open(2). 0 or a code as above.
int confinedOpen(const PathInfo& info, LinkPolicy policy, int flags, Descriptor& opened);

// Where something opened in the share of `info` lies below the share's root, free of links: "/a/b", "" for the root.
// Nothing when it lies elsewhere by now, or deeper than a path can tell.
std::optional<std::string> pathInShare(const PathInfo& info, const Descriptor& opened);

// Whether what was opened beneath the share's root is, or lies in, something that the file manager never shows: then it
// is not there for anybody.
bool isHiddenPlace(const Descriptor& root, const Descriptor& opened);

// Opens `path` beneath the open folder `from` of the share whose root is open. 0 or a code as of confinedOpen, of which
// `realPath` is the path meant; 408 for what is never shown.
int openShown(const Descriptor& root, const Descriptor& from, const std::string& path, LinkPolicy policy, int flags,
              const std::string& realPath, Descriptor& opened);

// The library code for a confined opening that failed with `error`.
int refusalCode(int error, const std::string& realPath);

}  // namespace orvel::cgi

#endif
