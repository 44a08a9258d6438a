#include "src/text/utf8_to_ucs2_transform.h"

#include "plr/text/octet_source_buffer.h"
#include "src/text/utf8_decoder.h"

namespace plr {

void Utf8ToUcs2Transform::reset() {
    TextTransform::reset();
    heldLength_ = 0;
}

std::size_t Utf8ToUcs2Transform::convert(std::uint32_t* out, std::size_t most) {
    OctetSourceBuffer* memory = source == nullptr ? nullptr : source->asOctetSource();
    return memory != nullptr ? convertMemory(*memory, out, most) : convertPulled(out, most);
}

std::size_t Utf8ToUcs2Transform::convertMemory(OctetSourceBuffer& memory, std::uint32_t* out,
                                               std::size_t most) {
    Utf8Decoder decoder(memory.peek());
    const std::size_t codes = decoder.decode(out, most, true);
    memory.skip(decoder.used());
    exception |= decoder.isMarked();
    return codes;
}

// A code takes at least one octet, except where a sequence was begun: the octet that ends it
// as ill-formed may be a character itself.
std::size_t Utf8ToUcs2Transform::convertPulled(std::uint32_t* out, std::size_t most) {
    std::array<unsigned char, kPulled + sizeof(held_)> octets;
    std::copy_n(held_.begin(), heldLength_, octets.begin());
    std::size_t have = heldLength_;
    std::size_t done = 0;
    for (bool more = true;;) {
        Utf8Decoder decoder({octets.data(), have});
        done += decoder.decode(out + done, most - done, !more);
        exception |= decoder.isMarked();
        have -= decoder.used();
        std::copy_n(octets.begin() + static_cast<std::ptrdiff_t>(decoder.used()), have,
                    octets.begin());
        if (done == most || !more)
            break;
        const std::size_t room = most - done;
        const std::size_t wanted = std::min(room > have ? room - have : 1, kPulled);
        const std::size_t got = pullOctets(octets.data() + have, wanted);
        have += got;
        more = got == wanted;
    }
    std::copy_n(octets.begin(), have, held_.begin());
    heldLength_ = have;
    return done;
}

std::size_t Utf8ToUcs2Transform::pullOctets(unsigned char* octets, std::size_t most) {
    std::array<std::uint32_t, kPulled> codes;
    const std::size_t got = pull(codes.data(), most);
    for (std::size_t i = 0; i < got; ++i)  // 0xFF is never part of a sequence
        octets[i] = static_cast<unsigned char>(std::min<std::uint32_t>(codes[i], 0xFF));
    return got;
}

}  // namespace plr
