#include "plr/text/alpha_identifier.h"

#include <algorithm>
#include <utility>

#include "plr/text/gsm7.h"
#include "plr/text/text_transform.h"
#include "src/text/conversion_chain.h"

namespace plr {
namespace {

using enum TextConverter::Conversion;
using Octets = std::span<const std::uint8_t>;
using Record = std::vector<std::uint8_t>;

constexpr std::uint8_t kUnused = 0xFF;
constexpr std::size_t kMostCounted = 0xFF;  // octets behind a length

enum Coding : std::uint8_t {
    kUnits = 0x80,
    kBaseOf8Bits = 0x81,
    kBaseOf16Bits = 0x82,
};

std::string readUnits(Octets octets) {
    std::size_t used = 0;
    while (used + 1 < octets.size() && (octets[used] & octets[used + 1]) != kUnused)
        used += 2;
    return convert(asText(octets.first(used)), {{kOctetToUcs2}, {kUcs2ToUtf8}}).octets;
}

std::optional<std::string> readWithBase(Octets octets, std::size_t length, int base) {
    if (length > octets.size())
        return std::nullopt;
    return convert(asText(octets.first(length)), {{kAdn8ToUcs2, base}, {kUcs2ToUtf8}}).octets;
}

// The lowest character that the default alphabet and its extension have not; 0 if they have
// all.
std::uint32_t lowestBeyondGsm7(std::string_view text) {
    TextConverter converter;
    converter.setSource(text.data(), text.size());
    converter.pushConversion(kUtf8ToUcs2);
    std::uint32_t lowest = 0;
    for (std::uint32_t code; (code = converter.nextCode()) != TextTransform::kEnd;)
        if (ucs2ToGsm7(code, TextConverter::Ucs2ToGsm7Tables::kDefault) < 0)
            lowest = lowest == 0 ? code : std::min(lowest, code);
    return lowest;
}

// A header, without the length that may stand in it, and what is behind it.
std::optional<Record> recordOf(Record header, const Converted& body) {
    const bool hasLength = header.size() > 1;
    if (body.hasReplacements || (hasLength && body.octets.size() > kMostCounted))
        return std::nullopt;
    if (hasLength)
        header.insert(header.begin() + 1, static_cast<std::uint8_t>(body.octets.size()));
    header.insert(header.end(), body.octets.begin(), body.octets.end());
    return header;
}

std::optional<Record> recordWithBase(Record header, std::string_view text, std::uint32_t base) {
    return recordOf(std::move(header),
                    convert(text, {{kUtf8ToUcs2}, {kUcs2ToAdn8, static_cast<int>(base)}}));
}

// The text in every coding that has its characters, in the order of the header's grammar.
std::vector<Record> candidates(std::string_view text) {
    std::vector<Record> records;
    const auto add = [&records](std::optional<Record> record) {
        if (record)
            records.push_back(*std::move(record));
    };
    const auto octet = [](std::uint32_t value) { return static_cast<std::uint8_t>(value); };
    const std::uint32_t base = lowestBeyondGsm7(text);
    if (base == 0)
        add(recordOf({}, convert(text, {{kUtf8ToUcs2}, {kUcs2ToGsm7}})));
    add(recordOf({kUnits}, convert(text, {{kUtf8ToUcs2}, {kUcs2ToOctet}})));
    if (base <= 0x7FFF)
        add(recordWithBase({kBaseOf8Bits, octet(base >> 7)}, text, base & 0x7F80));
    if (base <= 0xFFFF)
        add(recordWithBase({kBaseOf16Bits, octet(base >> 8), octet(base)}, text, base));
    return records;
}

}  // namespace

std::optional<std::string> decodeAlphaIdentifier(Octets octets) {
    const std::size_t size = octets.size();
    const std::uint8_t coding = octets.empty() ? kUnused : octets[0];
    if (coding == kUnits)
        return readUnits(octets.subspan(1));
    if (coding == kBaseOf8Bits)
        return size < 3 ? std::nullopt : readWithBase(octets.subspan(3), octets[1], octets[2] << 7);
    if (coding == kBaseOf16Bits)
        return size < 4 ? std::nullopt
                        : readWithBase(octets.subspan(4), octets[1], octets[2] << 8 | octets[3]);
    return convert(asText(octets), {{kOctetToGsm7}, {kGsm7ToUcs2}, {kUcs2ToUtf8}}).octets;
}

std::optional<Record> encodeAlphaIdentifier(std::string_view text, std::size_t capacity) {
    const std::string wellFormed = convert(text, {{kUtf8ToUcs2}, {kUcs2ToUtf8}}).octets;
    const std::vector<Record> records = candidates(wellFormed);
    Record shortest = *std::ranges::min_element(records, {}, &Record::size);
    if (shortest.size() > capacity)
        return std::nullopt;
    shortest.resize(capacity, kUnused);
    return shortest;
}

}  // namespace plr
