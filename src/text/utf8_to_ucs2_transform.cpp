#include "src/text/utf8_to_ucs2_transform.h"

#include "plr/text/octet_source_buffer.h"
#include "src/text/unit_pull.h"
#include "src/text/utf8_decoder.h"

namespace plr {
namespace {

// Units as codes, pairs as one; returns how many.
std::size_t join(const char16_t* units, std::size_t length, std::uint32_t* out) {
    using octets::kBlock;
    const std::uint32_t* const begin = out;
    for (std::size_t i = 0; i < length;) {
        if (length - i >= kBlock && !utf16::hasSurrogates(units + i)) {
            for (std::size_t k = 0; k < kBlock; ++k)
                out[k] = units[i + k];
            out += kBlock;
            i += kBlock;
            continue;
        }
        for (const std::size_t stop = std::min(length, i + kBlock); i < stop; ++i) {
            const std::uint32_t unit = units[i];
            *out++ = utf16::isHighSurrogate(unit) ? utf16::pairOf(unit, units[++i]) : unit;
        }
    }
    return static_cast<std::size_t>(out - begin);
}

}  // namespace

void Utf8ToUcs2Transform::reset() {
    TextTransform::reset();
    heldLength_ = 0;
}

bool Utf8ToUcs2Transform::deliversUnits() const noexcept {
    return true;
}

// The count is of codes: as many units are never more of them.
std::size_t Utf8ToUcs2Transform::nextUnits(char16_t* out, std::size_t most) {
    std::size_t done = 0;
    while (done < most) {
        const std::size_t wanted = permitted(most - done);
        if (wanted == 0)
            break;
        const Run run = convertUnits(out + done, wanted);
        spend(run.units - run.pairs);
        done += run.units;
        if (run.units < wanted)
            break;
    }
    return done;
}

std::size_t Utf8ToUcs2Transform::convert(std::uint32_t* out, std::size_t most) {
    UnitBuffer units;
    std::size_t done = 0;
    while (done < most) {
        const std::size_t wanted = std::min(most - done, kUnitsAtOnce);
        const Run run = convertUnits(units.data(), wanted);
        done += join(units.data(), run.units, out + done);
        if (run.units < wanted)
            break;
    }
    return done;
}

Utf8ToUcs2Transform::Run Utf8ToUcs2Transform::convertUnits(char16_t* out, std::size_t most) {
    OctetSourceBuffer* memory = source == nullptr ? nullptr : source->asOctetSource();
    return memory != nullptr ? convertMemory(*memory, out, most) : convertPulled(out, most);
}

Utf8ToUcs2Transform::Run Utf8ToUcs2Transform::convertMemory(OctetSourceBuffer& memory,
                                                            char16_t* out, std::size_t most) {
    Utf8Decoder decoder(memory.peek());
    const std::size_t units = decoder.decode(out, most, true);
    memory.skip(decoder.used());
    exception |= decoder.isMarked();
    return {units, decoder.pairs()};
}

// A unit takes at least one octet, except where a sequence was begun: the octet that ends it
// as ill-formed may be a character itself.
Utf8ToUcs2Transform::Run Utf8ToUcs2Transform::convertPulled(char16_t* out, std::size_t most) {
    std::array<unsigned char, kPulled + sizeof(held_)> octets;
    std::copy_n(held_.begin(), heldLength_, octets.begin());
    std::size_t have = heldLength_;
    Run done;
    for (bool more = true;;) {
        Utf8Decoder decoder({octets.data(), have});
        done.units += decoder.decode(out + done.units, most - done.units, !more);
        done.pairs += decoder.pairs();
        exception |= decoder.isMarked();
        have -= decoder.used();
        std::copy_n(octets.begin() + static_cast<std::ptrdiff_t>(decoder.used()), have,
                    octets.begin());
        if (done.units >= most || !more)
            break;
        const std::size_t room = most - done.units;
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
