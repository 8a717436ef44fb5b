// The order in which people expect names: "file 2" before "file 10", letters as their language orders them.
#ifndef ORVEL_CGI_NATURAL_ORDER_H
#define ORVEL_CGI_NATURAL_ORDER_H

#include <string>
#include <string_view>

struct UCollator;

namespace orvel::cgi {

// What may stand in a request for a language ("de", "en-GB"); one that is not known counts as none.
[[nodiscard]] bool isLanguage(std::string_view text);

// Makes keys which compare byte by byte as the names do: numbers by their value, all else as a language orders it.
//
// A name of plain ASCII takes a short way where the language orders those as most do. That way must not be mixed with
// the other: the keys of both cannot be compared.
class NaturalOrder {
 public:
    explicit NaturalOrder(const std::string& language);
    ~NaturalOrder();
    NaturalOrder(const NaturalOrder&) = delete;
    NaturalOrder& operator=(const NaturalOrder&) = delete;

    [[nodiscard]] bool hasShortKey(std::string_view name) const;
    // Of a name that has one. Pure.
    static void appendShortKey(std::string_view name, std::string& out);
    // False when ICU cannot do it; names that are no UTF-8 have a key, too.
    [[nodiscard]] bool appendKey(std::string_view name, std::string& out);

 private:
    bool open();

    std::string language_;
    bool plain_;  // orders ASCII as most languages do
    UCollator* collator_ = nullptr;
};

// Reads what the orders of the page's languages need, for the children of a process that stays.
void warmNaturalOrder();

// A beginning of names as it is looked for: without case, whichever Unicode form it is written in.
class NameBeginning {
 public:
    explicit NameBeginning(std::string_view text);
    [[nodiscard]] bool begins(std::string_view name) const;

 private:
    std::string folded_;
};

}  // namespace orvel::cgi

#endif
