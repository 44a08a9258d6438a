// What one writes oneself: loops that decode a character, look it up and encode it.

#include <array>
#include <cstdint>

#include "bench/text_cases.h"

namespace {

using namespace bench::text_cases;

using Octets = std::vector<char>;

std::uint8_t octet(std::string_view text, std::size_t at) {
    return static_cast<std::uint8_t>(text[at]);
}

// Of a text that is known to be well-formed.
char32_t nextOfUtf8(std::string_view text, std::size_t& at) {
    const std::uint8_t lead = octet(text, at++);
    if (lead < 0x80)
        return lead;
    const int more = lead < 0xE0 ? 1 : lead < 0xF0 ? 2 : 3;
    char32_t character = lead & (0x3F >> more);
    for (int i = 0; i < more; ++i)
        character = character << 6 | (octet(text, at++) & 0x3F);
    return character;
}

char* putOctet(char* out, char32_t octet) {
    *out++ = static_cast<char>(octet);
    return out;
}

char* putUtf8(char* out, char32_t c) {
    if (c < 0x80)
        return putOctet(out, c);
    if (c < 0x800) {
        out = putOctet(out, 0xC0 | c >> 6);
    } else {
        if (c < 0x10000) {
            out = putOctet(out, 0xE0 | c >> 12);
        } else {
            out = putOctet(out, 0xF0 | c >> 18);
            out = putOctet(out, 0x80 | (c >> 12 & 0x3F));
        }
        out = putOctet(out, 0x80 | (c >> 6 & 0x3F));
    }
    return putOctet(out, 0x80 | (c & 0x3F));
}

char* putUnit(char* out, char32_t unit) {
    return putOctet(putOctet(out, unit >> 8), unit);
}

char* putUtf16(char* out, char32_t c) {
    if (c < 0x10000)
        return putUnit(out, c);
    return putUnit(putUnit(out, 0xD7C0 + (c >> 10)), 0xDC00 | (c & 0x3FF));
}

// By character: its septet, with the escape in the high octet where it needs one.
const std::vector<std::uint16_t>& septetTable() {
    static const auto table = [] {
        std::vector<std::uint16_t> septets(0x10000, '?');
        for (std::uint16_t i = 0; i < kAlphabet.size(); ++i)
            septets[kAlphabet[i]] = i;
        for (const auto& [character, septet] : kExtension)
            septets[character] = static_cast<std::uint16_t>(kEscape << 8 | septet);
        return septets;
    }();
    return table;
}

// By septet, and by 128 + septet behind an escape.
const std::array<char32_t, 256>& characterTable() {
    static const auto table = [] {
        std::array<char32_t, 256> characters{};
        for (std::size_t i = 0; i < kAlphabet.size(); ++i)
            characters[i] = characters[i + 128] = kAlphabet[i];
        for (const auto& [character, septet] : kExtension)
            characters[static_cast<std::size_t>(septet) + 128] = character;
        return characters;
    }();
    return table;
}

// Septets into octets, the least significant bit first.
class Packer {
  public:
    explicit Packer(char* out) : out_(out) {}
    void put(unsigned septet) {
        bits_ |= septet << held_;
        held_ += 7;
        if (held_ >= 8)
            putOctetOfBits();
    }
    char* finish() {
        if (held_ > 0)
            putOctetOfBits();
        return out_;
    }

  private:
    void putOctetOfBits() {
        out_ = putOctet(out_, bits_);
        bits_ >>= 8;
        held_ -= 8;
    }

    char* out_;
    unsigned bits_ = 0;
    int held_ = 0;  // bits of these
};

char* toSeptets(std::string_view in, char* out) {
    const auto& table = septetTable();
    Packer packer(out);
    for (std::size_t at = 0; at < in.size();) {
        const char32_t character = nextOfUtf8(in, at);
        const unsigned septet = character < table.size() ? table[character] : '?';
        if (septet > 0x7F)
            packer.put(septet >> 8);
        packer.put(septet & 0x7F);
    }
    return packer.finish();
}

char* fromSeptets(std::string_view in, char* out) {
    const auto& table = characterTable();
    const std::size_t septets = in.size() * 8 / 7;
    bool escaped = false;
    for (std::size_t i = 0; i < septets; ++i) {
        const std::size_t bit = 7 * i;
        unsigned both = octet(in, bit / 8);
        if (bit % 8 > 1)
            both |= static_cast<unsigned>(octet(in, bit / 8 + 1)) << 8;
        const unsigned septet = both >> bit % 8 & 0x7F;
        const bool escape = septet == kEscape && !escaped;
        if (!escape)
            out = putUtf8(out, table[septet + (escaped ? 128 : 0)]);
        escaped = escape;
    }
    return out;
}

char* toUcs2(std::string_view in, char* out) {
    for (std::size_t at = 0; at < in.size();)
        out = putUtf16(out, nextOfUtf8(in, at));
    return out;
}

char* fromUcs2(std::string_view in, char* out) {
    const auto unit = [in](std::size_t at) -> char32_t {
        return static_cast<char32_t>(octet(in, at) << 8 | octet(in, at + 1));
    };
    for (std::size_t at = 0; at + 1 < in.size(); at += 2) {
        char32_t character = unit(at);
        if (character >> 10 == 0xD800 >> 10 && at + 3 < in.size()) {
            at += 2;
            character = 0x10000 + ((character & 0x3FF) << 10 | (unit(at) & 0x3FF));
        }
        out = putUtf8(out, character);
    }
    return out;
}

char* fromEucKr(std::string_view in, char* out) {
    const auto& cells = koreanCells();
    for (std::size_t at = 0; at < in.size();) {
        const std::uint8_t lead = octet(in, at++);
        if (lead < 0x80)
            out = putUtf16(out, lead);
        else
            out = putUtf16(out, cells[(lead - 0xA1u) * kRow + (octet(in, at++) - 0xA1u)]);
    }
    return out;
}

Maker loop(char* (*convert)(std::string_view, char*)) {
    return [convert](std::string_view) -> Convert {
        return [convert, out = Octets(4 << 20)](std::string_view in) mutable {
            const char* const end = convert(in, out.data());
            return std::string_view(out.data(), static_cast<std::size_t>(end - out.data()));
        };
    };
}

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv,
               {{"to_septets", loop(toSeptets)},
                {"from_septets", loop(fromSeptets)},
                {"to_ucs2", loop(toUcs2)},
                {"from_ucs2", loop(fromUcs2)},
                {"from_euc_kr", loop(fromEucKr)}});
}
