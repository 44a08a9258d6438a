#include "src/text/octet_transforms.h"

#include <array>

#include "plr/text/octet_source_buffer.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

using octets::kBlock;

constexpr std::size_t kCodes = 256;  // at a time

void widenBlock(std::uint32_t* out, const unsigned char* units) {
    std::array<std::uint16_t, kBlock> block;
    std::memcpy(block.data(), units, sizeof(block));
    for (std::size_t k = 0; k < kBlock; ++k)
        out[k] = octets::bigEndian(block[k]);
}

void narrowBlock(char* out, const std::uint32_t* codes) {
    std::array<std::uint16_t, kBlock> block;
    for (std::size_t k = 0; k < kBlock; ++k)
        block[k] = static_cast<std::uint16_t>(codes[k]);
    for (std::size_t k = 0; k < kBlock; ++k)
        block[k] = octets::bigEndian(block[k]);
    std::memcpy(out, block.data(), sizeof(block));
}

// Of a block, for which there is room; 0 where a code is neither unit nor pair.
std::size_t convertBlock(const std::uint32_t* codes, char* out) {
    if (octets::blockFits(codes, 0xFFFF)) {
        narrowBlock(out, codes);
        return 2 * kBlock;
    }
    // Without a branch for each, for texts mix units and pairs: by arithmetic of which compilers
    // make none.
    std::size_t done = 0;
    bool allGood = true;
    for (std::size_t i = 0; i < kBlock; ++i) {
        const unsigned pair = (0 - (codes[i] >> 16)) >> 31;
        allGood &= utf16::isPair(codes[i]) == (pair != 0);
        const std::uint32_t bits = octets::firstHighest(codes[i] << (16 - 16 * pair));
        std::memcpy(out + done, &bits, sizeof(bits));
        done += 2 + 2 * pair;
    }
    return allGood ? done : 0;
}

}  // namespace

std::size_t OctetToUcs2Transform::convert(std::uint32_t* out, std::size_t most) {
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

std::size_t OctetToUcs2Transform::convertMemory(OctetSourceBuffer& memory, std::uint32_t* out,
                                                std::size_t most) {
    const auto octets = memory.peek();
    const std::size_t units = std::min(most, octets.size() / 2);
    std::size_t i = 0;
    for (; i + kBlock <= units; i += kBlock)
        widenBlock(out + i, octets.data() + 2 * i);
    for (; i < units; ++i)
        out[i] = static_cast<std::uint32_t>(octets[2 * i] << 8 | octets[2 * i + 1]);
    memory.skip(2 * units);
    if (units < most && octets.size() % 2 != 0) {
        memory.skip(1);
        markExceptionOccurred();
    }
    return units;
}

std::uint32_t OctetToUcs2Transform::unitOf(std::uint32_t high, std::uint32_t low) {
    if ((high | low) <= 0xFF)
        return high << 8 | low;
    markExceptionOccurred();
    return utf16::kReplacement;
}

void Ucs2ToOctetTransform::reset() {
    TextTransform::reset();
    rest_ = {};
}

std::size_t Ucs2ToOctetTransform::convert(char* out, std::size_t most) {
    std::array<std::uint32_t, kCodes> codes;
    std::size_t done = rest_.take(out, most);
    while (done < most) {
        const std::size_t wanted = std::min((most - done + 3) / 4, kCodes);
        const std::size_t got = pull(codes.data(), wanted);
        done += convertCodes(codes.data(), got, out + done, most - done);
        if (got < wanted)
            break;
    }
    return done;
}

std::size_t Ucs2ToOctetTransform::convertCodes(const std::uint32_t* codes, std::size_t length,
                                               char* out, std::size_t most) {
    std::size_t done = 0;
    for (std::size_t i = 0; i < length;) {
        while (length - i >= kBlock && most - done >= 4 * kBlock) {
            const std::size_t converted = convertBlock(codes + i, out + done);
            if (converted == 0)
                break;
            i += kBlock;
            done += converted;
        }
        for (const std::size_t stop = std::min(length, i + kBlock); i < stop; ++i) {
            rest_ = encode(codes[i]);
            done += rest_.take(out + done, most - done);
        }
    }
    return done;
}

octets::Few Ucs2ToOctetTransform::encode(std::uint32_t code) {
    if (utf16::isPair(code))
        return {code, 4};
    if (code > 0xFFFF) {
        markExceptionOccurred();
        code = utf16::kReplacement;
    }
    return {code << 16, 2};
}

}  // namespace plr
