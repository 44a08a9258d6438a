#include "plr/text/ussd_text.h"

#include <algorithm>
#include <array>

#include "src/text/conversion_chain.h"

namespace plr {
namespace {

using enum TextConverter::Conversion;
using MessageEncoding = TextConverter::MessageEncoding;

constexpr std::size_t kMostOctets = 160;
// In front of a text that begins with its language: two letters and a CR, or, in UCS-2, two
// letters in septets.
constexpr std::size_t kGsm7PrefixSeptets = 3;
constexpr std::size_t kUcs2PrefixOctets = 2;

enum CodingScheme : std::uint8_t {
    kGsm7 = 0x0F,
    kLanguageAndGsm7 = 0x10,
    kLanguageAndUcs2 = 0x11,
    kUcs2 = 0x48,
};

// By data coding schemes from 0x00 and from 0x20 on.
constexpr std::array<std::string_view, 15> kLanguages = {
    "de", "en", "it", "fr", "es", "nl", "sv", "da", "pt", "fi", "no", "el", "tr", "hu", "pl"};
constexpr std::array<std::string_view, 5> kMoreLanguages = {"cs", "he", "ar", "ru", "is"};

std::string_view languageOf(std::uint8_t codingScheme) {
    if (codingScheme < kLanguages.size())
        return kLanguages[codingScheme];
    const std::size_t more = codingScheme - std::size_t{0x20};
    return more < kMoreLanguages.size() ? kMoreLanguages[more] : std::string_view();
}

bool isLanguage(std::string_view text) {
    return text.size() == 2 &&
           std::ranges::all_of(text, [](char c) { return c >= 'a' && c <= 'z'; });
}

// Not what has a header in front, and what other protocols define.
constexpr bool isText(std::uint8_t codingScheme) noexcept {
    const int group = codingScheme >> 4;
    return group != 0x9 && group != 0xD && group != 0xE;
}

// Without a CR that only fills the last octet.
std::size_t septetsOf(std::string_view octets) {
    const bool isFilled = !octets.empty() && octets.size() % 7 == 0 &&
                          static_cast<unsigned char>(octets.back()) >> 1 == '\r';
    return octets.size() * 8 / 7 - (isFilled ? 1 : 0);
}

Converted unpack(std::string_view octets, std::size_t septets) {
    return convert(octets, {{kSmsUnpack, 0, septets}, {kGsm7ToUcs2}, {kUcs2ToUtf8}});
}

Converted readText(MessageEncoding encoding, std::string_view octets) {
    if (encoding == MessageEncoding::kUCS2)
        return convert(octets, {{kOctetToUcs2}, {kUcs2ToUtf8}});
    if (encoding == MessageEncoding::kKSC5601)
        return convert(octets, {{kEucKRToUcs2}, {kUcs2ToUtf8}});
    return unpack(octets, septetsOf(octets));
}

// Nothing if it has other characters.
std::optional<std::string> packed(const std::string& text) {
    if (convert(text, {{kUtf8ToUcs2}, {kUcs2ToGsm7}}).hasReplacements)
        return std::nullopt;
    return convert(text, {{kUtf8ToUcs2}, {kUcs2ToGsm7}, {kUssdPack}}).octets;
}

std::optional<UssdString> ussdString(std::string_view octets, CodingScheme codingScheme) {
    if (octets.size() > kMostOctets)
        return std::nullopt;
    return UssdString{{octets.begin(), octets.end()}, codingScheme};
}

}  // namespace

std::optional<UssdText> decodeUssd(std::span<const std::uint8_t> octets,
                                   std::uint8_t codingScheme) {
    UssdText result;
    bool hasLanguage = false;
    if (octets.size() > kMostOctets || !isText(codingScheme))
        return std::nullopt;
    // What is reserved leaves the default alphabet, which receivers are to take it for.
    TextConverter::decodeCbsDataCodingScheme(codingScheme, result.messageClass, result.encoding,
                                             hasLanguage);
    result.isCompressed = (codingScheme & 0xE0) == 0x60;
    if (result.isCompressed || result.encoding == MessageEncoding::k8BitData) {
        result.data.assign(octets.begin(), octets.end());
        return result;
    }
    std::string_view body = asText(octets);
    std::string prefix;
    if (codingScheme == kLanguageAndUcs2) {
        prefix = unpack(body, 2).octets;
        body.remove_prefix(std::min(body.size(), kUcs2PrefixOctets));
    }
    Converted text = readText(result.encoding, body);
    if (codingScheme == kLanguageAndGsm7) {
        prefix = unpack(body, std::min(septetsOf(body), kGsm7PrefixSeptets)).octets;
        text.octets.erase(0, prefix.size());
    }
    const std::string indicated = hasLanguage ? prefix.substr(0, 2) : "";
    result.language = isLanguage(indicated) ? indicated : languageOf(codingScheme);
    result.text = std::move(text.octets);
    result.hasReplacements = text.hasReplacements;
    return result;
}

std::optional<UssdString> encodeUssd(std::string_view text, std::string_view language) {
    if (!language.empty() && !isLanguage(language))
        return std::nullopt;
    std::string body(language);
    if (!language.empty())
        body += '\r';
    body += text;
    if (const auto octets = packed(body))
        return ussdString(*octets, language.empty() ? kGsm7 : kLanguageAndGsm7);
    std::string octets = convert(language, {{kSmsPack}}).octets;
    octets += convert(text, {{kUtf8ToUcs2}, {kUcs2ToOctet}}).octets;
    return ussdString(octets, language.empty() ? kUcs2 : kLanguageAndUcs2);
}

}  // namespace plr
