#pragma once

#include <cstddef>

#include "plr/text/sms_encoding.h"

// How many units there are in the user data of a message, and where.
namespace plr {

inline constexpr std::size_t kMostSmsOctets = 140;
inline constexpr std::size_t kMostSmsSeptets = 160;
inline constexpr std::size_t kMostSmsParts = 255;

// Septets that so many octets reach into; octets that so many septets reach into.
constexpr std::size_t septetsOver(std::size_t octets) noexcept {
    return (octets * 8 + 6) / 7;
}
constexpr std::size_t octetsOver(std::size_t septets) noexcept {
    return (septets * 7 + 7) / 8;
}
static_assert(octetsOver(kMostSmsSeptets) == kMostSmsOctets);

// Between a header and the first septet.
constexpr int fillBits(std::size_t headerOctets) noexcept {
    return static_cast<int>(septetsOver(headerOctets) * 7 - headerOctets * 8);
}

constexpr bool isSet(TextConverter::NationalLanguageId language) noexcept {
    return language != TextConverter::NationalLanguageId::kNone;
}

// Octets of a part's header, its length among them; 0 if it needs none.
constexpr std::size_t headerOctets(const SmsEncoding& encoding, SmsReference reference) noexcept {
    std::size_t octets = 0;
    if (encoding.encoding == TextConverter::MessageEncoding::kGSM7)
        octets += (isSet(encoding.locking) ? 3U : 0U) + (isSet(encoding.single) ? 3U : 0U);
    if (reference != SmsReference::kNone)
        octets += reference == SmsReference::k8Bit ? 5 : 6;
    return octets == 0 ? 0 : octets + 1;
}

constexpr std::size_t unitsBehind(std::size_t headerOctets, const SmsEncoding& encoding) noexcept {
    return encoding.encoding == TextConverter::MessageEncoding::kGSM7
               ? kMostSmsSeptets - septetsOver(headerOctets)
               : (kMostSmsOctets - headerOctets) / 2;
}

}  // namespace plr
