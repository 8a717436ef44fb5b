// Any Host header and any address: bounded, nothing of a path, and one spelling of an address.
#include "check.h"
#include "util/host_header.h"
#include "web/auto_block_rules.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string input(fuzz::text(data, size));
    const orvel::HostAndPort parts = orvel::splitHostHeader(input.c_str());
    fuzz::require(parts.host.size() <= 4095 && parts.port.size() <= 4095);
    // Between brackets, and behind one that is not closed, the text is taken as it stands.
    fuzz::require((input.starts_with('[') ? parts.port : parts.host + parts.port).find('/') == std::string::npos);
    if (const auto address = vexo::normaliseAddress(input.c_str()))
        fuzz::require(vexo::normaliseAddress(address->c_str()) == address && address->size() < 46);
    const vexo::AutoBlockRules rules = vexo::parseAutoBlockRules("yes", input, input, input);
    fuzz::require(rules.window >= 0 && rules.duration >= 0);
    return 0;
}
