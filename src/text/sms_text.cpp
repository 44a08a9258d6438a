#include "src/text/sms_text.h"

#include "plr/text/gsm7.h"
#include "plr/text/text_transform.h"
#include "src/text/conversion_chain.h"
#include "src/text/grapheme_joins.h"
#include "src/text/sms_layout.h"
#include "src/text/utf16.h"

namespace plr {
namespace {

using enum TextConverter::Conversion;

std::size_t unitsOf(std::uint32_t code, const SmsEncoding& encoding) noexcept {
    if (encoding.encoding == TextConverter::MessageEncoding::kGSM7)
        return ucs2ToGsm7(code, encoding.tables()) > 0x7F ? 2 : 1;
    return utf16::isPair(code) ? 2 : 1;
}

// In UTF-8.
std::size_t octetsOf(std::uint32_t code) noexcept {
    if (utf16::isPair(code))
        return 4;
    return code < 0x80 ? 1 : code < 0x800 ? 2 : 3;
}

}  // namespace

SmsText::SmsText(std::string_view utf8)
    : text_(convert(utf8, {{kUtf8ToUcs2}, {kUcs2ToUtf8}}).octets) {
    TextConverter converter;
    converter.setSource(text_.data(), text_.size());
    converter.pushConversion(kUtf8ToUcs2);
    characters_.reserve(text_.size());
    GraphemeJoins joins;
    for (std::uint32_t code; (code = converter.nextCode()) != TextTransform::kEnd;)
        characters_.push_back(
            {code, joins.next(utf16::isPair(code) ? utf16::characterOfPair(code) : code)});
}

bool SmsText::isEncodable(TextConverter::Ucs2ToGsm7Tables tables) const noexcept {
    for (const Character& character : characters_)
        if (ucs2ToGsm7(character.code, tables) < 0)
            return false;
    return true;
}

// A sequence of more units than that is cut: its first character stands alone.
SmsText::Sequence SmsText::sequenceAt(std::size_t index, const SmsEncoding& encoding,
                                      std::size_t mostUnits) const noexcept {
    const Sequence first{1, unitsOf(characters_[index].code, encoding)};
    Sequence all = first;
    for (std::size_t i = index + 1; i < characters_.size() && characters_[i].joins; ++i) {
        all.units += unitsOf(characters_[i].code, encoding);
        if (all.units > mostUnits)
            return first;
        ++all.characters;
    }
    return all;
}

SmsText::Cuts SmsText::cut(const SmsEncoding& encoding, SmsReference reference) const {
    Cuts cuts;
    SmsSize& size = cuts.size;
    for (const Character& character : characters_)
        size.units += unitsOf(character.code, encoding);
    size.unitsAPart = unitsBehind(headerOctets(encoding, SmsReference::kNone), encoding);
    if (size.units > size.unitsAPart)
        size.unitsAPart = unitsBehind(headerOctets(encoding, reference), encoding);

    size.unitsLeft = size.unitsAPart;
    std::size_t end = 0;
    for (std::size_t i = 0; i < characters_.size();) {
        const Sequence sequence = sequenceAt(i, encoding, size.unitsAPart);
        if (sequence.units > size.unitsLeft) {
            cuts.ends.push_back(end);
            size.unitsLeft = size.unitsAPart;
        }
        size.unitsLeft -= sequence.units;
        for (const std::size_t next = i + sequence.characters; i < next; ++i)
            end += octetsOf(characters_[i].code);
    }
    cuts.ends.push_back(end);
    size.parts = cuts.ends.size();
    return cuts;
}

}  // namespace plr
