#include "plr/format/bitfield_log.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "plr/format/binary.h"
#include "plr/log/static_logger.h"
#include "support/log_fixture.h"

namespace {

using plr::kSpacesForBitField;
using plr::LogLevel;
using testing::ElementsAre;
using testing::IsEmpty;

class BitFieldLog : public plr::test::LogFixture {
  protected:
    BitFieldLog() { logger_.setLogLevel(LogLevel::Debug); }

    // What is logged of a field of these bytes, without level and domain.
    std::vector<std::string> straddle(int position, int width) {
        plr::logStraddlingBitField(logger_, position, width, bytes_, 0x10, "desc");
        std::vector<std::string> lines = takeLines();
        for (std::string& line : lines) {
            EXPECT_TRUE(line.starts_with("D d ")) << line;
            line.erase(0, 4);
        }
        return lines;
    }

    plr::StaticLogger logger_{std::string("d"), server_};
    const std::vector<unsigned char> bytes_{0xA5, 0x3C, 0x96};
};

std::string picture(const std::string& bits) {
    return kSpacesForBitField + bits;
}

TEST_F(BitFieldLog, OneByte) {
    EXPECT_EQ(kSpacesForBitField, std::string(14, ' '));
    plr::logBitFieldWithDesc(logger_, 0xB0, {4, 7}, "text");
    plr::logBitFieldWithDesc(logger_, 0xB0, {4, 7},
                             [](unsigned char field) { return "is " + std::to_string(field); });
    plr::logBitFieldWithDesc(logger_, 0xB0, {7, 4}, std::function<std::string(unsigned char)>());
    EXPECT_THAT(takeLines(),
                ElementsAre("D d " + picture("1011----    text"),
                            "D d " + picture("1011----    is 11"), "D d " + picture("    ")));
}

TEST_F(BitFieldLog, NothingIsComposedAboveDebug) {
    logger_.setLogLevel(LogLevel::Info);
    plr::logBitFieldWithDesc(logger_, 1, {0, 1}, "text");
    plr::logBitFieldWithDesc(logger_, 1, {0, 1}, [](unsigned char) -> std::string {
        ADD_FAILURE() << "called";
        return {};
    });
    EXPECT_THAT(straddle(12, 9), IsEmpty());
    EXPECT_THAT(straddle(99, 9), IsEmpty());
}

TEST_F(BitFieldLog, LinesOfAStraddlingField) {
    const std::string first = "0010    a5    10100101    ";
    const std::string second = "0011    3c    00111100    ";
    const std::string invalid = "Invalid current byte position";
    EXPECT_THAT(straddle(3, 3), ElementsAre(first, picture("101-----    desc")));
    EXPECT_THAT(straddle(5, 2), ElementsAre(picture("---00---    desc")));
    EXPECT_THAT(straddle(8, 8), ElementsAre(first + "desc"));
    EXPECT_THAT(straddle(16, 16), ElementsAre(first, second + "desc"));
    EXPECT_THAT(straddle(19, 14),
                ElementsAre(picture("-----101    "), second, "0012    96    10010110    ",
                            picture("100-----    desc")));
    EXPECT_THAT(straddle(25, 2), ElementsAre(picture("-------0    "), invalid));
    EXPECT_THAT(straddle(30, 4), ElementsAre(invalid));
    EXPECT_THAT(straddle(0, 8), ElementsAre(invalid));
    EXPECT_THAT(straddle(-2147483647, 2147483647), ElementsAre(invalid));
    EXPECT_THAT(straddle(2147483647, -2147483647), ElementsAre(invalid));
    // Up to 7 bits before the first byte, the field is in that byte, above its bits.
    EXPECT_THAT(straddle(2, 3), ElementsAre(picture("10------    desc")));
    EXPECT_THAT(straddle(1, 8), ElementsAre(first + "desc"));
    EXPECT_THAT(straddle(9, 10), ElementsAre(picture("    "), second, picture("0-------    desc")));
    EXPECT_THAT(straddle(8, 0), ElementsAre(second, picture("    desc")));
    EXPECT_THAT(straddle(3, -1), ElementsAre(picture("    desc")));
    EXPECT_THAT(straddle(-249, -250), ElementsAre(picture("    desc")));
}

TEST_F(BitFieldLog, EveryPositionAndWidthShowsTheFieldsBits) {
    const std::string all =
        plr::binary0(bytes_[0]) + plr::binary0(bytes_[1]) + plr::binary0(bytes_[2]);
    for (int position = 1; position <= 24; ++position) {
        for (int width = 1; width <= position; ++width) {
            std::string shown;
            std::string whole;  // of a byte's line, unless a picture follows
            for (const std::string& line : straddle(position, width)) {
                shown += line.starts_with(kSpacesForBitField) ? "" : whole;
                whole = line.starts_with(kSpacesForBitField) ? "" : line.substr(14, 8);
                if (whole.empty())
                    for (const char character : line.substr(14, 8))
                        shown += character == '-' ? "" : std::string(1, character);
            }
            EXPECT_EQ(shown + whole, all.substr(static_cast<std::size_t>(position - width),
                                                static_cast<std::size_t>(width)))
                << position << ", " << width;
        }
    }
}

}  // namespace
