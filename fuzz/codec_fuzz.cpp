#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "platform/linux/vox/codec.h"

// The value codec against any bytes: what is refused says why; what is accepted
// encodes to the very same bytes, equals its own copy, and can be described.
// The first byte of the input says how many descriptors come with it.
namespace {

void check(bool holds) {
    if (!holds)
        std::abort();
}

std::vector<int> open_descriptors(std::size_t count) {
    std::vector<int> descriptors;
    for (std::size_t i = 0; i < count; i++)
        descriptors.push_back(open("/dev/null", O_RDONLY | O_CLOEXEC));
    return descriptors;
}

vox_object_t decode(std::span<const std::uint8_t> body, std::size_t descriptors) {
    const char* why = nullptr;
    vox_object_t value =
        vox_wire::decode(body, open_descriptors(descriptors), vox_wire::codec_limits{}, why);
    check((value == nullptr) == (why != nullptr));
    return value;
}

void check_accepted(vox_object_t value, std::span<const std::uint8_t> body,
                    std::size_t descriptors) {
    vox_wire::encoded again;
    check(vox_wire::encode(value, vox_wire::codec_limits{}, again) == 0);
    check(std::ranges::equal(again.bytes.view(), body));
    check(again.descriptors.size() == descriptors);
    for (const int descriptor : again.descriptors)
        close(descriptor);
    if (descriptors == 0) {
        vox_object_t copy = decode(body, 0);
        check(vox_equal(value, copy));
        vox_release(copy);
    }
    std::free(vox_copy_description(value));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size == 0)
        return 0;
    // A copy of its own for the body, so that a read past its end is caught.
    const std::vector<std::uint8_t> body(data + 1, data + size);
    const std::size_t descriptors = data[0] % 4;
    if (vox_object_t value = decode(body, descriptors)) {
        check_accepted(value, body, descriptors);
        vox_release(value);
    }
    // Every descriptor was closed: the lowest free number does not creep up.
    const int probe = open("/dev/null", O_RDONLY | O_CLOEXEC);
    check(probe >= 0 && probe < 64);
    close(probe);
    return 0;
}
