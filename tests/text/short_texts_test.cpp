#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "plr/format/hex.h"
#include "plr/text/alpha_identifier.h"
#include "plr/text/cell_broadcast.h"
#include "plr/text/ussd_text.h"

// Strings of USSD, pages of cell broadcast and names in phone books, against octets of another
// codec and of the standards' examples; both ways.
namespace plr {
namespace {

std::vector<std::uint8_t> octetsOf(const char* digits) {
    return parse_hex(digits, kHexWhitespaceNone);
}

TEST(Ussd, IsReadByCodingScheme) {
    const struct {
        const char* name;
        const char* octets;  // hex
        int codingScheme;
        const char* text;
        const char* language;
    } rows[] = {
        {"septets", "aa180c3602", 0x0F, "*100#", ""},
        {"CR in the last octet", "31d98c56b3dd1a", 0x01, "1234567", "en"},
        {"no CR in the last octet", "611a", 0x0F, "a4", ""},
        {"@ in the last octet", "31d98c56b3dd00", 0x01, "1234567@", "en"},
        {"CR behind the last octet", "31d98c56b3dd1a0d", 0x20, "1234567\r\r", "cs"},
        {"nothing", "", 0x0F, "", ""},
        {"language in septets", "6577039d06", 0x10, "hi", "en"},
        {"language cut", "65", 0x10, "", ""},
        {"UCS-2", "0416d83dde00", 0x48, "Ж😀", ""},
        {"language and UCS-2", "65370416", 0x11, "Ж", "en"},
        {"language of UCS-2 cut", "65", 0x11, "", ""},
        {"no language", "00000416", 0x11, "Ж", ""},
        {"EUC-KR", "bec8b3e7", 0x4C, "안녕", ""},
        {"reserved", "aa180c3602", 0x12, "*100#", ""},
        {"reserved group", "aa180c3602", 0xA1, "*100#", ""},
    };
    for (const auto& row : rows) {
        const auto read =
            decodeUssd(octetsOf(row.octets), static_cast<std::uint8_t>(row.codingScheme));
        ASSERT_TRUE(read) << row.name;
        EXPECT_EQ(read->text, row.text) << row.name;
        EXPECT_EQ(read->language, row.language) << row.name;
    }
    EXPECT_EQ(decodeUssd(octetsOf("0102"), 0xF4)->data, octetsOf("0102"));
    EXPECT_EQ(decodeUssd(octetsOf("0102"), 0x60)->data, octetsOf("0102")) << "compressed";
    for (const int scheme : {0x90, 0xD0, 0xE0})
        EXPECT_FALSE(decodeUssd(octetsOf("0102"), static_cast<std::uint8_t>(scheme))) << scheme;
    EXPECT_FALSE(decodeUssd(std::vector<std::uint8_t>(161), 0x0F));
}

TEST(Ussd, TextsComeBack) {
    for (const char* language : {"", "tr"})
        for (std::size_t length = 0; length <= 70; ++length)
            for (const char* end : {"", "@", "€", "Ж", "😀"}) {
                const std::string text = std::string(length, 'x') + end;
                const auto written = encodeUssd(text, language);
                ASSERT_TRUE(written) << text;
                const auto read = decodeUssd(written->octets, written->codingScheme);
                EXPECT_EQ(read->text, text);
                EXPECT_EQ(read->language, language);
            }
    EXPECT_EQ(hex(encodeUssd("1234567")->octets), "31d98c56b3dd1a");
    EXPECT_EQ(hex(encodeUssd("1234567\r")->octets), "31d98c56b3dd1a0d");
    EXPECT_TRUE(encodeUssd(std::string(182, 'x')));
    EXPECT_FALSE(encodeUssd(std::string(183, 'x')));
    EXPECT_FALSE(encodeUssd("x", "english"));
}

TEST(CellBroadcast, PagesAreReadWithTheirPlace) {
    const struct {
        const char* name;
        std::string rest;  // hex; behind the message identifier
        int number;
        int total;
        const char* text;
        const char* language;
    } rows[] = {
        {"filled with CRs", "0123e874a301", 2, 3, "hi", "en"},
        {"full", "4823" + std::string(41 * 4, '4'), 2, 3, "䑄", ""},
        {"language first", "10116577039d6e341a", 1, 1, "hi", "en"},
        {"no number", "0103e874a301", 1, 1, "hi", "en"},
        {"no total", "0120e874a301", 1, 1, "hi", "en"},
        {"no content", "0fff", 15, 15, "", ""},
    };
    for (const auto& row : rows) {
        const auto page = decodeCellBroadcastPage(octetsOf(("6ab51112" + row.rest).c_str()));
        ASSERT_TRUE(page) << row.name;
        EXPECT_EQ(page->scope, CellBroadcastPage::Scope::kNetwork) << row.name;
        EXPECT_EQ(page->messageCode, 0x2AB) << row.name;
        EXPECT_EQ(page->updateNumber, 5) << row.name;
        EXPECT_EQ(page->messageIdentifier, 0x1112) << row.name;
        EXPECT_EQ(page->number, row.number) << row.name;
        EXPECT_EQ(page->total, row.total) << row.name;
        EXPECT_EQ(page->content.text.substr(0, 3), row.text) << row.name;
        EXPECT_EQ(page->content.language, row.language) << row.name;
    }
    for (const auto& [name, page] :
         std::map<std::string, std::string>{{"cut", "6ab5111201"},
                                            {"too long", "6ab511120111" + std::string(83 * 2, '0')},
                                            {"beyond the total", "6ab511120132"},
                                            {"no text", "6ab511129011"}})
        EXPECT_FALSE(decodeCellBroadcastPage(octetsOf(page.c_str()))) << name;
}

TEST(AlphaIdentifier, IsReadInAllCodings) {
    const struct {
        const char* name;
        const char* octets;  // hex
        const char* text;
    } rows[] = {
        {"septets", "416e6e1b65ffff", "Ann€"},
        {"unused", "ffffff", ""},
        {"nothing", "", ""},
        {"UCS-2", "800416d83dde00ffff", "Ж😀"},
        {"UCS-2, an octet too many", "800416ff", "Ж"},
        {"base of 8 bits, its example", "8103135395a6ffff", "Sকদ"},
        {"base of 16 bits, its example", "820505302d82d32d31", "-\u0532\u0583-1"},
        {"length beyond the octets", "8104135395a6", nullptr},
        {"no base", "8101", nullptr},
        {"half a base", "820005", nullptr},
    };
    for (const auto& row : rows) {
        const auto text = decodeAlphaIdentifier(octetsOf(row.octets));
        EXPECT_EQ(text.has_value(), row.text != nullptr) << row.name;
        EXPECT_EQ(text.value_or(""), row.text == nullptr ? "" : row.text) << row.name;
    }
}

TEST(AlphaIdentifier, IsWrittenInTheShortestCoding) {
    const struct {
        const char* text;
        std::size_t capacity;
        const char* octets;  // hex; null: no room
    } rows[] = {
        {"Ann€", 7, "416e6e1b65ffff"},
        {"", 2, "ffff"},
        {"Ж", 5, "800416ffff"},
        {"ЖЖЖ", 6, "810308969696"},
        {"Anna Ж", 9, "810608416e6e612096"},
        {"ЖЖЖ", 5, nullptr},
        {"\u0532-\u0583-\u0532", 9, "82050532802dd12d80"},
        {"中a😀", 9, "804e2d0061d83dde00"},
        {"\xFF", 3, "80fffd"},
    };
    for (const auto& row : rows) {
        const auto record = encodeAlphaIdentifier(row.text, row.capacity);
        ASSERT_EQ(record.has_value(), row.octets != nullptr) << row.text;
        if (!record)
            continue;
        EXPECT_EQ(hex(*record), row.octets);
        EXPECT_EQ(decodeAlphaIdentifier(*record), row.text[0] == '\xFF' ? "\uFFFD" : row.text);
    }
    EXPECT_FALSE(encodeAlphaIdentifier(std::string(254, 'x') + "ЖЖ", 300)) << "256 octets";
}

}  // namespace
}  // namespace plr
