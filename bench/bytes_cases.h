#pragma once

#include <algorithm>
#include <cctype>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "bench/support/clock.h"
#include "bench/support/process.h"

// What is measured of bytes in memory, written once for every peer; a peer gives
// the functions that do the work. Every result is compared with one made here in
// the simplest way, and a wrong one ends the run without a figure.
//
//   to_hex N    hex text of N bytes; GB/s of bytes
//   from_hex N  back again; GB/s of bytes, too
//   ring N      N bytes into a ring of 64 KiB, half full, and N bytes out of it;
//               ns for both
//   dump        4 KiB in lines of 32 bytes; ns a line
//
// The figure is that of the median lap; a lap takes about a millisecond.
namespace bench::bytes_cases {

inline constexpr std::size_t kLapBytes = 1 << 20;
inline constexpr std::size_t kRing = 64 * 1024;
// Nothing that is put in or taken out fits the storage's end, as in real life.
inline constexpr std::size_t kRingFilled = kRing / 2 + 5;
inline constexpr std::size_t kDumped = 4096;
inline constexpr std::size_t kDumpLine = 32;

// As if somebody else read and changed what `memory` points to.
inline void touch(void* memory) noexcept {
    asm volatile("" : : "g"(memory) : "memory");
}

inline std::string randomBytes(std::size_t count) {
    std::string bytes;
    std::uint64_t state = 42;
    for (; bytes.size() < count; state = state * 6364136223846793005u + 1442695040888963407u)
        bytes.push_back(static_cast<char>(state >> 56));
    return bytes;
}

inline std::uint8_t* data(std::string& bytes) noexcept {
    return reinterpret_cast<std::uint8_t*>(bytes.data());
}

// In the case that the peer has.
inline std::string hexText(const std::string& bytes, bool upperCase) {
    std::string text;
    for (const char byte : bytes) {
        char digits[3];
        std::snprintf(digits, sizeof digits, upperCase ? "%02X" : "%02x",
                      static_cast<std::uint8_t>(byte));
        text += digits;
    }
    return text;
}

inline void expect(bool right) {
    if (!right)
        fail("a wrong result");
}

// Nanoseconds that one of many calls of `work`, each for so many bytes, takes.
template <class Work>
double nanosecondsEach(std::size_t bytes, Work work) {
    const std::size_t calls = std::max<std::size_t>(1, kLapBytes / bytes);
    LapRecorder laps(20, 200);
    laps.start();
    do {
        for (std::size_t i = 0; i < calls; ++i)
            work();
    } while (laps.lap());
    return static_cast<double>(laps.percentile(50)) / static_cast<double>(calls);
}

using Case = std::function<void(std::size_t size)>;

// encode(char* out, std::size_t size, const std::uint8_t* data, std::size_t bytes):
// the text and a NUL, in a buffer of 2 * bytes + 1.
template <class Encode>
Case toHex(Encode encode, bool upperCase = false) {
    return [encode, upperCase](std::size_t bytes) {
        std::string binary = randomBytes(bytes);
        std::string text(2 * bytes, 0);
        const double each = nanosecondsEach(bytes, [&] {
            touch(binary.data());
            encode(text.data(), text.size() + 1, data(binary), bytes);
            touch(text.data());
        });
        expect(text == hexText(binary, upperCase));
        result("gigabyte_per_s", static_cast<double>(bytes) / each);
    };
}

// decode(std::uint8_t* out, std::size_t bytes, const char* text, std::size_t length)
template <class Decode>
Case fromHex(Decode decode) {
    return [decode](std::size_t bytes) {
        const std::string binary = randomBytes(bytes);
        std::string text = hexText(binary, false);
        std::string back(bytes, 0);
        const double each = nanosecondsEach(bytes, [&] {
            touch(text.data());
            decode(data(back), bytes, text.data(), text.size());
            touch(back.data());
        });
        expect(back == binary);
        result("gigabyte_per_s", static_cast<double>(bytes) / each);
    };
}

// Ring: made from its capacity; insert(const char*, std::size_t) and
// extract(char*, std::size_t) of what is known to fit and to be there.
template <class Ring>
Case ring() {
    return [](std::size_t piece) {
        std::string in = randomBytes(piece);
        std::string out(piece, 0);
        Ring ring(kRing);
        const std::size_t odd = kRingFilled % piece;
        ring.insert(in.data() + piece - odd, odd);
        for (std::size_t i = 0; i < kRingFilled / piece; ++i)
            ring.insert(in.data(), piece);
        const double each = nanosecondsEach(piece, [&] {
            touch(in.data());
            ring.insert(in.data(), piece);
            ring.extract(out.data(), piece);
            touch(out.data());
        });
        expect(out == in.substr(piece - odd) + in.substr(0, piece - odd));
        result("ns", each);
    };
}

// The dump by snprintf, which is also what others are compared with.
inline std::size_t dumpBySnprintf(char* out, std::size_t size, const std::uint8_t* data,
                                  std::size_t bytes) {
    char* to = out;
    char* const end = out + size;
    const auto room = [&] { return static_cast<std::size_t>(end - to); };
    for (std::size_t begin = 0; begin < bytes; begin += kDumpLine) {
        to += std::snprintf(to, room(), "%04zx  ", begin);
        for (std::size_t i = begin; i < begin + kDumpLine; ++i)
            to += std::snprintf(to, room(), "%02X ", data[i]);
        to += std::snprintf(to, room(), "   ");
        for (std::size_t i = begin; i < begin + kDumpLine; ++i)
            *to++ = data[i] >= 0x20 && data[i] <= 0x7E ? static_cast<char>(data[i]) : '.';
        to += std::snprintf(to, room(), "\n");
    }
    return static_cast<std::size_t>(to - out);
}

// print(char* out, std::size_t size, const std::uint8_t* data, std::size_t bytes)
// returns the characters of the text.
template <class Print>
Case dump(Print print) {
    return [print](std::size_t) {
        std::string binary = randomBytes(kDumped);
        std::vector<char> text(kDumped * 5);
        std::vector<char> expected(text.size());
        std::size_t count = 0;
        const double each = nanosecondsEach(kDumped, [&] {
            touch(binary.data());
            count = print(text.data(), text.size(), data(binary), kDumped);
            touch(text.data());
        });
        expect(count == dumpBySnprintf(expected.data(), expected.size(), data(binary), kDumped) &&
               text == expected);
        result("ns", each * static_cast<double>(kDumpLine) / static_cast<double>(kDumped));
    };
}

// Runs the case that the command line names, with the size that follows.
inline int run(int argc, char** argv, const std::map<std::string_view, Case>& cases) {
    const auto found = cases.find(argc > 1 ? argv[1] : "");
    if (found == cases.end()) {
        std::fprintf(stderr, "unknown case\n");
        return 2;
    }
    found->second(argc > 2 ? std::strtoul(argv[2], nullptr, 10) : 0);
    return 0;
}

}  // namespace bench::bytes_cases
