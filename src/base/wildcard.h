// The wildcard comparison of file names: one matcher for the library and for the platform's file index. Depends on ICU
// alone, since both sides compile it.
#ifndef ORVEL_BASE_WILDCARD_H
#define ORVEL_BASE_WILDCARD_H

#include <unicode/utypes.h>

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace orvel {

// A pattern, compiled once and compared with any number of names, without case (simple case folding).
//
// "*" stands for any run of characters, "?" for one; the character behind the escape character is literal. An escape
// character at the very end of the pattern stands for nothing. Behind a "*", whatever else the pattern holds is never
// compared with an empty remainder of the name, so "*" and a final escape character match no name at all.
//
// Characters are UTF-8 without validation: a lead byte 0xC0 to 0xF4 takes 1 to 3 bytes behind it as they are, trail
// bytes that the end of the text cuts off count as zero bits, and any other byte is a character by itself. So names
// that are no UTF-8 have a defined answer, and nothing behind the end is read. An over-long form is the character that
// it encodes, also where that is "*", "?" or the escape character.
class Wildcard {
 public:
    // `escape` is a code point; a negative one escapes nothing.
    Wildcard(std::string_view pattern, int escape);

    // Whether the whole of `text` fits. Costs at most pattern length x text length, without recursion or allocation.
    [[nodiscard]] bool match(std::string_view text) const;

    // The stretches of literal characters between the wildcards, in the form of appendComparable. A name that fits the
    // pattern holds each of them in that form.
    [[nodiscard]] std::vector<std::string> literals() const;

 private:
    // An element of the compiled pattern: a folded code point, or one of these, which are negative.
    enum : UChar32 { kAny = -1, kRun = -2 };

    std::size_t compileRun(std::string_view pattern, std::size_t at);

    std::vector<UChar32> elements_;
    bool matchesNothing_ = false;
};

// Appends `text` as the comparison sees it: each character folded, as well-formed UTF-8 without NUL. Equal characters
// give equal text; those that have no such form all give U+FFFD.
void appendComparable(std::string_view text, std::string& out);

}  // namespace orvel

#endif
