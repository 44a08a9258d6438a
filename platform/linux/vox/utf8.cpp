#include <cstring>

#include "platform/linux/vox/codec.h"

// Well-formed UTF-8 after RFC 3629, table 3-7 of the Unicode standard:
//
//   00..7F
//   C2..DF 80..BF
//   E0 A0..BF 80..BF | E1..EC 80..BF 80..BF | ED 80..9F 80..BF | EE..EF 80..BF 80..BF
//   F0 90..BF 80..BF 80..BF | F1..F3 80..BF 80..BF 80..BF | F4 80..8F 80..BF 80..BF
namespace vox_wire {
namespace {

constexpr std::uint64_t kHighBits = 0x8080808080808080;

std::uint64_t load(const std::uint8_t* bytes) noexcept {
    std::uint64_t word;
    std::memcpy(&word, bytes, sizeof word);
    return word;
}

// The first byte at or after `at` that may not be ASCII; ASCII itself when fewer
// than eight bytes are left.
const std::uint8_t* skip_ascii(const std::uint8_t* at, const std::uint8_t* end) noexcept {
    while (end - at >= 32) {
        if ((load(at) | load(at + 8) | load(at + 16) | load(at + 24)) & kHighBits)
            break;
        at += 32;
    }
    while (end - at >= 8 && !(load(at) & kHighBits))
        at += 8;
    return at;
}

bool is_in(std::uint8_t byte, std::uint8_t low, std::uint8_t high) noexcept {
    return byte >= low && byte <= high;
}

// The length of the well-formed sequence of several bytes at `at`; 0 for none.
int sequence_length(const std::uint8_t* at, const std::uint8_t* end) noexcept {
    const std::uint8_t lead = *at;
    const int length = lead < 0xe0 ? 2 : lead < 0xf0 ? 3 : 4;
    if (!is_in(lead, 0xc2, 0xf4) || end - at < length)
        return 0;
    const std::uint8_t low = lead == 0xe0 ? 0xa0 : lead == 0xf0 ? 0x90 : 0x80;
    const std::uint8_t high = lead == 0xed ? 0x9f : lead == 0xf4 ? 0x8f : 0xbf;
    if (!is_in(at[1], low, high))
        return 0;
    for (int i = 2; i < length; i++)
        if (!is_in(at[i], 0x80, 0xbf))
            return 0;
    return length;
}

}  // namespace

// Hot path: bench/vox_cases.h.
bool is_utf8(std::span<const std::uint8_t> text) noexcept {
    const std::uint8_t* at = text.data();
    const std::uint8_t* const end = at + text.size();
    while (true) {
        at = skip_ascii(at, end);
        while (at != end && *at < 0x80)
            at++;
        if (at == end)
            return true;
        // Text that is not ASCII is mostly not ASCII for a while.
        while (at != end && *at >= 0x80) {
            const int length = sequence_length(at, end);
            if (length == 0)
                return false;
            at += length;
        }
    }
}

}  // namespace vox_wire
