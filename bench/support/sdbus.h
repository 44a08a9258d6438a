#pragma once

#include <systemd/sd-bus.h>

#include <cerrno>

#include "bench/support/process.h"

// What benchmarks of sd-bus share.
namespace bench::sdbus {

// sd-bus returns negative error numbers: fails then.
inline int succeed(int result, const char* what) {
    if (result < 0) {
        errno = -result;
        fail(what);
    }
    return result;
}

// Handles what comes until the connection ends.
inline void serve(sd_bus* bus) {
    for (;;) {
        const int handled = ::sd_bus_process(bus, nullptr);
        if (handled < 0)
            return;
        if (handled == 0)
            ::sd_bus_wait(bus, UINT64_MAX);
    }
}

}  // namespace bench::sdbus
