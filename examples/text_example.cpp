#include <iostream>
#include <string>
#include <vector>

#include "plr/format/hex.h"
#include "plr/text.h"

using enum plr::TextConverter::Conversion;
using enum plr::TextConverter::NationalLanguageId;

// A stack of stages: the octets of a message are pulled through, and its text comes out.
void showStages() {
    const std::vector<unsigned char> octets =
        plr::parse_hex("e8329bfd4697d9ec37", plr::kHexWhitespaceNone);
    plr::TextConverter converter;
    converter.setSource(reinterpret_cast<const char*>(octets.data()), octets.size());
    converter.pushConversion(kSmsUnpack, 0, 10);  // no fill bits, ten septets
    converter.pushConversion(kGsm7ToUcs2);
    converter.pushConversion(kUcs2ToUtf8);
    std::cout << converter.readChars(1000) << '\n';  // hellohello

    const std::string wrong = "caf\xE9";  // Latin-1, not UTF-8
    plr::TextConverter upwards;
    upwards.setSource(wrong.data(), wrong.size());
    upwards.pushConversion(kUtf8ToUcs2);
    upwards.pushConversion(kUcs2ToAscii7);
    std::cout << upwards.readChars(1000) << (upwards.exceptionOccurred() ? ", not as it was" : "")
              << '\n';  // caf?, not as it was
}

// What somebody who types a message wants to know.
void showSize(const std::string& text) {
    const auto encoding = plr::chooseSmsEncoding(text, {kTurkish});
    const auto size = plr::measureSms(text, encoding);
    std::cout << asString(encoding.encoding) << ' ' << asString(encoding.single) << ": "
              << size.parts << " with " << size.unitsLeft << " left\n";
}

// A text as user data, and back.
void showParts(const std::string& text) {
    const auto encoding = plr::chooseSmsEncoding(text);
    std::string back;
    for (const plr::SmsPart& part : plr::encodeSms(text, encoding)) {
        const auto read =
            plr::decodeSmsUserData(part.userData, part.codingScheme, part.length, part.hasHeader);
        if (read.error != plr::SmsUserDataError::kNone)
            return;
        if (const auto& place = read.header.concatenation)
            std::cout << unsigned{place->number} << " of " << unsigned{place->total} << '\n';
        back += read.text;
    }
    std::cout << (back == text ? "as it was" : "other") << '\n';
}

// Strings of USSD, and names on a SIM.
void showShortTexts() {
    if (const auto query = plr::encodeUssd("*100#"))
        std::cout << plr::hex(query->octets) << '\n';  // aa180c3602
    if (const auto name = plr::encodeAlphaIdentifier("Анна", 10))
        std::cout << plr::hex(*name) << '\n'
                  << plr::decodeAlphaIdentifier(*name).value_or("malformed") << '\n';
}

int main() {
    showStages();
    showSize("Teşekkürler");                       // kGSM7 Turkish: 1 with 143 left
    showSize("Спасибо");                           // kUCS2 None: 1 with 63 left
    showParts(std::string(69, '.') + "👍🏽");  // 1 of 2, 2 of 2, as it was
    showShortTexts();
}
