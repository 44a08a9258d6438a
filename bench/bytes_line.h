#pragma once

#include <fcntl.h>
#include <termios.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>
#include <string_view>

#include "bench/bytes_cases.h"
#include "bench/support/event.h"

// What is measured of a serial line, written once for every peer.
//
//   line 0  a process writes bursts of 128 KiB into the far end of a pseudo
//           terminal, as fast as that takes them, and each burst is read before the
//           next begins; MB/s
//   line 1  the same by a reader who checks what comes: FCS-16 of each piece that it
//           got (RFC 1662), before it asks for the next
//
// A lost or wrong byte ends the run without a figure.
namespace bench::bytes_cases {

inline constexpr std::size_t kBurst = 128 * 1024;
inline constexpr std::size_t kBursts = 500;
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

// RFC 1662, appendix C.2.
inline std::uint16_t fcs16(std::uint16_t fcs, std::string_view bytes) {
    static constexpr auto kTable = [] {
        std::array<std::uint16_t, 256> table{};
        for (std::uint16_t byte = 0; byte < 256; ++byte) {
            unsigned value = byte;
            for (int bit = 0; bit < 8; ++bit)
                value = (value & 1) != 0 ? value >> 1 ^ 0x8408 : value >> 1;
            table[byte] = static_cast<std::uint16_t>(value);
        }
        return table;
    }();
    for (const char byte : bytes)
        fcs = static_cast<std::uint16_t>(fcs >> 8 ^ kTable[(fcs ^ byte) & 0xFF]);
    return fcs;
}

// Port: made from the path of the line; read(char*, std::size_t most) returns how
// many bytes it got, at least one.
template <class Port>
Case line() {
    return [](std::size_t checks) {
        const std::string burst = randomBytes(kBurst);
        const Line ends;
        auto& next = makeShared<Event>();
        const Child writer([&] {
            for (std::size_t i = 0; i < kBursts; ++i) {
                next.wait();
                writeAll(ends.far, burst);
            }
        });
        const std::uint16_t right = fcs16(0xFFFF, burst);
        Port port(ends.path);
        std::string got(kBurst, 0);
        LapRecorder laps(kBursts / 10, kBursts - kBursts / 10);
        laps.start();
        do {
            next.signal();
            std::uint16_t fcs = 0xFFFF;
            for (std::size_t count = 0; count < kBurst;) {
                const std::size_t piece = port.read(got.data() + count, kBurst - count);
                if (checks != 0)
                    fcs = fcs16(fcs, {got.data() + count, piece});
                count += piece;
            }
            expect(got == burst && (checks == 0 || fcs == right));
            std::fill(got.begin(), got.end(), '\0');
        } while (laps.lap());
        result("megabyte_per_s",
               static_cast<double>(kBurst) * 1e3 / static_cast<double>(laps.percentile(50)));
    };
}

}  // namespace bench::bytes_cases
