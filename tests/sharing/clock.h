// The clock of sessions in tests: the uptime stands where the test puts it, and a pause moves it instead of waiting.
#ifndef ORVEL_TESTS_SHARING_CLOCK_H
#define ORVEL_TESTS_SHARING_CLOCK_H

namespace support {

inline long uptime = 100000;       // what sysinfo tells; negative: it fails
inline unsigned secondsSlept = 0;  // by sleep

}  // namespace support

#endif
