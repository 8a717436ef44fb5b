// Uploads of visitors that are under way: how many there may be at once.
#ifndef VEXO_LINK_SEAT_H
#define VEXO_LINK_SEAT_H

#include <cstdint>
#include <string>

#include "vexo/export.h"

namespace VEXO {

inline constexpr int kSeats = 64;          // on the machine
inline constexpr int kSeatsOfLink = 8;     // of one link
inline constexpr int kSeatsOfAddress = 4;  // of one address

// A seat of the 64 that there are, in /run/vexo/sending below the system root, a file of fixed size that is root's. It
// is held by a lock of the kernel's, and free when the object or its process ends, however that ends.
class VEXO_API LinkSeat {
 public:
    enum class Taking { kTaken, kNone, kFailed };
    // What the others who have a seat of this link are sending.
    struct Others {
        std::int64_t files = 0, bytes = 0;
    };

    LinkSeat() = default;
    ~LinkSeat();
    LinkSeat(const LinkSeat&) = delete;
    LinkSeat& operator=(const LinkSeat&) = delete;

    // Takes one, for so many bytes. kNone: as many are taken as may be; kFailed with errno.
    [[nodiscard]] Taking take(const std::string& link, const std::string& address, std::int64_t bytes, Others& others);
    // Frees it before the end.
    void leave();

 private:
    int file_ = -1;
};

}  // namespace VEXO

#endif
