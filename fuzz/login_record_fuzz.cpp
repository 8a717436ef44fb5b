// Any file of login records: the short cut reads what the long way reads, and what is written is read back.
#include "check.h"
#include "sharing/login_record.h"

namespace {

bool same(const orvel::LoginRecord& a, const orvel::LoginRecord& b) {
    return a.address == b.address && a.user == b.user && a.session == b.session && a.loginTime == b.loginTime &&
           a.accessTime == b.accessTime && a.position == b.position && a.neverExpires == b.neverExpires &&
           a.link == b.link;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    for (const std::size_t longest : {orvel::kLongestCheckedLine, orvel::kLongestLookedUpLine, std::size_t{20}}) {
        std::string_view text = fuzz::text(data, size), other = text;
        orvel::LoginRecord record, slow;
        while (orvel::nextLoginRecord(text, longest, record)) {
            fuzz::require(orvel::nextLoginRecordOfAnyForm(other, longest, slow));
            fuzz::require(same(record, slow) && text == other);
            static_cast<void>(orvel::isFresh(orvel::numberOf(record.accessTime), 1000, 900));
            std::string line;
            orvel::appendLoginRecord(record, line);
            if (line.size() > longest + 1) continue;
            std::string_view again = line;
            orvel::LoginRecord back;
            fuzz::require(orvel::nextLoginRecord(again, longest, back) && same(record, back));
        }
        fuzz::require(!orvel::nextLoginRecordOfAnyForm(other, longest, slow));
    }
    return 0;
}
