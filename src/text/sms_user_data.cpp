#include "plr/text/sms_user_data.h"

#include "plr/log/static_logger.h"
#include "src/text/conversion_chain.h"
#include "src/text/sms_header.h"
#include "src/text/sms_layout.h"

namespace plr {
namespace {

using enum TextConverter::Conversion;
using Octets = std::span<const std::uint8_t>;
using Error = SmsUserDataError;
using MessageClass = TextConverter::MessageClass;
using MessageEncoding = TextConverter::MessageEncoding;

bool readCodingScheme(std::uint8_t codingScheme, SmsUserData& result) {
    StaticLogger silent;
    silent.setLogLevel(LogLevel::Never);
    bool ignored = false;
    return TextConverter::decodeSmsDataCodingScheme(codingScheme, result.messageClass,
                                                    result.encoding, ignored, result.isCompressed,
                                                    ignored, ignored, ignored, silent);
}

bool hasSeptets(const SmsUserData& result) {
    return result.encoding == MessageEncoding::kGSM7 && !result.isCompressed;
}

Converted convertText(const SmsUserData& message, std::string_view octets, int fill,
                      std::size_t septets) {
    switch (message.encoding) {
        case MessageEncoding::kUCS2:
            return convert(octets, {{kOctetToUcs2}, {kUcs2ToUtf8}});
        case MessageEncoding::kKSC5601:
            return convert(octets, {{kEucKRToUcs2}, {kUcs2ToUtf8}});
        default:
            return convert(octets,
                           {{kSmsUnpack, fill, septets},
                            {kGsm7ToUcs2, static_cast<int>(message.header.locking),
                             TextConverter::kNoLimit, static_cast<int>(message.header.single)},
                            {kUcs2ToUtf8}});
    }
}

// `octets`: all of the user data, of `length` septets or octets.
Error readUserData(Octets octets, std::size_t length, bool hasHeader, SmsUserData& result) {
    Error error = Error::kNone;
    std::size_t header = 0;
    if (hasHeader) {
        header = octets.empty() ? 1 : 1U + octets[0];
        if (header > octets.size() || (hasSeptets(result) && septetsOver(header) > length))
            return Error::kHeaderTooLong;
        const auto read = readSmsHeader(octets.subspan(1, header - 1));
        error = read ? Error::kNone : Error::kHeaderElements;
        result.header = read.value_or(SmsHeader());
    }
    const Octets body = octets.subspan(header);
    if (result.isCompressed || result.encoding == MessageEncoding::k8BitData) {
        result.data.assign(body.begin(), body.end());
        return error;
    }
    Converted text =
        convertText(result, asText(body), fillBits(header), length - septetsOver(header));
    result.text = std::move(text.octets);
    result.hasReplacements = text.hasReplacements;
    return error;
}

std::uint8_t codingSchemeOf(const SmsEncoding& encoding, MessageClass messageClass) {
    const int alphabet = encoding.encoding == MessageEncoding::kGSM7 ? 0x00 : 0x08;
    const int meaning =
        messageClass == MessageClass::kClassNone ? 0 : 0x10 | (static_cast<int>(messageClass) & 3);
    return static_cast<std::uint8_t>(alphabet | meaning);
}

// Behind the header that is there; `part.length` is of that.
void appendText(std::string_view text, const SmsEncoding& encoding, SmsPart& part) {
    const std::size_t header = part.userData.size();
    std::string octets;
    std::size_t length = 0;
    if (encoding.encoding == MessageEncoding::kGSM7) {
        const int tables = static_cast<int>(encoding.tables());
        length = septetsOver(header) +
                 TextConverter::countSeptetsInMessage(text.data(), text.size(), encoding.tables());
        octets = convert(text, {{kUtf8ToUcs2}, {kUcs2ToGsm7, tables}, {kSmsPack, fillBits(header)}})
                     .octets;
    } else {
        octets = convert(text, {{kUtf8ToUcs2}, {kUcs2ToOctet}}).octets;
        length = header + octets.size();
    }
    part.userData.insert(part.userData.end(), octets.begin(), octets.end());
    part.length = static_cast<std::uint8_t>(length);
}

}  // namespace

const char* asString(SmsUserDataError error) noexcept {
    switch (error) {
        case Error::kNone:
            return "none";
        case Error::kReservedCoding:
            return "reserved data coding scheme";
        case Error::kTooLong:
            return "user data too long";
        case Error::kCutShort:
            return "user data cut short";
        case Error::kHeaderTooLong:
            return "header longer than user data";
        case Error::kHeaderElements:
            return "header elements do not fill header";
    }
    return "unknown";
}

SmsUserData decodeSmsUserData(Octets userData, std::uint8_t codingScheme, std::uint8_t length,
                              bool hasHeader) {
    SmsUserData result;
    const bool isReserved = !readCodingScheme(codingScheme, result);
    if (length > (hasSeptets(result) ? kMostSmsSeptets : kMostSmsOctets))
        result.error = Error::kTooLong;
    else if (const std::size_t octets = hasSeptets(result) ? octetsOver(length) : length;
             octets > userData.size())
        result.error = Error::kCutShort;
    else
        result.error = readUserData(userData.first(octets), length, hasHeader, result);
    // Receivers are to take it for the default alphabet (3GPP TS 23.038, chapter 4), as was done.
    if (isReserved && result.error == Error::kNone)
        result.error = Error::kReservedCoding;
    return result;
}

std::vector<SmsPart> encodeSms(std::string_view text, const SmsEncoding& encoding,
                               SmsReference reference, std::uint16_t number,
                               MessageClass messageClass) {
    const std::vector<std::string> texts = splitSms(text, encoding, reference);
    if (texts.size() > kMostSmsParts)
        return {};
    if (texts.size() == 1)
        reference = SmsReference::kNone;
    std::vector<SmsPart> parts;
    SmsConcatenation place{number, static_cast<std::uint8_t>(texts.size()), 0};
    for (const std::string& piece : texts) {
        ++place.number;
        SmsPart part;
        part.userData = writeSmsHeader(encoding, reference, place);
        part.hasHeader = !part.userData.empty();
        part.codingScheme = codingSchemeOf(encoding, messageClass);
        appendText(piece, encoding, part);
        parts.push_back(std::move(part));
    }
    return parts;
}

}  // namespace plr
