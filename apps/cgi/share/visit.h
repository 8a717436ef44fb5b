// One request of a visitor, as far as it needs root: which link, from where, logged in or not.
#ifndef ORVEL_CGI_SHARE_VISIT_H
#define ORVEL_CGI_SHARE_VISIT_H

#include <string>

#include "link_store.h"
#include "orvel/sharing_link.h"
#include "vexo/web.h"

namespace orvel::cgi {

enum class Availability {
    kOpen,
    kBlocked,  // too many failed attempts from this address
    kNone,     // no such link, revoked, out of its window, its owner gone: a visitor is not told which
    kBroken    // the database could not be used
};

class Visit {
 public:
    explicit Visit(VEXO::WebCGI& web);

    [[nodiscard]] Availability availability() const { return availability_; }
    [[nodiscard]] const Link& link() const { return link_; }
    [[nodiscard]] VEXO::WebCGI& web() const { return web_; }

    // Is the visitor logged in as the link's owner?
    bool isLoggedIn();
    // Logs the visitor in; false for a wrong password, which counts as a failed attempt, and when no session could be
    // made. A cookie then waits for the reply's header.
    bool logIn(const std::string& password);
    void writePage();

 private:
    Availability find();

    VEXO::WebCGI& web_;
    OrvelLogin::FolderSharingLoginManager manager_;
    Link link_;
    Availability availability_;
};

}  // namespace orvel::cgi

#endif
