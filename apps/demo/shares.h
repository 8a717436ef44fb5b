// The shares of the demo appliance: how they are defined and what lies in them.
#ifndef ORVEL_DEMO_SHARES_H
#define ORVEL_DEMO_SHARES_H

#include <string>
#include <vector>

#include "identities.h"

namespace orvel::demo {

// The roots of all shares for one tag, "/tmp/orvel-demo-<tag>-<share>": a share root is the second component of its
// path. In the order of the definitions.
std::vector<std::string> shareRoots(const std::string& tag);
// Whether a path has that form and nothing more: what may be removed.
bool isShareRoot(const std::string& path);

// The share definitions.
std::string sharesText(const std::string& tag);
// Makes every root with its content.
void makeShares(const std::string& tag, const Identities& ids);

}  // namespace orvel::demo

#endif
