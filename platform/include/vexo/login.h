// Log-ins: conversations with the machine about who somebody is.
#ifndef VEXO_LOGIN_H
#define VEXO_LOGIN_H

#include "vexo/export.h"

// A conversation outlives the request that began it, as the machine may ask several questions (a one-time code, a new
// password for one that has expired). It is held by a process of its own, the program vexo-login, which no other part
// of the appliance shares memory, descriptors or environment with: what judges a log-in loads modules of others, and
// what they do (threads, descriptors, a crash, a loop) ends with it. It lasts at most 60 seconds; at most 32 are held
// at once, and 2 for one client (an address, or the first 64 bits of an IPv6 address).
//
// Where the system root is "/" PAM judges, as the service "orvel", with the client's address as PAM_RHOST; the account
// is asked for, too, and a password that has expired can be changed. Elsewhere the root's own etc/shadow does, which
// changes nothing.
//
// Who may log in: users with a uid of UID_MIN (etc/login.defs, 1000 without it) or more, never uid 0 or 65534, in one
// of the groups of the setting "log_in_groups" where that is set, whose account has not ended and is not locked. Where
// the root is "/" and Samba's pdbedit is there, a user who is disabled in its database is refused as well. A name that
// may not log in is judged like any other, but never with the password that was given; it and an unknown name are
// answered as a wrong password is, after the same time.
//
// Each failure counts for the auto-block service (tag "login") and is a line of the system log (facility authpriv).

enum VEXO_LOGIN_STEP {
    VEXO_LOGIN_ASK = 1,     // `text` is to be answered by VEXOLogInAnswer
    VEXO_LOGIN_DONE = 2,    // it is `user`
    VEXO_LOGIN_REFUSED = 3  // `reason` says why
};

enum VEXO_LOGIN_REASON {
    VEXO_LOGIN_WRONG = 1,    // name or password, or a user who may not log in
    VEXO_LOGIN_EXPIRED = 2,  // the password was right, the account or the password has ended
    VEXO_LOGIN_LOCKED = 3,   // the password was right, the account is locked
    VEXO_LOGIN_BLOCKED = 4,  // the address is denied for `wait` seconds
    VEXO_LOGIN_BUSY = 5,     // too many conversations; `wait` seconds are worth waiting
    VEXO_LOGIN_OVER = 6,     // no such conversation, or another client's
    VEXO_LOGIN_TWICE = 7,    // the former answer is still being judged; the conversation goes on
    VEXO_LOGIN_SERVICE = 8   // the service is missing, hung or broken; the log says more
};

typedef struct VEXOLOGIN {
    int step;             // VEXO_LOGIN_STEP
    int reason;           // VEXO_LOGIN_REASON of a refusal, else 0
    int hidden;           // of a question: 1 when the answer must not be shown
    int wait;             // seconds, of VEXO_LOGIN_BLOCKED and VEXO_LOGIN_BUSY
    char id[33];          // the conversation, to be kept by whoever answers; "" when it has ended
    char user[512];       // the name as the service has it, which may differ from the one that was given
    char text[1024];      // the question; any bytes, cut
    char messages[4096];  // what the service said before, a line each; any bytes, cut
} VEXOLOGIN;

VEXO_BEGIN_C
// Begins a conversation about `user` for the client at `address` (numeric; anything else counts as one client). The
// step, which `*out` has too; null arguments are VEXO_LOGIN_SERVICE. A name that no account can have (over 255 bytes,
// control bytes, a "/") gets the question for a password, and whatever is answered is wrong.
VEXO_API int VEXOLogInBegin(const char* user, const char* address, VEXOLOGIN* out);
// Answers the question of conversation `id` with the `size` bytes at `text`, which may be any; more than 4,096, or a
// NUL among them, is a wrong answer. Only the client that began it is heard. The step, as above.
VEXO_API int VEXOLogInAnswer(const char* id, const char* address, const char* text, unsigned long size, VEXOLOGIN* out);
// Ends a conversation; nothing happens when there is none.
VEXO_API void VEXOLogInEnd(const char* id, const char* address);

// Whether a user of that name may log in, or stay so, as far as the account says: 0 for yes, else the reason
// VEXO_LOGIN_WRONG (unknown, or may not log in), VEXO_LOGIN_EXPIRED, VEXO_LOGIN_LOCKED (a password that was locked as
// `passwd -l` does it) or, where that could not be determined, VEXO_LOGIN_SERVICE.
VEXO_API int VEXOLogInAllowed(const char* user);
VEXO_END_C

#endif
