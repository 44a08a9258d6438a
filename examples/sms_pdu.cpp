#include "examples/sms_pdu.h"

#include <array>
#include <cstdio>

#include "plr/text/text_converter.h"

namespace radio {
namespace {

using Octets = std::span<const std::uint8_t>;

constexpr std::size_t kMostDigits = 20;  // of an address
constexpr std::size_t kTimeOctets = 7;
constexpr std::string_view kDigits = "0123456789*#abc";

enum Flags : std::uint8_t {
    kKind = 0x03,
    kDeliver = 0x00,
    kSubmit = 0x01,
    kHasHeader = 0x40,
};

// Types of addresses, TS 23.040, 9.1.2.5.
enum AddressType : std::uint8_t {
    kNumberKind = 0x70,
    kInternational = 0x10,
    kAlphanumeric = 0x50,
    kUnknownNumber = 0x81,
    kInternationalNumber = 0x91,
};

// What is left of a PDU. Once more is taken than there is, nothing is any more.
class Reader {
  public:
    explicit Reader(Octets octets) : left_(octets) {}

    Octets take(std::size_t count) {
        failed_ = failed_ || count > left_.size();
        if (failed_)
            return {};
        const Octets taken = left_.first(count);
        left_ = left_.subspan(count);
        return taken;
    }
    std::uint8_t take() {
        const Octets taken = take(1);
        return taken.empty() ? std::uint8_t{0} : taken[0];
    }
    [[nodiscard]] Octets left() const { return left_; }
    [[nodiscard]] bool failed() const { return failed_; }

  private:
    Octets left_;
    bool failed_ = false;
};

std::string digits(Octets octets, std::size_t count) {
    std::string text;
    for (std::size_t i = 0; i < count; ++i) {
        const unsigned digit = octets[i / 2] >> (i % 2 * 4) & 0xFU;
        if (digit < kDigits.size())
            text += kDigits[digit];
    }
    return text;
}

std::string name(Octets octets, std::size_t septets) {
    using enum plr::TextConverter::Conversion;
    plr::TextConverter converter;
    converter.setSource(reinterpret_cast<const char*>(octets.data()), octets.size());
    converter.pushConversion(kSmsUnpack, 0, septets);
    converter.pushConversion(kGsm7ToUcs2);
    converter.pushConversion(kUcs2ToUtf8);
    return converter.readChars(plr::TextConverter::kNoLimit);
}

// Nothing if it is too long, or the PDU too short.
std::optional<std::string> takeAddress(Reader& reader) {
    const std::size_t length = reader.take();
    const unsigned kind = reader.take() & unsigned{kNumberKind};
    if (length > kMostDigits)
        return std::nullopt;
    const Octets octets = reader.take((length + 1) / 2);
    if (reader.failed())
        return std::nullopt;
    if (kind == kAlphanumeric)
        return name(octets, length * 4 / 7);
    return (kind == kInternational ? "+" : "") + digits(octets, length);
}

// Empty if it is no time. The first digit of the zone, which is in quarters of an hour,
// has the sign in its bit 3.
std::string timeOf(Octets octets) {
    std::array<int, kTimeOctets> fields{};
    for (std::size_t i = 0; i < fields.size(); ++i) {
        const int tens = octets[i] & (i == 6 ? 0x7 : 0xF);
        const int ones = octets[i] >> 4;
        if (tens > 9 || ones > 9)
            return {};
        fields[i] = tens * 10 + ones;
    }
    const auto& [year, month, day, hour, minute, second, quarters] = fields;
    if (month < 1 || month > 12 || day < 1 || day > 31 || hour > 23 || minute > 59 || second > 59)
        return {};
    std::array<char, 64> text{};
    std::snprintf(text.data(), text.size(), "20%02d-%02d-%02dT%02d:%02d:%02d%c%02d:%02d", year,
                  month, day, hour, minute, second, (octets[6] & 0x8) != 0 ? '-' : '+',
                  quarters / 4, quarters % 4 * 15);
    return text.data();
}

void appendDigits(std::vector<std::uint8_t>& pdu, std::string_view number) {
    for (std::size_t i = 0; i < number.size(); i += 2) {
        const std::size_t low = kDigits.find(number[i]);
        const std::size_t high = i + 1 < number.size() ? kDigits.find(number[i + 1]) : 0xF;
        pdu.push_back(static_cast<std::uint8_t>(low | high << 4));
    }
}

}  // namespace

DeliverReading readDeliver(Octets pdu) {
    DeliverReading reading;
    Reader reader(pdu);
    static_cast<void>(reader.take(reader.take()));  // the SMSC
    const std::uint8_t flags = reader.take();
    if (!reader.failed() && (flags & kKind) != kDeliver)
        return {{}, "no received message"};
    auto sender = takeAddress(reader);
    static_cast<void>(reader.take());  // PID
    const std::uint8_t codingScheme = reader.take();
    const Octets time = reader.take(kTimeOctets);
    const std::uint8_t length = reader.take();
    if (!sender || reader.failed())
        return {{}, "malformed"};
    reading.message.sender = *std::move(sender);
    reading.message.time = timeOf(time);
    reading.message.userData =
        plr::decodeSmsUserData(reader.left(), codingScheme, length, (flags & kHasHeader) != 0);
    // A wrong header and a reserved coding scheme are no reason to withhold the text.
    using enum plr::SmsUserDataError;
    const auto error = reading.message.userData.error;
    if (error != kNone && error != kHeaderElements && error != kReservedCoding)
        reading.complaint = asString(error);
    return reading;
}

std::optional<std::vector<std::uint8_t>> writeSubmit(std::string_view number,
                                                     const plr::SmsPart& part) {
    const bool isInternational = number.starts_with('+');
    number.remove_prefix(isInternational ? 1 : 0);
    if (number.empty() || number.size() > kMostDigits ||
        number.find_first_not_of("0123456789*#") != std::string_view::npos)
        return std::nullopt;
    std::vector<std::uint8_t> pdu{
        0, static_cast<std::uint8_t>(kSubmit | (part.hasHeader ? kHasHeader : 0)), 0,
        static_cast<std::uint8_t>(number.size()),
        isInternational ? kInternationalNumber : kUnknownNumber};
    appendDigits(pdu, number);
    pdu.insert(pdu.end(), {0, part.codingScheme, part.length});
    pdu.insert(pdu.end(), part.userData.begin(), part.userData.end());
    return pdu;
}

}  // namespace radio
