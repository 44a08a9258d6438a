#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <span>
#include <string>

#include "examples/sms_pdu.h"
#include "plr/text/alpha_identifier.h"
#include "plr/text/cell_broadcast.h"
#include "plr/text/sms_user_data.h"
#include "plr/text/ussd_text.h"
#include "src/text/conversion_chain.h"

// Messages from outside, read as PDUs, as user data, as USSD strings, as pages of cell
// broadcast and as names of a SIM: what comes out is well-formed text. The same octets as
// a text: what is sent of it reads back. The input: data coding scheme, length, choices, octets.
namespace {

using Octets = std::span<const std::uint8_t>;

void check(bool holds) {
    if (!holds)
        std::abort();
}

plr::Converted wellFormed(std::string_view text) {
    using enum plr::TextConverter::Conversion;
    return plr::convert(text, {{kUtf8ToUcs2}, {kUcs2ToUtf8}});
}

void checkWellFormed(std::string_view text) {
    check(!wellFormed(text).hasReplacements);
}

void readUserData(Octets octets, std::uint8_t scheme, std::uint8_t length, bool hasHeader) {
    const auto read = plr::decodeSmsUserData(octets, scheme, length, hasHeader);
    checkWellFormed(read.text);
    check(read.text.empty() || read.data.empty());
    if (read.error == plr::SmsUserDataError::kCutShort)
        return;
    std::vector<std::uint8_t> more(octets.begin(), octets.end());
    more.insert(more.end(), {0x55, 0xFF, 0x00});
    const auto same = plr::decodeSmsUserData(more, scheme, length, hasHeader);
    check(same.error == read.error && same.text == read.text && same.data == read.data);
}

void readOthers(Octets octets, std::uint8_t scheme) {
    const auto pdu = radio::readDeliver(octets);
    checkWellFormed(pdu.message.sender);
    checkWellFormed(pdu.message.userData.text);
    if (const auto text = plr::decodeUssd(octets, scheme)) {
        checkWellFormed(text->text);
        checkWellFormed(text->language);
    }
    if (const auto page = plr::decodeCellBroadcastPage(octets)) {
        checkWellFormed(page->content.text);
        check(page->number >= 1 && page->number <= page->total && page->total <= 15);
    }
    if (const auto name = plr::decodeAlphaIdentifier(octets))
        checkWellFormed(*name);
}

void sendMessage(const std::string& text, std::uint8_t choices) {
    using enum plr::TextConverter::NationalLanguageId;
    const auto reference = static_cast<plr::SmsReference>(choices % 3);
    std::vector<plr::TextConverter::NationalLanguageId> languages;
    for (const auto language : {kTurkish, kSpanish, kPortuguese})
        if (choices >> (1 + static_cast<int>(language)) & 1)
            languages.push_back(language);
    const auto encoding = plr::chooseSmsEncoding(text, languages, reference);
    const auto parts = plr::encodeSms(text, encoding, reference, 0x1234);
    check(parts.size() == plr::measureSms(text, encoding, reference).parts);
    std::string back;
    for (const plr::SmsPart& part : parts) {
        check(part.userData.size() <= 140 && radio::writeSubmit("+123", part));
        const auto read =
            plr::decodeSmsUserData(part.userData, part.codingScheme, part.length, part.hasHeader);
        check(read.error == plr::SmsUserDataError::kNone && !read.hasReplacements);
        back += read.text;
    }
    check(back == text);
}

void sendOthers(const std::string& text) {
    // Deliberate: a SIM takes U+FFFF for an unused place.
    if (text.find("\uFFFF") == text.npos)
        if (const auto record = plr::encodeAlphaIdentifier(text, 300))
            check(plr::decodeAlphaIdentifier(*record) == text);
    if (const auto string = plr::encodeUssd(text)) {
        const auto read = plr::decodeUssd(string->octets, string->codingScheme);
        check(read && (read->text == text || (text.ends_with('\r') && read->text == text + '\r')));
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    if (size < 3 || size > 1000)
        return 0;
    // Of their very length, so that the sanitizer guards their end.
    const std::size_t length = size - 3;
    const auto octets = std::make_unique<std::uint8_t[]>(length);
    std::copy(data + 3, data + size, octets.get());
    readUserData({octets.get(), length}, data[0], data[1], data[2] % 2 != 0);
    readOthers({octets.get(), length}, data[0]);
    const std::string text = wellFormed({reinterpret_cast<const char*>(data) + 3, length}).octets;
    sendMessage(text, data[2]);
    sendOthers(text);
    return 0;
}
