// Reader of multipart/form-data bodies, as a stream: memory stays flat whatever the size of a part.
#ifndef ORVEL_CGI_MULTIPART_H
#define ORVEL_CGI_MULTIPART_H

#include <cstddef>
#include <string>
#include <string_view>

namespace orvel::cgi {

// What a part says of itself. Names are bytes as sent.
struct PartHeader {
    std::string name;      // of the form field
    bool isFile = false;   // a file name was given, even an empty one
    std::string fileName;  // its last component
};

// Takes the parts in the order of the body. A false answer stops the reading.
class PartSink {
 public:
    virtual ~PartSink() = default;
    virtual bool partBegin(const PartHeader& header) = 0;
    virtual bool partData(std::string_view data) = 0;
    virtual bool partEnd() = 0;
};

class MultipartReader {
 public:
    enum class Status { kMore, kDone, kMalformed, kStopped };

    // `boundary` as the content type states it; `sink` must outlive the reader.
    MultipartReader(std::string_view boundary, PartSink& sink);

    // Takes the next bytes of the body. Once the answer is not kMore further bytes are ignored.
    Status feed(std::string_view bytes);
    [[nodiscard]] Status status() const { return status_; }

 private:
    enum class State { kPreamble, kDelimiterEnd, kHeaders, kBody };

    bool step();
    bool afterDelimiter();
    bool readHeaders();
    bool readBody();
    bool end(Status status);

    std::string delimiter_;
    PartSink& sink_;
    std::string buffer_;
    State state_ = State::kPreamble;
    Status status_ = Status::kMore;
    int parts_ = 0;
    std::size_t skip_ = 0;  // bytes of the line end before a body that are still in the buffer
};

// The boundary of a content type "multipart/form-data; boundary=..."; empty if the type is different, or no boundary of
// 1 to 70 bytes is given.
std::string boundaryOf(std::string_view contentType);

// Reads the header lines of one part (without the empty line that ends them). False when they name no form field.
bool parsePartHeader(std::string_view lines, PartHeader& header);

}  // namespace orvel::cgi

#endif
