#include <algorithm>
#include <cctype>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "Pelorin"
#include "plr/format/hex.h"
#include "tests/support/byte_models.h"

// Hex text of any kind: PelorinHexToBin() into every capacity and parse_hex() in its
// three modes, against readings of one character at a time.
namespace {

using namespace plr::test;

void check(bool holds) {
    if (!holds)
        std::abort();
}

void checkLenient(const std::string& text) {
    Bytes expected;
    if (text.size() % 2 != 0)
        expected.push_back(modelByte(text.substr(0, 1)));
    for (std::size_t i = text.size() % 2; i < text.size(); i += 2)
        expected.push_back(modelByte(text.substr(i, 2)));
    for (std::size_t capacity = 0; capacity <= expected.size() + 2; ++capacity) {
        Bytes out(capacity);  // the sanitizer guards its end
        const std::uint32_t count =
            PelorinHexToBin(out.data(), static_cast<std::uint32_t>(capacity), text.c_str());
        check(count == std::min(capacity, expected.size()));
        check(std::equal(out.begin(), out.begin() + count, expected.begin()));
    }
}

Bytes readStrictly(std::string text, plr::HexWhitespaceOption option) {
    if (option == plr::kHexWhitespaceSingleSpace && !text.empty())
        text += ' ';  // so that one stands behind every pair
    Bytes bytes;
    for (std::size_t i = 0; i < text.size();) {
        if (option == plr::kHexWhitespaceSkip &&
            std::isspace(static_cast<unsigned char>(text[i]))) {
            ++i;
            continue;
        }
        if (i + 1 == text.size() || !isHexDigit(text[i]) || !isHexDigit(text[i + 1]))
            return {};
        bytes.push_back(modelByte(text.substr(i, 2)));
        i += 2;
        if (option == plr::kHexWhitespaceSingleSpace && text[i++] != ' ')
            return {};
    }
    return bytes;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string text(reinterpret_cast<const char*>(data), std::min<std::size_t>(size, 400));
    checkLenient(text.c_str());
    for (const auto option :
         {plr::kHexWhitespaceSkip, plr::kHexWhitespaceSingleSpace, plr::kHexWhitespaceNone})
        check(plr::parse_hex(text, option) == readStrictly(text, option));
    const std::string digits = plr::hex(text.data(), text.size());
    const Bytes bytes(text.begin(), text.end());
    check(plr::parse_hex(digits, plr::kHexWhitespaceNone) == bytes);
    check(plr::parse_hex(plr::hex_sp(bytes), plr::kHexWhitespaceSingleSpace) == bytes);
    return 0;
}
