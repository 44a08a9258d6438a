#include "src/text/sms_header.h"

#include "src/text/sms_layout.h"

namespace plr {
namespace {

using Octets = std::span<const std::uint8_t>;
using Language = TextConverter::NationalLanguageId;

// Information element identifiers, 3GPP TS 23.040, 9.2.3.24.
enum Element : std::uint8_t {
    kConcatenation8Bit = 0x00,
    kPorts8Bit = 0x04,
    kPorts16Bit = 0x05,
    kConcatenation16Bit = 0x08,
    kSingleShift = 0x24,
    kLockingShift = 0x25,
};

std::uint16_t numberAt(Octets octets) {
    return static_cast<std::uint16_t>(octets[0] << 8 | octets[1]);
}

void readConcatenation(std::uint16_t reference, Octets place, SmsHeader& header) {
    const SmsConcatenation read{reference, place[0], place[1]};
    if (read.number >= 1 && read.number <= read.total)
        header.concatenation = read;
}

// Skips what is no language, or none that is known: it is as if the element was not there.
void readLanguage(std::uint8_t id, Language& language) {
    if (isSet(Language{id}) && id <= static_cast<int>(Language::kPortuguese))
        language = Language{id};
}

void readElement(std::uint8_t identifier, Octets data, SmsHeader& header) {
    if (identifier == kConcatenation8Bit && data.size() == 3)
        readConcatenation(data[0], data.subspan(1), header);
    else if (identifier == kConcatenation16Bit && data.size() == 4)
        readConcatenation(numberAt(data), data.subspan(2), header);
    else if (identifier == kPorts8Bit && data.size() == 2)
        header.ports = SmsPorts{data[0], data[1]};
    else if (identifier == kPorts16Bit && data.size() == 4)
        header.ports = SmsPorts{numberAt(data), numberAt(data.subspan(2))};
    else if (identifier == kSingleShift && data.size() == 1)
        readLanguage(data[0], header.single);
    else if (identifier == kLockingShift && data.size() == 1)
        readLanguage(data[0], header.locking);
}

}  // namespace

std::optional<SmsHeader> readSmsHeader(Octets elements) {
    SmsHeader header;
    while (!elements.empty()) {
        if (elements.size() < 2 || elements.size() < 2U + elements[1])
            return std::nullopt;
        readElement(elements[0], elements.subspan(2, elements[1]), header);
        elements = elements.subspan(2U + elements[1]);
    }
    return header;
}

std::vector<std::uint8_t> writeSmsHeader(const SmsEncoding& encoding, SmsReference reference,
                                         const SmsConcatenation& concatenation) {
    const std::size_t octets = headerOctets(encoding, reference);
    if (octets == 0)
        return {};
    std::vector<std::uint8_t> header{static_cast<std::uint8_t>(octets - 1)};
    const auto write = [&header](std::initializer_list<int> values) {
        for (const int value : values)
            header.push_back(static_cast<std::uint8_t>(value));
    };
    const auto& [number, total, part] = concatenation;
    if (reference == SmsReference::k8Bit)
        write({kConcatenation8Bit, 3, number, total, part});
    if (reference == SmsReference::k16Bit)
        write({kConcatenation16Bit, 4, number >> 8, number, total, part});
    if (encoding.encoding != TextConverter::MessageEncoding::kGSM7)
        return header;
    if (isSet(encoding.single))
        write({kSingleShift, 1, static_cast<int>(encoding.single)});
    if (isSet(encoding.locking))
        write({kLockingShift, 1, static_cast<int>(encoding.locking)});
    return header;
}

}  // namespace plr
