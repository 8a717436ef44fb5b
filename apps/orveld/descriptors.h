// Which descriptors this process holds.
#ifndef ORVEL_ORVELD_DESCRIPTORS_H
#define ORVEL_ORVELD_DESCRIPTORS_H

#include <string>
#include <vector>

namespace orvel::orveld {

// "number -> what it is" of each that is open and not among `named`; for an error message.
std::vector<std::string> otherDescriptors(const std::vector<int>& named);

}  // namespace orvel::orveld

#endif
