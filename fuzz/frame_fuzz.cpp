// The frame reader, fed with any bytes cut anywhere.
//
//   input = step descriptors stream   ; step: bytes at a time, 0 for all at once
//                                     ; descriptors: how many come with the first byte
//
// Frames must not depend on how the bytes were cut, and memory must follow
// the bytes that arrived.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>
#include <string>
#include <vector>

#include "platform/linux/vox/frame_reader.h"

namespace {

using vox_link::frame_reader;

// Numbers of descriptors that are not open: closing them changes nothing.
constexpr int kNoDescriptor = 1 << 20;

struct result {
    std::vector<std::vector<std::uint8_t>> bodies;
    std::size_t descriptors = 0;
    std::string error;
    bool operator==(const result&) const = default;
};

void require(bool holds) {
    if (!holds)
        std::abort();
}

// Returns false once the stream is broken.
bool take_all(frame_reader& reader, result& taken) {
    vox_link::frame arrived;
    for (;;) {
        const frame_reader::outcome outcome = reader.next(arrived);
        if (outcome == frame_reader::outcome::error) {
            taken.error = reader.error();
            // Broken for good.
            require(reader.has_next() && reader.next(arrived) == outcome);
        }
        if (outcome != frame_reader::outcome::frame)
            return outcome == frame_reader::outcome::more;
        require(arrived.body.size() == arrived.header.length);
        require(arrived.descriptors.size() == arrived.header.descriptors);
        taken.bodies.emplace_back(arrived.body.begin(), arrived.body.end());
        taken.descriptors += arrived.descriptors.size();
    }
}

result read(std::span<const std::uint8_t> stream, std::size_t step, std::size_t descriptors) {
    frame_reader reader({.body_bytes = 1u << 20, .descriptors = 4});
    std::vector<std::uint8_t> scratch(frame_reader::kLeastScratch);
    const std::vector<int> numbers(descriptors, kNoDescriptor);
    result taken;
    std::size_t at = 0;
    while (at < stream.size()) {
        const std::span<std::uint8_t> space = reader.space(scratch);
        require(!space.empty());
        const std::size_t count = std::min({step, space.size(), stream.size() - at});
        std::copy_n(stream.begin() + static_cast<std::ptrdiff_t>(at), count, space.begin());
        reader.arrived(count, at == 0 ? std::span<const int>(numbers) : std::span<const int>());
        at += count;
        if (!take_all(reader, taken))
            break;
        reader.keep();
        require(reader.held() <= std::max<std::size_t>(72u << 10, 2 * at));
        require(reader.in_frame() || reader.held() == 0);
    }
    require(taken.descriptors <= descriptors);
    return taken;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size < 2)
        return 0;
    const std::span<const std::uint8_t> stream(data + 2, size - 2);
    const std::size_t step = data[0] == 0 ? SIZE_MAX : data[0];
    const std::size_t descriptors = data[1] % 8;
    const result cut = read(stream, step, descriptors);
    if (descriptors == 0)
        require(cut == read(stream, SIZE_MAX, 0));
    return 0;
}
