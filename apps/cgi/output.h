// Text on its way to a descriptor, written in blocks: a reply of any length needs little memory.
#ifndef ORVEL_CGI_OUTPUT_H
#define ORVEL_CGI_OUTPUT_H

#include <string>
#include <string_view>

namespace orvel::cgi {

class Output {
 public:
    // `beginning` is called before anything is written.
    explicit Output(int fd, void (*beginning)() = nullptr) : fd_(fd), beginning_(beginning) {}
    Output(const Output&) = delete;
    Output& operator=(const Output&) = delete;

    // Where text is appended; call spill() between records.
    std::string& text() { return text_; }
    // Writes what is there once it fills a block.
    void spill();
    // Writes the rest. False when the reader went away; what was appended after that is dropped.
    bool finish();

 private:
    void write();
    int fd_;
    void (*beginning_)();
    bool broken_ = false;
    std::string text_;
};

}  // namespace orvel::cgi

#endif
