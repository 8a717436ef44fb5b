// One line of the transfer log, docs/formats/xferlog.md. Pure.
#ifndef VEXO_LINUX_TRANSFER_ENTRY_H
#define VEXO_LINUX_TRANSFER_ENTRY_H

#include <ctime>
#include <string>
#include <string_view>

namespace vexo {

struct TransferEntry {
    time_t time;
    std::string_view address;
    std::string_view user;
    std::string_view action;
    long long size;
    std::string_view path;
    bool flag;
};

// The line, its newline included.
[[nodiscard]] std::string buildTransferEntry(const TransferEntry& entry);

}  // namespace vexo

#endif
