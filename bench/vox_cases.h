#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>
#include <utility>

#include "bench/support/clock.h"
#include "bench/support/process.h"

// What is measured of messages between two processes, the same for every peer.
//
//   round_trip_SIZE_one_core, _two_cores
//       a request and its reply that carries the same content back, one at a
//       time; both processes on one processor, or one on each
//   one_way_SIZE
//       one process sends messages as fast as it can, the other counts them and
//       answers the last; until that answer came; the scheduler places both
//
// SIZE small: a dictionary of the four strings below (peers without structure:
// a blob as long as our frame of it). SIZE large: the same with 64 KiB of data
// in place of the last string.
namespace bench::vox_cases {

inline constexpr std::array<std::pair<const char*, const char*>, 4> kEntries{{
    {"o", "set"},
    {"a", "bench.client"},
    {"r", "/radio/signal"},
    {"v", "a value of thirty-two characters"},
}};
inline constexpr std::size_t kLargeBytes = 64 * 1024;
// Our frame: a header of 24 bytes, one for the map, two a key, one or two more
// a string.
inline constexpr std::size_t kSmallFrame =
    24 + 1 + 4 * 2 + (1 + 3) + (1 + 12) + (1 + 13) + (2 + 32);
inline constexpr std::size_t kLargeFrame = kSmallFrame - (2 + 32) + (5 + kLargeBytes);

struct Case {
    bool roundTrip = true;
    bool large = false;
    bool oneCore = true;
    std::string variant;  // what follows the case's name, for peers that have some

    [[nodiscard]] std::size_t frameBytes() const { return large ? kLargeFrame : kSmallFrame; }
    // Messages of a one-way case.
    [[nodiscard]] std::uint64_t messages() const { return large ? 20'000 : 1'000'000; }
    [[nodiscard]] LapRecorder recorder() const {
        return large ? LapRecorder(500, 10'000) : LapRecorder(2'000, 50'000);
    }
    // To be called first thing by each process.
    void place(bool server) const {
        if (roundTrip)
            pinTo(oneCore || server ? 1 : 0);
    }
};

inline Case parse(int argc, char** argv) {
    std::string_view left = argc == 2 ? argv[1] : "";
    const auto take = [&left](std::string_view word) {
        const bool there = left.starts_with(word);
        if (there)
            left.remove_prefix(word.size());
        return there;
    };
    Case made;
    made.roundTrip = take("round_trip_");
    if (!made.roundTrip && !take("one_way_"))
        fail("unknown case");
    made.large = take("large");
    if (!made.large && !take("small"))
        fail("unknown case");
    if (made.roundTrip) {
        made.oneCore = take("_one_core");
        if (!made.oneCore && !take("_two_cores"))
            fail("unknown case");
    }
    made.variant = left;
    return made;
}

inline void reportRoundTrips(LapRecorder& laps) {
    result("p50_us", static_cast<double>(laps.percentile(50)) * 1e-3);
    result("p99_us", static_cast<double>(laps.percentile(99)) * 1e-3);
}

inline void reportOneWay(const Case& measured, std::int64_t nanoseconds) {
    const auto messages = static_cast<double>(measured.messages());
    const auto taken = static_cast<double>(nanoseconds);
    if (measured.large)
        result("gigabyte_per_s", messages * static_cast<double>(kLargeBytes) / taken);
    else
        result("million_per_s", messages / taken * 1e3);
}

// For peers with a blocking call: `roundTrip` makes one.
template <class RoundTrip>
void measureRoundTrips(const Case& measured, RoundTrip roundTrip) {
    LapRecorder laps = measured.recorder();
    laps.start();
    do
        roundTrip();
    while (laps.lap());
    reportRoundTrips(laps);
}

// `send` sends one message; `finish` returns when the receiver has all.
template <class Send, class Finish>
void measureOneWay(const Case& measured, Send send, Finish finish) {
    const std::int64_t start = nowNs();
    for (std::uint64_t n = 0; n < measured.messages(); ++n)
        send();
    finish();
    reportOneWay(measured, nowNs() - start);
}

}  // namespace bench::vox_cases
