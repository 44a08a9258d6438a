#include "examples/at_line.h"

#include <gtest/gtest.h>

namespace radio {
namespace {

// The fields of a line between bars; a string constant with its quotes.
std::string shown(const std::optional<AtLine>& line) {
    if (!line)
        return "refused";
    std::string text = line->name;
    for (const AtField& field : line->fields)
        text += '|' + (field.quoted ? '"' + field.text + '"' : field.text);
    return text;
}

TEST(AtLine, IsTakenApart) {
    const struct {
        const char* line;
        const char* parts;
    } rows[] = {
        {"RING", "RING"},
        {"NO CARRIER", "NO CARRIER"},
        {"+CREG: 1,\"1A2B\",\"0C3D4E5F\",7", "+CREG|1|\"1A2B\"|\"0C3D4E5F\"|7"},
        {"+CREG: 2", "+CREG|2"},
        {"+CSQ:23,99", "+CSQ|23|99"},
        {"  +CSQ:  23 , 99  ", "+CSQ|23|99"},
        {"+COPS: 0", "+COPS|0"},
        {"+COPS: 0,0,\"Example, Inc.\",7", "+COPS|0|0|\"Example, Inc.\"|7"},
        {"+CLIP: \"+4915112345678\",145,,,\"Ann: home\",0",
         "+CLIP|\"+4915112345678\"|145|||\"Ann: home\"|0"},
        {"+CLIP: \"\",128", "+CLIP|\"\"|128"},
        {"+CUSD: 0,", "+CUSD|0|"},
        {"+CPIN: SIM PIN", "+CPIN|SIM PIN"},
        {"+CGEV:", "+CGEV|"},
        {"", "refused"},
        {"   ", "refused"},
        {"+", "refused"},
        {": 1", ": 1"},
        {"+: 1", "refused"},
        {"+COPS: 0,0,\"Example", "refused"},
        {"+COPS: 0,0,Exa\"mp\"le", "refused"},
        {"+COPS: 0,0,\"a\"b\"", "refused"},
        {"+COPS: 0,0,\"a\"\"b\"", "refused"},
        {"\"RING\"", "refused"},
        {"RI\x01NG", "refused"},
        {"+COPS: 0,0,\"Caf\xc3\xa9\"", "refused"},
    };
    for (const auto& row : rows)
        EXPECT_EQ(shown(parseAtLine(row.line)), row.parts) << row.line;
    using namespace std::string_view_literals;
    EXPECT_EQ(shown(parseAtLine("RING\0"sv)), "refused") << "a NUL byte";
}

TEST(AtField, ReadsNumbersOnlyFromWhatIsOne) {
    const struct {
        AtField field;
        std::optional<unsigned> number, hex;
    } rows[] = {
        {{"0", false}, 0, 0},
        {{"31", false}, 31, 0x31},
        {{"4294967295", false}, 4294967295, std::nullopt},
        {{"4294967296", false}, std::nullopt, std::nullopt},
        {{"31", true}, std::nullopt, 0x31},
        {{"1A2b", true}, std::nullopt, 0x1A2B},
        {{"FFFFFFFF", true}, std::nullopt, 0xFFFFFFFF},
        {{"1FFFFFFFF", true}, std::nullopt, std::nullopt},
        {{"-1", false}, std::nullopt, std::nullopt},
        {{"+1", false}, std::nullopt, std::nullopt},
        {{"1 2", false}, std::nullopt, std::nullopt},
        {{"0x1A", true}, std::nullopt, std::nullopt},
        {{"", false}, std::nullopt, std::nullopt},
    };
    for (const auto& row : rows) {
        EXPECT_EQ(row.field.number(), row.number) << row.field.text;
        EXPECT_EQ(row.field.hex(), row.hex) << row.field.text;
    }
}

TEST(AtLine, FieldsPastTheEndAreMissing) {
    const auto line = parseAtLine("+CREG: 1,,\"\"");
    ASSERT_TRUE(line);
    EXPECT_FALSE(line->field(0).missing());
    EXPECT_TRUE(line->field(1).missing());
    EXPECT_FALSE(line->field(2).missing()) << "an empty string is there";
    EXPECT_TRUE(line->field(3).missing());
}

}  // namespace
}  // namespace radio
