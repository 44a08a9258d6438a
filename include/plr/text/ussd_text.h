#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "plr/base/export.h"
#include "plr/text/text_converter.h"

// The strings of USSD (3GPP TS 24.080) as text, and texts as such strings; by their data
// coding scheme, which is that of cell broadcast (3GPP TS 23.038, chapter 5).
//
// Threads: any; values.
namespace plr {

struct UssdText {
    TextConverter::MessageEncoding encoding = TextConverter::MessageEncoding::kGSM7;
    TextConverter::MessageClass messageClass = TextConverter::MessageClass::kClassNone;
    bool isCompressed = false;
    std::string language;            // ISO 639, two letters; empty if nothing tells it
    std::string text;                // UTF-8; empty if it is data
    std::vector<std::uint8_t> data;  // what is no text: 8-bit and compressed
    bool hasReplacements = false;    // in the text, see TextConverter::exceptionOccurred()
};

// `octets`: from outside. Of 7-bit text a CR that fills the last 7 bits (3GPP TS 23.038,
// 6.1.2.3.1) is taken off, and so is the language that a text begins with, if the scheme says
// that it does. A reserved scheme counts as the default alphabet, as the standard tells receivers.
// Nothing for the schemes of headers (0x90 to 0x9F) and of other protocols (0xD0 to 0xEF), and
// for more than 160 octets.
[[nodiscard]] PLR_EXPORT std::optional<UssdText> decodeUssd(std::span<const std::uint8_t> octets,
                                                            std::uint8_t codingScheme);

struct UssdString {
    std::vector<std::uint8_t> octets;  // 160 at most
    std::uint8_t codingScheme = 0;
};

// In the default alphabet if it has every character, else in UCS-2. `language`: to go in
// front, two lower-case letters or none; a receiver sees a last CR twice where the
// rule of CRs wants that. Nothing if the text is too long or the language is none.
[[nodiscard]] PLR_EXPORT std::optional<UssdString> encodeUssd(std::string_view text,
                                                              std::string_view language = {});

}  // namespace plr
