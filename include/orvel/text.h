// Text and path helpers: wildcard comparison, replacement, splitting, common parent, extension, readable sizes.
//
// None keeps state between calls or sets the library error code; only the two replace functions log. Texts are bytes
// unless said otherwise. Arguments may not be null unless said otherwise.
#ifndef ORVEL_TEXT_H
#define ORVEL_TEXT_H

#include <string>
#include <vector>

#include "orvel/export.h"

// Replaces every byte A to Z in place by its lower-case letter, whatever the locale. 0; -1 for null.
ORVEL_API int OrvLibStringToLower(char* text);

// Writes a new text into `*out`, which the caller frees with `free`. 1 when `search` occurs in `source`; 0 when it does
// not, `*out` is a copy then; -1, with `*out` untouched, when an argument is null, a text is empty (an empty
// replacement too) or memory runs out (logged).
//
// Not a replacement in the usual sense, and kept, since the name criterion of the search relies on it: each step puts
// the replacement and what follows the occurrence behind the whole text so far, and goes on behind the occurrence's
// position plus the replacement's length. The result is cut to the length that the replaced text would have, but never
// below that of `source`. So with a replacement no longer than `search`, the result equals `source`.
ORVEL_API int OrvLibStrReplace(const char* source, const char* search, const char* replacement, char** out);

// Replaces two texts in one pass; results, `*out` and log as above, 1 when either occurs. Kept for existing callers
// with two properties that make it unfit for new ones (the library itself does not call it):
//  - it only moves across occurrences: where a text holds one but also anything else in front of, between or behind
//    occurrences, the scan cannot advance; that gives -1;
//  - the texts pass through a formatter: "%%" becomes "%", in the source at first and in the text so far at each step.
//    Any other "%" stays as it is, since no arguments stand behind it.
ORVEL_API int OrvLibTwoStrReplace(const char* source, const char* search1, const char* replacement1,
                                  const char* search2, const char* replacement2, char** out);

// Compares the whole of `text` with a pattern, both UTF-8, without case (simple case folding of each code point): "*"
// is any run of characters, "?" one character, and `escape`, a code point (92 is the backslash), makes the character
// behind it literal. 1 match; 0 none, and for a null argument. Behind a "*" the rest of the pattern is never compared
// with the empty remainder of the text. Broken UTF-8 is compared as decoded without validation; nothing is read behind
// the end. Costs at most pattern length x text length.
ORVEL_API int OrvLibStrLikeCompare(const char* pattern, const char* text, int escape);

// The bytes that the pairs of hexadecimal digits stand for, up to the first zero byte. A trailing odd character is
// ignored; a pair counts as far as `strtol` reads it (nothing readable is a zero byte). "" when memory runs out.
ORVEL_API std::string OrvLibHex2Bin(const std::string& hex);

// Cuts `text` at each `delimiter` and hands the pieces to `callback`, with `argument`, in order: empty ones too, except
// the one in front of a delimiter at the very start. Without a delimiter in it (a null or empty one does not occur) the
// callback gets `text` itself and may change it, else copies. An empty text has no pieces. A piece is never null.
ORVEL_API void StringExplode(std::string& text, const char* delimiter, void (*callback)(std::string& piece, long),
                             long argument);

// The same pieces, appended to `out`, which is not cleared.
ORVEL_API void StringExplode(std::vector<std::string>& out, const std::string& text, const char* delimiter);

// Puts the last path component (what follows the last "/") of each of these pieces into `out`, with `separator` between
// them (null counts as ""). An empty text leaves `out` as it is.
ORVEL_API void StringExplodeToFileNameString(std::string& out, std::string text, const char* delimiter,
                                             const char* separator);

// The longest folder that all `paths` have in common, ending in "/"; each path counts as a folder itself. Without a
// common "/", the characters that they have in common; "" for an empty list.
ORVEL_API std::string FindCommonParent(std::vector<std::string> paths);

// The extension inside `name`, behind its last dot, as a pointer into `name`. Null for none: no dot behind the first
// character, nothing behind the dot, or a null name. In a name longer than a `limit` of 2 or more (bytes), only dots up
// to the index `limit` count, from the front of the name (kept: callers rely on it).
ORVEL_API const char* ReturnFileExt(const char* name, unsigned limit);

// Writes a readable size into `buffer` of `bufferSize` bytes, cut to it: "1023 Bytes", "1 KB", and with `twoDecimals`
// " 1.00 KB"; units up to GB. 1; 0, with nothing written, for a null or empty buffer or a size of 0 or less.
ORVEL_API int FileUnitGet(long long size, char* buffer, int bufferSize, bool twoDecimals);

#endif
