#include <gmock/gmock.h>

#include <iomanip>
#include <limits>
#include <locale>
#include <sstream>

#include "plr/log.h"

namespace {

using namespace plr;
using testing::ElementsAre;

TEST(LogLevel, HasNamesLettersAndAnOrder) {
    const struct {
        int value;
        const char* name;
        char letter;
    } rows[] = {{0, "Unset", '?'},   {1, "Always", '?'},  {10, "Trace", 'T'}, {20, "Debug", 'D'},
                {40, "Info", 'I'},   {50, "Notice", 'N'}, {70, "Warn", 'W'},  {80, "Error", 'E'},
                {100, "Fatal", 'F'}, {255, "Never", '?'}, {30, "???", '?'}};
    for (const auto& row : rows) {
        EXPECT_STREQ(asString(static_cast<LogLevel>(row.value)), row.name);
        EXPECT_EQ(asChar(static_cast<LogLevel>(row.value)), row.letter) << row.name;
    }
    using enum LogLevel;
    EXPECT_EQ(combine(Never, Debug), Never);
    EXPECT_EQ(combine(Debug, Never), Never);
    EXPECT_EQ(max(Unset, Never), Never);
}

struct Grouping : std::numpunct<char> {
    char do_thousands_sep() const override { return '\''; }
    std::string do_grouping() const override { return "\3"; }
    char do_decimal_point() const override { return ','; }
};

template <class Output>
void writeNumbers(Output& output) {
    for (const long long bits : {0LL, -1LL, 42LL, -1234567LL, 0x7FEDCBA987654321LL})
        output << static_cast<int>(bits) << static_cast<unsigned>(bits) << static_cast<long>(bits)
               << bits << static_cast<unsigned long long>(bits);
    for (const double value :
         {0.0, -0.0, 1.0 / 3, 1e100, 123456789.0, -2.5e-7, std::numeric_limits<double>::infinity(),
          std::numeric_limits<double>::quiet_NaN()})
        output << value << static_cast<float>(value);
    output << reinterpret_cast<const void*>(2) << static_cast<const void*>(nullptr);
}

// Formatting reaches what a standard stream would write with it.
TEST(LogMessageBuffer, WritesNumbersAsAStandardStreamWould) {
    const std::locale grouped(std::locale::classic(), new Grouping);
    for (const std::locale& locale : {std::locale::classic(), grouped}) {
        const std::locale before = std::locale::global(locale);
        LogMessageBuffer buffer;
        std::ostringstream standard;
        writeNumbers(buffer);
        writeNumbers(standard);
        EXPECT_EQ(buffer.str(), standard.str());
        buffer << std::hex << std::showbase << std::setprecision(3) << std::setw(9);
        standard << std::hex << std::showbase << std::setprecision(3) << std::setw(9);
        writeNumbers(buffer);
        writeNumbers(standard);
        EXPECT_EQ(buffer.str(), standard.str());
        std::locale::global(before);
    }
}

TEST(LogMessageBuffer, WritesTextsPastTheStream) {
    LogMessageBuffer buffer;
    buffer << 'c' << std::setfill('*') << std::setw(4) << "text" << std::string("s") << true << 7;
    EXPECT_EQ(buffer.str(), "ctextstrue***7");
    buffer << std::setw(4) << 7;
    EXPECT_EQ(buffer.str(), "ctextstrue***7   7") << "str() ends the stream";
}

TEST(LogMessageBuffer, GivesEachBufferAStreamWithoutAPast) {
    {
        LogMessageBuffer used;
        std::ostream& stream = used;
        stream.imbue(std::locale(std::locale::classic(), new Grouping));
        stream << std::hex << std::setfill('#') << std::setw(7) << 0xABCDEF;
        stream.iword(0) = 5;
        stream.setstate(std::ios_base::failbit);
        stream.width(12);
        EXPECT_EQ(used.str(), "abc'def");
    }
    LogMessageBuffer buffer;
    EXPECT_TRUE(buffer.empty());
    EXPECT_EQ(static_cast<std::ostream&>(buffer).iword(0), 0);
    EXPECT_FALSE(buffer.empty()) << "it has a stream";
    EXPECT_EQ(buffer.str(), "");
    EXPECT_TRUE(buffer.empty());
    static_cast<std::ostream&>(buffer) << 1234567 << ' ' << 0.5;
    EXPECT_EQ(buffer.str(), "1234567 0.5");
}

TEST(LogMessageBuffer, FormatsTextsOfAnyLength) {
    for (const int length : {0, 1, 62, 63, 64, 65, 127, 128, 5000}) {
        LogMessageBuffer buffer = LogMessageBuffer::createWithFormat("%*s", length, "");
        EXPECT_EQ(buffer.str(), std::string(static_cast<std::size_t>(length), ' '));
    }
}

TEST(LogMessageBuffer, CopiesMovesAndMergesTextAndMetadata) {
    LogMessageBuffer one;
    one << std::hex << 255 << MetaData("a");
    LogMessageBuffer copy(one);
    copy << 16;  // decimal: a copy has no stream
    EXPECT_EQ(copy.str(), "ff16");
    one << 16;
    LogMessageBuffer two;
    two << "two" << MetaData("b") << MetaData("c");
    one << two << '+' << std::move(two);
    EXPECT_EQ(one.takeString(), "ff10two+two");
    EXPECT_THAT(one.takeMetadata(), ElementsAre("a", "b", "c", "b", "c"));

    LogMessageBuffer moved = LogMessageBuffer() << "in one " << 1 << ' ' << LogLevel::Warn << true;
    moved.merge(moved);
    EXPECT_EQ(moved.str(), "in one 1 Warntruein one 1 Warntrue");
}

TEST(LogMessageBuffer, TakesThePlatformsObjects) {
    ObString* const format = ob_string_create("%@ is %d, %@");
    ObString* const string = ob_string_create_with_length("a\0b", 3);
    ObNumber* const number = ob_number_create_double(0.1);
    LogMessageBuffer buffer = LogMessageBuffer::createWithObFormat(format, string, 5, nullptr);
    buffer << ' ' << string << number << static_cast<ObString*>(nullptr)
           << static_cast<ObNumber*>(nullptr);
    EXPECT_EQ(buffer.str(), std::string("a\0b is 5, (null) a\0b0.1<nil><nil>", 33));
    EXPECT_TRUE(LogMessageBuffer::createWithObFormat(nullptr).empty());
    EXPECT_EQ(ob_get_reference_count(number), 1);
    ob_release(number);
    ob_release(string);
    ob_release(format);
}

TEST(LogMessage, LeavesNothingToTheNextOne) {
    for (const std::size_t length : {2000U, 3U, 0U, 121U, 3U, 120U}) {
        SCOPED_TRACE(length);
        LogMessageBuffer buffer;
        buffer << std::string(length, 'x');
        if (length > 120)
            buffer << MetaData("m");
        auto message =
            LogMessage::create(7, LogLevel::Warn, "a.domain.that.is.not.short", std::move(buffer));
        EXPECT_TRUE(buffer.empty());
        const std::weak_ptr<LogMessage> late = message;
        const LogMessage copy(*message);
        message = nullptr;
        EXPECT_TRUE(late.expired());
        EXPECT_EQ(copy.getDomain(), "a.domain.that.is.not.short");
        EXPECT_EQ(copy.getText(), std::string(length, 'x'));
        EXPECT_EQ(copy.getMetaData().size(), length > 120 ? 1U : 0U);
        EXPECT_EQ(copy.getTimeStamp(), 7);
        EXPECT_EQ(copy.getExtra(), "");
    }
}

// Queues that are numbered 1 and 2.
class LogTags : public testing::Test {
  protected:
    LogTags() {
        reset_last_tag();
        maybe_add_logging_tag(first);
        add_logging_tag(second);
    }
    const dispatch::queue first = dispatch::queue::create("first");
    const dispatch::queue second = dispatch::queue::create("second");
};

TEST_F(LogTags, NumberQueuesInTheOrderOfTheCalls) {
    const auto numberOf = [](const dispatch::queue& queue) {
        return reinterpret_cast<std::uintptr_t>(queue.get_specific(kLoggingTagKey));
    };
    maybe_add_logging_tag(first);
    EXPECT_EQ(numberOf(first), 1U);
    EXPECT_EQ(numberOf(second), 2U);
    last_tag = std::numeric_limits<std::uint32_t>::max();
    add_logging_tag(first);
    EXPECT_EQ(numberOf(first), 1U) << "0 is no tag";
}

TEST_F(LogTags, ShowTheQueuesThatAThreadIsIn) {
    std::thread([this] {
        first.sync([this] {
            const LogTag outer;
            second.sync([] {
                const LogTag inner;
                EXPECT_EQ(get_current_logging_tag(), "1+,2+");
                EXPECT_EQ(get_current_logging_tag(), "1,2");
                const LogTag again;
                EXPECT_EQ(get_current_logging_tag(), "1,2,2+");
            });
            EXPECT_EQ(get_current_logging_tag(), "1");
        });
        EXPECT_EQ(get_current_logging_tag(), "");
    }).join();
}

TEST_F(LogTags, LeaveTheirEntryBehindWhenAnotherIsMovedIntoThem) {
    std::thread([] {
        {
            LogTag kept;
            LogTag moved;
            kept = std::move(moved);
        }
        EXPECT_EQ(get_current_logging_tag(), "0+") << "outside of queues, and one too many";
    }).join();
}

}  // namespace
