#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "plr/base/export.h"
#include "plr/text/sms_encoding.h"
#include "plr/text/text_converter.h"

// The user data of short messages (3GPP TS 23.040, 9.2.3.24) as text, and texts as user
// data; by the data coding scheme (3GPP TS 23.038, chapter 4) and the header:
//
//   UDL                  septets or octets of what follows; not part of the user data here
//   UDHL                 octets of the elements; only if there is a header
//     { IEI IEDL data }  elements
//   fill bits            to the next septet, with 7-bit behind a header
//   text
//
// Threads: any; values.
namespace plr {

// Of a message that is one of the parts of a text.
struct SmsConcatenation {
    std::uint16_t reference = 0;  // the same in all parts
    std::uint8_t total = 1;       // of the parts
    std::uint8_t number = 1;      // of this one, 1 to total

    bool operator==(const SmsConcatenation&) const = default;
};

struct SmsPorts {
    std::uint16_t destination = 0;
    std::uint16_t origin = 0;

    bool operator==(const SmsPorts&) const = default;
};

// Of elements that come twice the last one counts. Elements that are not known, or whose
// values are none, are skipped, as 3GPP TS 23.040 tells receivers.
struct SmsHeader {
    std::optional<SmsConcatenation> concatenation;
    std::optional<SmsPorts> ports;
    TextConverter::NationalLanguageId locking = TextConverter::NationalLanguageId::kNone;
    TextConverter::NationalLanguageId single = TextConverter::NationalLanguageId::kNone;
};

enum class SmsUserDataError {
    kNone,
    kReservedCoding,  // a data coding scheme that means nothing; read as septets
    kTooLong,         // more than 160 septets or 140 octets
    kCutShort,        // fewer octets than its length tells
    kHeaderTooLong,   // the header goes beyond the user data
    kHeaderElements,  // the elements do not fill the header; it counts as empty
};
// "none", "reserved data coding scheme", …. Static.
[[nodiscard]] PLR_EXPORT const char* asString(SmsUserDataError error) noexcept;

struct SmsUserData {
    // With kReservedCoding and kHeaderElements the rest counts, too; with others nothing else.
    SmsUserDataError error = SmsUserDataError::kNone;
    TextConverter::MessageEncoding encoding = TextConverter::MessageEncoding::kGSM7;
    TextConverter::MessageClass messageClass = TextConverter::MessageClass::kClassNone;
    bool isCompressed = false;
    SmsHeader header;
    std::string text;                // UTF-8; empty if it is data
    std::vector<std::uint8_t> data;  // what is no text: 8-bit and compressed
    bool hasReplacements = false;    // in the text, see TextConverter::exceptionOccurred()
};

// `userData`: from outside, any octets; those behind the end are not looked at.
// `codingScheme`, `length`, `hasHeader`: TP-DCS, TP-UDL and TP-UDHI of the same message.
[[nodiscard]] PLR_EXPORT SmsUserData decodeSmsUserData(std::span<const std::uint8_t> userData,
                                                       std::uint8_t codingScheme,
                                                       std::uint8_t length, bool hasHeader);

// One message of a text, as it goes into a PDU.
struct SmsPart {
    std::vector<std::uint8_t> userData;  // TP-UD, 140 octets at most
    std::uint8_t length = 0;             // TP-UDL: septets or octets
    std::uint8_t codingScheme = 0;       // TP-DCS
    bool hasHeader = false;              // TP-UDHI
};

// The parts that splitSms() makes of the text, ready to send. Empty if they were more than
// 255. `number`: of the message; what `reference` has no room for is cut off.
[[nodiscard]] PLR_EXPORT std::vector<SmsPart> encodeSms(
    std::string_view text, const SmsEncoding& encoding,
    SmsReference reference = SmsReference::k8Bit, std::uint16_t number = 0,
    TextConverter::MessageClass messageClass = TextConverter::MessageClass::kClassNone);

}  // namespace plr
