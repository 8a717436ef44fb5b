// Something to look at for the demo appliance.
#ifndef ORVEL_DEMO_PICTURE_H
#define ORVEL_DEMO_PICTURE_H

#include <string>

namespace orvel::demo {

// The bytes of a PNG file: hills under a sky, another light for each number.
std::string landscape(int number);

}  // namespace orvel::demo

#endif
