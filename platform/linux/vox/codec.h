#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

#include "platform/linux/vox/byte_buffer.h"
#include "vox/value.h"

// The value codec: one Vox value as one CBOR item (RFC 8949), both ways.
// docs/wire-protocol.md has the mapping, cbor.h its grammar.
//
// One value has one encoding: what decode() accepts is what encode() gives.
// Neither recurses. Any thread.
struct vox_custom_object;

namespace vox_wire {

// Bytes that were encoded and the descriptors that travel beside them.
struct encoded {
    byte_buffer bytes;  // appended to
    // Descriptors in the order of their indexes. Each is a duplicate that the
    // receiver of this struct owns and closes.
    std::vector<int> descriptors;
};

struct codec_limits {
    std::size_t bytes = 16u << 20;
    unsigned depth = 64;        // nested arrays and dictionaries; 64 at most
    unsigned descriptors = 64;  // 64 at most

    // Elements of all arrays and dictionaries together. A value takes up to 72
    // bytes of memory and perhaps a single one on the wire: this keeps a message
    // of 16 MiB from becoming more than a gigabyte.
    [[nodiscard]] constexpr std::size_t elements() const noexcept {
        return bytes / 8 > 4096 ? bytes / 8 : 4096;
    }
};

// Appends `value` to `out.bytes`. Returns 0, or an error number with `out` as
// it was before: EMSGSIZE over a limit, EILSEQ text that is not UTF-8, EINVAL a
// value that cannot travel (a connection), EMFILE and the like from dup().
[[nodiscard]] int encode(vox_object_t value, const codec_limits& limits, encoded& out);

// Decodes the one item that fills `bytes` exactly. Takes ownership of all
// `descriptors`: the item names each of them once and in order, and they become
// values; anything else is an error, and on error all are closed. Returns a new
// object, or null with a reason for people in `why` (a string literal). Memory taken
// is at most a constant times the bytes given, whatever they declare. `from`, unless
// null, is told of each descriptor when it is closed.
[[nodiscard]] vox_object_t decode(std::span<const std::uint8_t> bytes,
                                  std::span<const int> descriptors, const codec_limits& limits,
                                  const char*& why, vox_custom_object* from = nullptr) noexcept;

// The same for an item whose descriptors did not come with it: they decode to the
// null object.
[[nodiscard]] vox_object_t decode_without_descriptors(std::span<const std::uint8_t> bytes,
                                                      const codec_limits& limits,
                                                      const char*& why) noexcept;

// Whether `text` is well-formed UTF-8 (RFC 3629).
[[nodiscard]] bool is_utf8(std::span<const std::uint8_t> text) noexcept;

}  // namespace vox_wire
