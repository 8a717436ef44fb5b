#include "shares.h"

#include <algorithm>
#include <string_view>

#include "content.h"
#include "tree.h"

namespace orvel::demo {
namespace {

struct DemoShare {
    const char* name;
    const char* options;
    void (*fill)(Tree&);
};

// In smb.conf(5) terms `valid users` may enter, and write where the share is not read-only; of them `write list` may
// write and `read list` may not.
constexpr DemoShare kShares[] = {
    {"homes", "comment = home folders, made on first use\nread only = no\nvalid users = alice, bob, admin\n",
     fillHomes},
    {"photo",
     "read only = no\nvalid users = alice, bob, @administrators\nread list = bob\nvexo:synced = yes\nvexo:index = "
     "yes\n",
     fillPhoto},
    {"music", "valid users = alice, bob, admin\nwrite list = alice, admin\n", fillMusic},
    {"projects", "read only = no\nvalid users = @users\ninvalid users = bob\n", fillProjects},
    {"worldwide", "read only = no\nvalid users = alice, bob, admin\n", fillWorldwide},
    {"warehouse", "read only = no\nvalid users = @users\nvexo:index = yes\n", fillWarehouse},
    {"sealed", "comment = no listing, no download\nread only = no\nvalid users = @users\nvexo:restriction = 1\n",
     fillSample},
    {"archive",
     "comment = existing files stay as they are\nread only = no\nvalid users = alice, bob, admin\nread list = bob\n"
     "vexo:restriction = 2\n",
     fillSample},
    {"preview",
     "comment = no download\nread only = no\nvalid users = alice, bob, admin\nread list = bob\nvexo:restriction = 4\n",
     fillSample},
    {"backstage", "comment = hidden\nbrowseable = no\nread only = no\nvalid users = alice, admin\n", fillSample},
};

constexpr std::string_view kPrefix = "/tmp/orvel-demo-";

std::string rootOf(const std::string& tag, const char* share) {
    return std::string(kPrefix) + tag + "-" + share;
}

}  // namespace

std::vector<std::string> shareRoots(const std::string& tag) {
    std::vector<std::string> roots;
    for (const DemoShare& share : kShares) roots.push_back(rootOf(tag, share.name));
    return roots;
}

bool isShareRoot(const std::string& path) {
    return path.starts_with(kPrefix) && path.size() > kPrefix.size() &&
           path.find_first_not_of("abcdefghijklmnopqrstuvwxyz0123456789-", kPrefix.size()) == std::string::npos;
}

std::string sharesText(const std::string& tag) {
    std::string text = "# The shares of the demo appliance.\n";
    for (const DemoShare& share : kShares) {
        text += std::string("\n[") + share.name + "]\npath = " + rootOf(tag, share.name) + "\n" + share.options;
    }
    return text;
}

void makeShares(const std::string& tag, const Identities& ids) {
    for (const DemoShare& share : kShares) {
        Tree tree(rootOf(tag, share.name), ids);
        share.fill(tree);
        // Nobody but the appliance itself makes homes.
        const bool homes = std::string_view(share.name) == "homes";
        tree.finish(homes ? (ids.real ? 0 : ids.alice) : ids.alice, homes ? 0755 : 0775);
    }
}

}  // namespace orvel::demo
