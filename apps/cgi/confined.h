// Files and folders of a share, opened so that nothing in their path leads out of the share.
#ifndef ORVEL_CGI_CONFINED_H
#define ORVEL_CGI_CONFINED_H

#include <string>

#include "base/descriptor.h"
#include "orvel/file_info.h"

namespace orvel::cgi {

// What symbolic links below a share root may do. Setting "link_policy_<share>" (the share's name as defined, "home" for
// home folders): "inside", which is also the default, or "none"; any other value counts as "none".
enum class LinkPolicy {
    kInside,  // lead anywhere within the share; absolute ones always count as leaving it
    kNone     // not be followed at all
};
LinkPolicy linkPolicyOf(const std::string& shareName);

// A share's name as it is defined, since shares answer to any spelling; "home" for home folders, "" for no share.
std::string definedShareName(const std::string& shareName);

// Opens the folder that `info` resolved to, as the calling identity, beneath its share root, and puts its path without
// links, "." or ".." into `realPath`. 0; 407 when the path leaves the share (".." or a link) or the policy forbids a
// link in it, 408 missing or no folder, 410 a network mount that does not answer, 402 else.
//
// The library opens the result once more, by path: whoever swaps a folder of it for a link in between is bound by what
// the kernel lets the calling identity read.
int confinedFolder(const PathInfo& info, LinkPolicy policy, std::string& realPath);

// Opens what `info` resolved to, as the calling identity, with the flags of open(2). 0 or a code as above.
int confinedOpen(const PathInfo& info, LinkPolicy policy, int flags, Descriptor& opened);

// Opens `path` beneath the open folder `root`; invalid, with errno, on failure.
Descriptor openBeneath(const Descriptor& root, const std::string& path, LinkPolicy policy, int flags);

// The path of an open folder, free of links; "" when it is longer than 4,095 bytes.
std::string realPathOf(const Descriptor& folder);

// The library code for a confined opening that failed with `error`.
int refusalCode(int error, const std::string& realPath);

}  // namespace orvel::cgi

#endif
