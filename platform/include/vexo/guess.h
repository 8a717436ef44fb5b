// Passwords that anybody may guess at: whose guess is judged when.
#ifndef VEXO_GUESS_H
#define VEXO_GUESS_H

#include "vexo/export.h"

// Guesses are counted for each pair of what is guessed at (a text, such as the identifier of a public link) and client
// address, an IPv6 address by its first 64 bits; text that is not an address counts as one address of its own. For one
// `what` at most five guesses a second are judged, in the order in which the addresses came, and each address holds one
// place in that order at a time. An address is judged at most once a second, at one `what` after its n-th wrong guess
// only 2, 4, 8 ... 60 seconds later; wrong guesses are forgotten after ten quiet minutes, never by a log-in elsewhere.
// On the whole machine two guesses are judged at once. Nobody waits in these calls.
//
// The state is one file of fixed size, /run/vexo/guesses below the system root, which belongs to root; every operation
// reaches it as root in a process that may become root, under a kernel lock held for microseconds. It ends with the
// machine's run.
//
// -1 sets errno and the slot: 0x0D00 a null or an empty `what`, 0x0300 a file that is not trusted, 0x2900 no space,
// 0x8100 else.
typedef struct VEXOGUESS {
    int wait;       // milliseconds until it is worth asking again
    char turn[33];  // the place in the order, to be given back when asking again; "" while there is none
    int seat;       // of the judging that has begun, -1 for none
} VEXOGUESS;

VEXO_BEGIN_C
// Asks whether a guess may be judged now. `turn` is what an earlier answer gave, null or "" for none; `known` not 0:
// the guesser has shown that an earlier guess was right (VEXOGuessSeal), and passes by the order. 1: judge it, then
// call VEXOGuessEnd, which must come soon; it counts as wrong until then. 0: not now; `guess` says when. A turn is good
// for five seconds from its time on, and only with the address that it was given to.
VEXO_API int VEXOGuessBegin(const char* what, const char* address, const char* turn, int known, VEXOGUESS* guess);
// Ends a judging. `right` not 0: the guess no longer counts, and a log-in is counted, of which one `what` has at most
// 64 in a minute. 1; 0, with `wait`, for a right guess beyond them: nobody is judged at this `what` until then.
VEXO_API int VEXOGuessEnd(const char* what, const char* address, int right, VEXOGUESS* guess);
// Counts one wrong guess that was recognised without being judged. 0, or -1.
VEXO_API int VEXOGuessWrong(const char* what, const char* address);
// 32 hexadecimal digits and a NUL into `seal` that only this machine, and only until it restarts, can make of `text`.
// 0, or -1 with "" there.
VEXO_API int VEXOGuessSeal(const char* text, char* seal);
VEXO_END_C

#endif
