// Records of shares as the contract hands them out.
#ifndef VEXO_LINUX_SHARE_RECORD_H
#define VEXO_LINUX_SHARE_RECORD_H

#include <memory>
#include <string>

#include "base/owner.h"
#include "shares/share_options.h"
#include "vexo/share.h"

namespace vexo {

using ShareRecord = std::unique_ptr<VEXOSHARE, orvel::Releaser<VEXOShareFree>>;

// Fills `record`, whatever it held before; false with the slot filled when memory is out.
[[nodiscard]] bool fillShare(const ShareDefinition& share, const std::string& root, VEXOSHARE& record);

// A new record of the share `name`, for the user of this request. Null with the slot filled: 0x1400 missing, 0x8100
// the definitions cannot be read.
[[nodiscard]] ShareRecord loadShare(const char* name);

}  // namespace vexo

#endif
