// One request of a visitor, as far as it needs root: which link, from where, logged in or not.
#ifndef ORVEL_CGI_SHARE_VISIT_H
#define ORVEL_CGI_SHARE_VISIT_H

#include <string>

#include "orvel/sharing_link.h"
#include "output.h"
#include "public_link.h"
#include "vexo/guess.h"
#include "vexo/web.h"

namespace orvel::cgi {

enum class Availability {
    kOpen,
    kBlocked,  // too many failed attempts from this address
    kNone,     // no such link, revoked, out of its window, its owner gone: a visitor does not learn which
    kBroken    // the database could not be used
};

enum class Session {
    kIn,
    kOut,
    kUnknown  // could not be determined
};

enum class LogIn {
    kDone,   // a cookie may wait for the reply's header
    kWrong,  // a wrong password, which counts as a failed attempt
    kWait,   // it is not this visitor's turn to have a password judged: waiting() says when
    kBroken  // no session could be made
};

// Answers a request for a link that is not open.
void refuse(Output& out, Availability availability);

class Visit {
 public:
    explicit Visit(VEXO::WebCGI& web);

    [[nodiscard]] Availability availability() const { return availability_; }
    [[nodiscard]] const Link& link() const { return link_; }
    [[nodiscard]] VEXO::WebCGI& web() const { return web_; }

    // Is the visitor logged in as the link's owner? A link without a password asks for no log-in, and has no sessions.
    Session session();
    // Logs the visitor in. Nothing here waits for a turn: a visitor who is not next is told when to come again, and
    // `turn` is what such an answer gave. One who has shown the right password before need not queue.
    LogIn logIn(const std::string& password, const std::string& turn);
    [[nodiscard]] const VEXOGUESS& waiting() const { return guess_; }
    // The Set-Cookie line that takes a cookie away which a log-in never gave; "" for none.
    [[nodiscard]] const std::string& dropCookie() const { return dropCookie_; }
    void writePage();

 private:
    Availability find();
    [[nodiscard]] std::string sealName() const { return link_.id + "-seal"; }
    Session sealed();
    bool isAuthorized();
    bool recordSession();

    VEXO::WebCGI& web_;
    OrvelLogin::FolderSharingLoginManager manager_;
    Link link_;
    Availability availability_;
    VEXOGUESS guess_ = {.wait = 0, .turn = "", .seat = -1};
    std::string dropCookie_;
};

}  // namespace orvel::cgi

#endif
