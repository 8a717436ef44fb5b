// Something to look at for the demo appliance.
#ifndef ORVEL_ORVELCTL_DEMO_PICTURE_H
#define ORVEL_ORVELCTL_DEMO_PICTURE_H

#include <string>

namespace orvel::ctl::appliance {

// The bytes of a PNG file: hills under a sky, another light for each number.
std::string landscape(int number);

}  // namespace orvel::ctl::appliance

#endif
