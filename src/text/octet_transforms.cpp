#include "src/text/octet_transforms.h"

#include <array>

#include "plr/text/octet_source_buffer.h"
#include "src/text/unit_pull.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

using octets::kBlock;

constexpr std::size_t kCodes = 256;  // at a time

template <class Code>
void widenBlock(Code* out, const unsigned char* units) {
    std::array<std::uint16_t, kBlock> block;
    std::memcpy(block.data(), units, sizeof(block));
    for (std::size_t k = 0; k < kBlock; ++k)
        out[k] = octets::bigEndian(block[k]);
}

void narrow(char* out, const char16_t* units, std::size_t length) {
    std::size_t i = 0;
    for (; i + kBlock <= length; i += kBlock) {
        std::array<std::uint16_t, kBlock> block;
        for (std::size_t k = 0; k < kBlock; ++k)
            block[k] = octets::bigEndian(units[i + k]);
        std::memcpy(out + 2 * i, block.data(), sizeof(block));
    }
    for (; i < length; ++i) {
        out[2 * i] = static_cast<char>(units[i] >> 8);
        out[2 * i + 1] = static_cast<char>(units[i]);
    }
}

}  // namespace

std::size_t OctetToUcs2Transform::convert(std::uint32_t* out, std::size_t most) {
    return convertAny(out, most);
}

std::size_t OctetToUcs2Transform::convert(char16_t* out, std::size_t most) {
    return convertAny(out, most);
}

template <class Code>
std::size_t OctetToUcs2Transform::convertAny(Code* out, std::size_t most) {
    if (OctetSourceBuffer* memory = source == nullptr ? nullptr : source->asOctetSource())
        return convertMemory(*memory, out, most);
    std::array<std::uint32_t, 2 * kCodes> octets;
    std::size_t done = 0;
    while (done < most) {
        const std::size_t wanted = 2 * std::min(most - done, kCodes);
        const std::size_t got = pull(octets.data(), wanted);
        for (std::size_t i = 0; i + 1 < got; i += 2)
            out[done++] = unitOf(octets[i], octets[i + 1]);
        if (got % 2 != 0)
            markExceptionOccurred();
        if (got < wanted)
            break;
    }
    return done;
}

template <class Code>
std::size_t OctetToUcs2Transform::convertMemory(OctetSourceBuffer& memory, Code* out,
                                                std::size_t most) {
    const auto octets = memory.peek();
    const std::size_t units = std::min(most, octets.size() / 2);
    std::size_t i = 0;
    for (; i + kBlock <= units; i += kBlock)
        widenBlock(out + i, octets.data() + 2 * i);
    for (; i < units; ++i)
        out[i] = static_cast<std::uint16_t>(octets[2 * i] << 8 | octets[2 * i + 1]);
    memory.skip(2 * units);
    if (units < most && octets.size() % 2 != 0) {
        memory.skip(1);
        markExceptionOccurred();
    }
    return units;
}

std::uint16_t OctetToUcs2Transform::unitOf(std::uint32_t high, std::uint32_t low) {
    if ((high | low) <= 0xFF)
        return static_cast<std::uint16_t>(high << 8 | low);
    markExceptionOccurred();
    return utf16::kReplacement;
}

void Ucs2ToOctetTransform::reset() {
    TextTransform::reset();
    rest_ = {};
}

std::size_t Ucs2ToOctetTransform::convert(char* out, std::size_t most) {
    UnitBuffer units;
    std::size_t done = rest_.take(out, most);
    while (done < most) {
        const std::size_t wanted = std::min((most - done + 1) / 2, kUnitsAtOnce);
        const std::size_t got = pullUnits(*this, units.data(), wanted);
        const std::size_t whole = std::min(got, (most - done) / 2);
        narrow(out + done, units.data(), whole);
        done += 2 * whole;
        for (std::size_t i = whole; i < got; ++i) {
            rest_.bits |= std::uint32_t{units[i]} << (16 - 8 * rest_.length);
            rest_.length += 2;
        }
        done += rest_.take(out + done, most - done);
        if (got < wanted)
            break;
    }
    return done;
}

}  // namespace plr
