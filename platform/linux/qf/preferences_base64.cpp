#include "platform/linux/qf/preferences_base64.h"

namespace qf::preferences {
namespace {

constexpr std::string_view kDigits =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

}  // namespace

std::string encode_base64(std::span<const std::uint8_t> bytes) {
    std::string text;
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        const std::size_t count = std::min<std::size_t>(3, bytes.size() - i);
        std::uint32_t group = 0;
        for (std::size_t k = 0; k < 3; ++k)
            group = group << 8 | (k < count ? bytes[i + k] : 0U);
        for (std::size_t k = 0; k < 4; ++k)
            text += k <= count ? kDigits[group >> (18 - 6 * k) & 63] : '=';
    }
    return text;
}

std::optional<std::vector<std::uint8_t>> decode_base64(std::string_view text) {
    std::string digits;
    for (const char c : text) {
        if (c != ' ' && c != '\t' && c != '\r' && c != '\n')
            digits += c;
    }
    const std::size_t size = digits.size();
    while (!digits.empty() && digits.back() == '=')
        digits.pop_back();
    std::vector<std::uint8_t> bytes;
    std::uint32_t group = 0;
    for (std::size_t i = 0; i < digits.size(); ++i) {
        const std::size_t value = kDigits.find(digits[i]);
        if (value == std::string_view::npos)
            return {};
        group = group << 6 | static_cast<std::uint32_t>(value);
        if (i % 4 != 0)
            bytes.push_back(static_cast<std::uint8_t>(group >> (6 - i % 4 * 2)));
    }
    // One spelling only: the right padding, and no bits left over.
    if (encode_base64(bytes).size() != size ||
        encode_base64(bytes).compare(0, digits.size(), digits) != 0)
        return {};
    return bytes;
}

}  // namespace qf::preferences
