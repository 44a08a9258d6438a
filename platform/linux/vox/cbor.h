#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

// The wire form of a value, CBOR (RFC 8949) with every length definite and every
// head in its shortest form, so that one value has one encoding:
//
//   value      = null | bool | int64 | uint64 | double | date | data | string
//              | uuid | array | dictionary | error | fd | endpoint
//   null       = F6              bool = F4 (false) | F5 (true)
//   int64      = major 0 or 1, within int64
//   uint64     = tag 'voxu', major 0
//   double     = FB, 8 bytes     date = tag 'voxt', int64 (ns since 1970)
//   data       = major 2         string = major 3 (UTF-8)
//   uuid       = tag 37, major 2 of 16 bytes
//   array      = major 4 count, value*
//   dictionary = major 5 count, (string without NUL, value)*   no key twice
//   error      = tag 'voxe', array of 1 or 2: int64 code, string description
//   fd         = tag 'voxf', index       endpoint = tag 'voxp', index
//   index      = major 0: the descriptor's place in the frame; they come in order
namespace vox_wire {

enum class major : std::uint8_t {
    unsigned_int = 0,
    negative_int = 1,
    bytes = 2,
    text = 3,
    array = 4,
    map = 5,
    tag = 6,
    simple = 7,
};

inline constexpr std::uint8_t kByteFalse = 0xf4;
inline constexpr std::uint8_t kByteTrue = 0xf5;
inline constexpr std::uint8_t kByteNull = 0xf6;
inline constexpr std::uint8_t kByteDouble = 0xfb;

inline constexpr std::uint64_t kTagUuid = 37;
inline constexpr std::uint64_t kTagUint64 = 0x766f7875;    // "voxu"
inline constexpr std::uint64_t kTagDate = 0x766f7874;      // "voxt"
inline constexpr std::uint64_t kTagError = 0x766f7865;     // "voxe"
inline constexpr std::uint64_t kTagFd = 0x766f7866;        // "voxf"
inline constexpr std::uint64_t kTagEndpoint = 0x766f7870;  // "voxp"

inline constexpr std::size_t kUuidBytes = 16;
inline constexpr std::size_t kMostHeadBytes = 9;
inline constexpr unsigned kMostDepth = 64;
inline constexpr unsigned kMostDescriptors = 64;

inline std::uint64_t to_big_endian(std::uint64_t value) noexcept {
    return __builtin_bswap64(value);
}
static_assert(__BYTE_ORDER__ == __ORDER_LITTLE_ENDIAN__);

// Writes the shortest head of `kind` and `argument` at `at`, where
// kMostHeadBytes are free; returns its end.
inline std::uint8_t* put_head(std::uint8_t* at, major kind, std::uint64_t argument) noexcept {
    const auto top = static_cast<std::uint8_t>(static_cast<unsigned>(kind) << 5);
    if (argument < 24) {
        *at = static_cast<std::uint8_t>(top | argument);
        return at + 1;
    }
    const unsigned step = argument <= 0xff         ? 0
                          : argument <= 0xffff     ? 1
                          : argument <= 0xffffffff ? 2
                                                   : 3;
    const unsigned bytes = 1u << step;
    *at = static_cast<std::uint8_t>(top | (24 + step));
    const std::uint64_t wire = to_big_endian(argument << (64 - 8 * bytes));
    std::memcpy(at + 1, &wire, sizeof wire);
    return at + 1 + bytes;
}

}  // namespace vox_wire
