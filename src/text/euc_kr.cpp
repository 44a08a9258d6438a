#include "src/text/euc_kr.h"

#include <iterator>
#include <utility>

#include "plr/text/octet_source_buffer.h"
#include "src/text/euc_kr_table.h"
#include "src/text/utf16.h"

namespace plr {

namespace {

constexpr std::uint32_t kFirst = 0xA1;  // lead octet and trail octet
constexpr std::uint32_t kRow = 94;      // octets from there on, of both
static_assert(std::size(kEucKrTable) == kRow * kRow + 1, "the characters and the literal's 0");

constexpr bool mayBeOfPair(std::uint32_t octet) {
    return octet - kFirst < kRow;
}

}  // namespace

void EucKRToUcs2Transform::reset() {
    TextTransform::reset();
    held_ = kEnd;
}

std::size_t EucKRToUcs2Transform::convert(std::uint32_t* out, std::size_t most) {
    std::size_t made = convertMemory(out, most);
    while (made < most) {
        // As many octets as characters, which take one each at the least, to where
        // the characters go.
        std::uint32_t* const codes = out + made;
        const std::size_t length = pullHeld(codes, most - made);
        if (length == 0)
            break;
        const auto [octets, characters] = convertRun(codes, length, codes, length);
        made += characters;
        if (octets < length)
            out[made++] = convertLast(codes[octets]);
    }
    return made;
}

std::size_t EucKRToUcs2Transform::convertMemory(std::uint32_t* out, std::size_t most) {
    OctetSourceBuffer* const memory = source == nullptr ? nullptr : source->asOctetSource();
    if (memory == nullptr || held_ != kEnd)
        return 0;
    const auto octets = memory->peek();
    const Run run = convertRun(octets.data(), octets.size(), out, most);
    memory->skip(run.octets);
    return run.characters;
}

// Up to `most` characters, as long as two octets are left. `out` may be `octets`.
// Hot path: bench/text_pelorin.cpp.
template <class Octet>
EucKRToUcs2Transform::Run EucKRToUcs2Transform::convertRun(const Octet* octets, std::size_t length,
                                                           std::uint32_t* out, std::size_t most) {
    std::size_t i = 0;
    std::size_t made = 0;
    while (i + 1 < length && made < most) {
        const std::uint32_t lead = octets[i++];
        if (lead < 0x80) {
            out[made++] = lead;
        } else if (!mayBeOfPair(lead) || !mayBeOfPair(octets[i])) {
            out[made++] = replacement();
        } else {
            out[made++] = characterOf(lead, octets[i++]);
        }
    }
    return {i, made};
}

// Of an octet behind which none has been pulled yet.
std::uint32_t EucKRToUcs2Transform::convertLast(std::uint32_t octet) {
    if (octet < 0x80)
        return octet;
    std::uint32_t trail = kEnd;
    if (!mayBeOfPair(octet) || pull(&trail, 1) == 0)
        return replacement();
    if (mayBeOfPair(trail))
        return characterOf(octet, trail);
    held_ = trail;
    return replacement();
}

std::size_t EucKRToUcs2Transform::pullHeld(std::uint32_t* codes, std::size_t most) {
    if (held_ == kEnd)
        return pull(codes, most);
    codes[0] = std::exchange(held_, kEnd);
    return most == 1 ? 1 : 1 + pull(codes + 1, most - 1);
}

std::uint32_t EucKRToUcs2Transform::characterOf(std::uint32_t lead, std::uint32_t trail) {
    const char16_t character = kEucKrTable[(lead - kFirst) * kRow + (trail - kFirst)];
    return character == utf16::kReplacement ? replacement() : character;
}

std::uint32_t EucKRToUcs2Transform::replacement() {
    markExceptionOccurred();
    return utf16::kReplacement;
}

}  // namespace plr
