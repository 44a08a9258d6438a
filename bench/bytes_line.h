#pragma once

#include <fcntl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <string>
#include <utility>

#include "bench/bytes_cases.h"
#include "bench/support/event.h"

// What is measured of a serial line, written once for every peer.
//
//   line  a process writes bursts of 64 KiB into the far end of a pseudo terminal,
//         as fast as that takes them, and each burst is read before the next
//         begins; MB/s
//
// A lost or wrong byte ends the run without a figure.
namespace bench::bytes_cases {

inline constexpr std::size_t kBurst = 64 * 1024;
inline constexpr std::size_t kBursts = 1'000;
inline constexpr std::size_t kLinePiece = 4096;

// A pseudo terminal in raw mode. `far` is its other end.
struct Line {
    Line() {
        check(::grantpt(far), "grantpt");
        check(::unlockpt(far), "unlockpt");
        path = ::ptsname(far);
        const int near = check(::open(path.c_str(), O_RDWR | O_NOCTTY), "open");
        termios settings{};
        check(::tcgetattr(near, &settings), "tcgetattr");
        ::cfmakeraw(&settings);
        check(::tcsetattr(near, TCSANOW, &settings), "tcsetattr");
        keepsOpen = near;
    }
    Line(const Line&) = delete;
    Line& operator=(const Line&) = delete;
    ~Line() {
        ::close(keepsOpen);
        ::close(far);
    }

    int far = check(::posix_openpt(O_RDWR | O_NOCTTY), "posix_openpt");
    int keepsOpen = -1;
    std::string path;
};

inline void writeAll(int to, std::string_view bytes) {
    while (!bytes.empty()) {
        const auto written = ::write(to, bytes.data(), std::min(bytes.size(), kLinePiece));
        check(static_cast<int>(written), "write");
        bytes.remove_prefix(static_cast<std::size_t>(written));
    }
}

// Port: made from the path of the line; read(char*, std::size_t most) returns how
// many bytes it got, at least one.
template <class Port>
Case line() {
    return [](std::size_t) {
        const std::string burst = randomBytes(kBurst);
        const Line ends;
        auto& next = makeShared<Event>();
        const Child writer([&] {
            for (std::size_t i = 0; i < kBursts; ++i) {
                next.wait();
                writeAll(ends.far, burst);
            }
        });
        Port port(ends.path);
        std::string got(kBurst, 0);
        LapRecorder laps(kBursts / 10, kBursts - kBursts / 10);
        laps.start();
        do {
            next.signal();
            for (std::size_t count = 0; count < kBurst;)
                count += port.read(got.data() + count, kBurst - count);
            expect(std::exchange(got, std::string(kBurst, 0)) == burst);
        } while (laps.lap());
        result("megabyte_per_s",
               static_cast<double>(kBurst) * 1e3 / static_cast<double>(laps.percentile(50)));
    };
}

}  // namespace bench::bytes_cases
