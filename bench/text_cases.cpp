#include "bench/text_cases.h"

#include <iconv.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>

namespace bench::text_cases {

const std::u32string_view kAlphabet =
    U"@£$¥èéùìòÇ\nØø\rÅåΔ_ΦΓΛΩΠΨΣΘΞ\x1BÆæßÉ !\"#¤%&'()*+,-./0123456789:;<=>?"
    U"¡ABCDEFGHIJKLMNOPQRSTUVWXYZÄÖÑÜ§¿abcdefghijklmnopqrstuvwxyzäöñüà";

const std::map<char32_t, char> kExtension = {
    {U'\f', 0x0A}, {U'^', 0x14}, {U'{', 0x28}, {U'}', 0x29}, {U'\\', 0x2F},
    {U'[', 0x3C},  {U'~', 0x3D}, {U']', 0x3E}, {U'|', 0x40}, {U'€', 0x65},
};

namespace {

constexpr std::size_t kMebibyte = 1 << 20;
constexpr std::size_t kMessage = 160;
constexpr std::size_t kMessages = 1024;
constexpr std::size_t kLapCharacters = 1 << 20;
constexpr std::uint32_t kRare = 8;  // one character in so many is what gives a text its name

std::uint32_t randomBelow(std::uint32_t limit) {
    static std::uint64_t state = 42;
    state = state * 6364136223846793005u + 1442695040888963407u;
    return static_cast<std::uint32_t>((state >> 33) % limit);
}

char32_t oneOf(std::u32string_view characters) {
    return characters[randomBelow(static_cast<std::uint32_t>(characters.size()))];
}

char32_t syllable() {
    constexpr std::uint32_t kFirst = 15 * kRow;
    return koreanCells()[kFirst + randomBelow(25 * kRow)];
}

char32_t character(std::string_view text) {
    const bool rare = randomBelow(kRare) == 0;
    if (text == "korean")
        return rare ? U' ' : syllable();
    if (rare && text == "european")
        return oneOf(U"£èéùìòØøÅåÆæßÉÄÖÑÜäöñüà¿¡§");
    if (rare && text == "extension")
        return oneOf(U"^{}\\[~]|€");
    if (rare && text == "emoji")
        return U'\U0001F600' + randomBelow(80);
    return oneOf(U"etaoin shrdlu cmfwyp etaoin ETAOIN 0123456789.,!?:");
}

std::string utf8(const std::u32string& text) {
    std::string octets;
    const auto add = [&octets](char32_t octet) { octets += static_cast<char>(octet); };
    for (const char32_t c : text) {
        if (c < 0x80) {
            add(c);
        } else if (c < 0x800) {
            add(0xC0 | c >> 6);
        } else if (c < 0x10000) {
            add(0xE0 | c >> 12);
            add(0x80 | (c >> 6 & 0x3F));
        } else {
            add(0xF0 | c >> 18);
            add(0x80 | (c >> 12 & 0x3F));
            add(0x80 | (c >> 6 & 0x3F));
        }
        if (c >= 0x80)
            add(0x80 | (c & 0x3F));
    }
    return octets;
}

std::string utf16(const std::u32string& text, bool bigEndian) {
    std::string octets;
    const auto add = [&](char32_t unit) {
        const std::array both = {static_cast<char>(unit >> 8), static_cast<char>(unit)};
        octets += both[bigEndian ? 0 : 1];
        octets += both[bigEndian ? 1 : 0];
    };
    for (const char32_t c : text) {
        if (c >= 0x10000)
            add(0xD7C0 + (c >> 10));
        add(c >= 0x10000 ? 0xDC00 | (c & 0x3FF) : c);
    }
    return octets;
}

std::string septets(const std::u32string& text) {
    std::string octets;
    for (const char32_t c : text) {
        if (const auto found = kExtension.find(c); found != kExtension.end())
            octets += {kEscape, found->second};
        else
            octets += static_cast<char>(kAlphabet.find(c));
    }
    return octets;
}

std::string packed(const std::string& septets) {
    std::string octets((septets.size() * 7 + 7) / 8, 0);
    for (std::size_t bit = 0; bit < septets.size() * 7; ++bit)
        octets[bit / 8] =
            static_cast<char>(octets[bit / 8] | (septets[bit / 7] >> bit % 7 & 1) << bit % 8);
    return octets;
}

std::string eucKr(const std::u32string& text) {
    static const auto cellOf = [] {
        std::map<char32_t, unsigned> found;
        for (unsigned i = 0; i < koreanCells().size(); ++i)
            found.emplace(koreanCells()[i], i);
        return found;
    }();
    std::string octets;
    for (const char32_t c : text) {
        if (c < 0x80)
            octets += static_cast<char>(c);
        else
            octets += {static_cast<char>(0xA1 + cellOf.at(c) / kRow),
                       static_cast<char>(0xA1 + cellOf.at(c) % kRow)};
    }
    return octets;
}

// Where 7 bits would stay free in the last octet, nobody could tell them from a septet.
bool endsInDoubt(const std::u32string& text) {
    return septets(text).size() % 8 == 7;
}

std::u32string textOf(std::string_view name, bool message) {
    std::u32string text;
    for (std::size_t octets = 0; message ? text.size() < kMessage : octets < kMebibyte;) {
        text += character(name);
        octets += utf8(text.substr(text.size() - 1)).size();
    }
    if (endsInDoubt(text))
        text.back() = kExtension.contains(text.back()) ? U'.' : U'[';
    return text;
}

Piece pieceOf(std::string_view what, const std::u32string& text, Form form) {
    const auto gsm = [&] { return form.packed ? packed(septets(text)) : septets(text); };
    const auto ucs2 = [&] { return utf16(text, form.bigEndian); };
    if (what.starts_with("to_septets"))
        return {utf8(text), gsm(), text.size()};
    if (what.starts_with("from_septets"))
        return {gsm(), utf8(text), text.size()};
    if (what == "to_ucs2")
        return {utf8(text), ucs2(), text.size()};
    if (what == "from_ucs2")
        return {ucs2(), utf8(text), text.size()};
    return {eucKr(text), ucs2(), text.size()};
}

void check(const std::vector<Piece>& pieces, const Convert& convert) {
    for (const Piece& piece : pieces)
        expect(convert(piece.in) == piece.out);
}

double nanosecondsEach(const std::vector<Piece>& pieces, const Convert& convert) {
    std::size_t characters = 0;
    for (const Piece& piece : pieces)
        characters += piece.characters;
    const std::size_t turns = std::max<std::size_t>(1, kLapCharacters / characters);
    LapRecorder laps(10, 100);
    laps.start();
    do {
        for (std::size_t i = 0; i < turns; ++i) {
            for (const Piece& piece : pieces) {
                touch(piece.in.data());
                touch(convert(piece.in).data());
            }
        }
    } while (laps.lap());
    return static_cast<double>(laps.percentile(50)) / static_cast<double>(turns * characters);
}

std::vector<char32_t> readKoreanCells() {
    const iconv_t conversion = ::iconv_open("UTF-32LE", "EUC-KR");
    expect(conversion != iconv_t(-1));
    std::vector<char32_t> cells(kRow * kRow);
    for (unsigned i = 0; i < cells.size(); ++i) {
        std::array octets = {static_cast<char>(0xA1 + i / kRow),
                             static_cast<char>(0xA1 + i % kRow)};
        std::array<char, sizeof(char32_t)> unit{};
        char* in = octets.data();
        char* out = unit.data();
        std::size_t inLeft = octets.size();
        std::size_t outLeft = unit.size();
        if (::iconv(conversion, &in, &inLeft, &out, &outLeft) == 0 && outLeft == 0)
            std::copy(unit.begin(), unit.end(), reinterpret_cast<char*>(&cells[i]));
    }
    ::iconv_close(conversion);
    return cells;
}

}  // namespace

const std::vector<char32_t>& koreanCells() {
    static const std::vector<char32_t> cells = readKoreanCells();
    return cells;
}

int run(int argc, char** argv, const std::map<std::string_view, Maker>& makers, Form form) {
    const auto found = makers.find(argc > 3 ? argv[1] : "");
    if (found == makers.end()) {
        std::fprintf(stderr, "unknown case\n");
        return 2;
    }
    const bool message = argv[3] == std::string_view("message");
    std::vector<Piece> pieces;
    for (std::size_t i = 0; i < (message ? kMessages : 1); ++i)
        pieces.push_back(pieceOf(found->first, textOf(argv[2], message), form));
    const Convert convert = found->second(argv[2]);
    check(pieces, convert);
    const double each = nanosecondsEach(pieces, convert);
    check(pieces, convert);
    result("ns", each);
    return 0;
}

}  // namespace bench::text_cases
