#pragma once

#include <string>

// In place of the C library's calls: the device behind every /dev/uart.NAME, and what
// a driver and the system could do.
namespace plr::test::device {

inline std::string path;            // what open() opens for /dev/uart.NAME
inline std::string asked;           // the name that it was asked for
inline unsigned baudPercent = 100;  // of the rate that was set, the driver takes this
inline int (*unsent)() = nullptr;   // in place of TIOCOUTQ
inline int discarded = 0;           // calls of tcflush() for output
inline int threadsLeft = -1;        // how many can still be made; negative for any number

}  // namespace plr::test::device
