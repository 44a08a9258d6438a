#include "src/text/ucs2_to_utf8_transform.h"

#include <utility>

#include "src/text/unit_pull.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

constexpr octets::Few kReplacement{0xEFBFBD00, 3};

octets::Few encodeUnit(std::uint32_t unit) {
    if (unit < 0x80)
        return {unit << 24, 1};
    const std::uint32_t last = 0x80 | (unit & 0x3F);
    if (unit < 0x800)
        return {(0xC0 | unit >> 6) << 24 | last << 16, 2};
    return {(0xE0 | unit >> 12) << 24 | (0x80 | (unit >> 6 & 0x3F)) << 16 | last << 8, 3};
}

octets::Few encodePair(std::uint32_t pair) {
    const std::uint32_t character = utf16::characterOfPair(pair);
    return {(0xF0 | character >> 18) << 24 | (0x80 | (character >> 12 & 0x3F)) << 16 |
                (0x80 | (character >> 6 & 0x3F)) << 8 | (0x80 | (character & 0x3F)),
            4};
}

}  // namespace

void Ucs2ToUtf8Transform::reset() {
    TextTransform::reset();
    rest_ = {};
    heldLength_ = 0;
}

// A unit makes up to three octets, so a third as many are pulled as there is room for octets.
// Where a high surrogate is last, the next unit is needed, too, and may have to be kept.
std::size_t Ucs2ToUtf8Transform::convert(char* out, std::size_t most) {
    std::array<char16_t, std::tuple_size_v<UnitBuffer> + 2> units;
    char* const end = out + most;
    char* next = out + rest_.take(out, most);
    for (bool more = true; next != end && (more || heldLength_ != 0);) {
        const std::size_t have = std::exchange(heldLength_, 0);
        std::copy_n(held_.begin(), have, units.begin());
        const std::size_t least = have == 1 && utf16::isHighSurrogate(units[0]) ? 2 : 1;
        const auto room = static_cast<std::size_t>(end - next);
        const std::size_t wanted = std::max(std::min((room + 2) / 3, kUnitsAtOnce), least);
        const std::size_t missing = wanted - std::min(wanted, have);
        const std::size_t got = pullUnits(*this, units.data() + have, missing);
        more = got >= missing;
        const char16_t* const stop = units.data() + have + got;
        const bool waits = more && utf16::isHighSurrogate(stop[-1]);
        utf8kernel::Encoding run{units.data(), stop - (waits ? 1 : 0), next, end};
        convertUnits(run);
        next = run.out;
        heldLength_ = static_cast<std::size_t>(stop - run.in);
        std::copy(run.in, stop, held_.begin());
    }
    return static_cast<std::size_t>(next - out);
}

// As long as there is room.
void Ucs2ToUtf8Transform::convertUnits(utf8kernel::Encoding& run) {
    while (run.in != run.end && run.out != run.outEnd) {
        utf8kernel::kernel().encode(run);
        if (run.in == run.end || run.out == run.outEnd)
            break;
        std::uint32_t code = *run.in++;
        if (utf16::isHighSurrogate(code) && run.in != run.end && utf16::isLowSurrogate(*run.in))
            code = utf16::pairOf(code, *run.in++);
        rest_ = encode(code);
        run.out += rest_.take(run.out, static_cast<std::size_t>(run.outEnd - run.out));
    }
}

octets::Few Ucs2ToUtf8Transform::encode(std::uint32_t code) {
    if (code > 0xFFFF)
        return encodePair(code);
    if (code >> 11 != 0xD800 >> 11)
        return encodeUnit(code);
    markExceptionOccurred();
    return kReplacement;
}

}  // namespace plr
