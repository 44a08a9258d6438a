#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <string>
#include <string_view>
#include <thread>
#include <vector>

#include "Pelorin"
#include "plr/test/fake_transport.h"
#include "src/io/secret_mask.h"
#include "support/failing_allocations.h"
#include "support/tap_records.h"

namespace {

using plr::test::FakeTransport;
using plr::test::TapRecords;

// A tap on a fake line.
struct Tapped {
    FakeTransport line;
    TapRecords records;
    PelorinTransport tap{};
    std::string got;

    explicit Tapped(const std::vector<const char*>& secrets = {}) {
        const PelorinTransportTapConfig config = {&TapRecords::sink, &records,
                                                  secrets.empty() ? nullptr : secrets.data(),
                                                  static_cast<std::uint32_t>(secrets.size())};
        EXPECT_TRUE(PelorinTransportCreateTap(&tap, &line.transport, &config));
    }
    Tapped(const Tapped&) = delete;
    Tapped& operator=(const Tapped&) = delete;
    ~Tapped() { EXPECT_TRUE(PelorinTransportFree(&tap)); }

    bool write(std::string_view bytes) {
        std::uint32_t count = 0;
        return tap.write(&tap, bytes.data(), static_cast<std::uint32_t>(bytes.size()), &count, true,
                         0, nullptr);
    }
    bool read(const std::string& bytes, bool toCompletion = false) {
        std::uint32_t count = 0;
        line.input = bytes;
        got.resize(bytes.size() + 1);
        const bool success = tap.read(&tap, got.data(), static_cast<std::uint32_t>(got.size()),
                                      &count, toCompletion, 0, nullptr);
        got.resize(count);
        return success;
    }
    [[nodiscard]] std::string shownOf(const std::string& bytes) {
        records.all.clear();
        read(bytes);
        return records.bytes('<');
    }
};

std::string zeroed(std::string text) {
    std::ranges::replace_if(
        text, [](char c) { return c >= '1' && c <= '9'; }, '0');
    return text;
}

TEST(TapTransport, PassesExchangesOnAndShowsThem) {
    Tapped tapped;
    EXPECT_TRUE(tapped.write("AT\r"));
    EXPECT_TRUE(tapped.read("\r\nOK\r\n"));
    EXPECT_EQ(tapped.line.output + tapped.got, "AT\r\r\nOK\r\n");
    EXPECT_TRUE(tapped.read(""));
    EXPECT_TRUE(tapped.tap.unblockRead(&tapped.tap));
    EXPECT_EQ(tapped.line.unblocks, 1);
    tapped.line.succeeds = false;
    tapped.line.mostWritten = 1;
    errno = ETIMEDOUT;
    EXPECT_FALSE(tapped.write("AT\r"));
    EXPECT_FALSE(tapped.read("x"));
    EXPECT_FALSE(tapped.tap.flushRead(&tapped.tap));
    EXPECT_FALSE(tapped.tap.isValid(&tapped.tap));
    EXPECT_EQ(errno, ETIMEDOUT);

    const std::array expected = {"> 3 bytes, ok",     "< 6 bytes, ok",     "< 0 bytes, ok",
                                 "> 1 bytes, failed", "< 1 bytes, failed", "< flush, failed"};
    ASSERT_EQ(tapped.records.all.size(), expected.size());
    for (std::size_t i = 0; i < expected.size(); ++i) {
        const auto& record = tapped.records.all[i];
        EXPECT_EQ(record.heading, expected[i]);
        EXPECT_EQ(zeroed(record.time), "0000-00-00T00:00:00.000000Z");
        EXPECT_TRUE(record.columnsAgree);
    }
    EXPECT_EQ(tapped.records.bytes('>'), "AT\rA");
    EXPECT_EQ(tapped.records.bytes('<'), "\r\nOK\r\nx");
}

TEST(TapTransport, RefusesWhatItCannotShowOrHide) {
    const std::string longest = std::string(plr::io::SecretMask::kLongestPattern - 1, 'x') + "*#";
    const std::string tooLong = "x" + longest;
    PelorinTransport inner = {};
    const auto takes = [&inner](PelorinTransportTapSink sink, const char* secret) {
        const PelorinTransportTapConfig config = {sink, nullptr, &secret, 1};
        PelorinTransport tap;
        const bool taken = PelorinTransportCreateTap(&tap, &inner, &config);
        // Nor does it have an operation that the inner transport lacks.
        EXPECT_FALSE(tap.write || tap.read || tap.unblockRead || tap.flushRead || tap.isValid);
        return PelorinTransportFree(&tap) && taken;
    };
    EXPECT_TRUE(takes(&TapRecords::sink, longest.c_str()));
    EXPECT_FALSE(takes(&TapRecords::sink, tooLong.c_str()));
    EXPECT_FALSE(takes(&TapRecords::sink, "nothing secret*"));
    EXPECT_FALSE(takes(&TapRecords::sink, "PIN #\r")) << "no line has its end in it";
    EXPECT_FALSE(takes(nullptr, "#"));
}

// Texts whose secret digits, and only they, are sevens.
const std::array kTexts = {std::string("AT+CPIN=\"7777\"\r"), std::string("at+cpin2 = 777\r\n"),
                           std::string("AT+CPWD=\"SC\",\"777\",\"77\"\r"),
                           std::string("AT+CLCK=\"SC\",1,\"7777\"\r"),
                           std::string("\r\n+X: 77777777777777\r\n")};

std::string hidden(std::string text) {
    std::ranges::replace(text, '7', '*');
    return text;
}
// Without the digits that are no secret: in front of a cut, they might have been.
std::string blurred(std::string text) {
    std::ranges::replace_if(
        text, [](char c) { return c >= '0' && c <= '9' && c != '7'; }, '*');
    return text;
}

TEST(TapTransport, HidesSecretsHoweverTheyAreCut) {
    const auto show = [](const std::vector<std::string>& pieces) {
        Tapped tapped;
        for (const std::string& piece : pieces) {
            tapped.write(piece);
            tapped.read(piece);
        }
        EXPECT_EQ(tapped.records.bytes('<'), tapped.records.bytes('>'));
        return blurred(tapped.records.bytes('<'));
    };
    for (const std::string& text : kTexts) {
        EXPECT_EQ(Tapped().shownOf(text), hidden(text));  // in one piece
        const std::string expected = blurred(hidden(text));
        for (std::size_t i = 0; i <= text.size(); ++i)
            for (std::size_t k = i; k <= text.size(); ++k)
                EXPECT_EQ(show({text.substr(0, i), text.substr(i, k - i), text.substr(k)}),
                          expected);
        std::vector<std::string> bytes;
        for (const char byte : text)
            bytes.emplace_back(1, byte);
        EXPECT_EQ(show(bytes), expected);
    }
}

TEST(TapTransport, ShowsDigitsThatAreNoSecret) {
    Tapped tapped;
    for (const char* text : {"\r\n+CSQ: 20,99\r\n", "AT+CLCK=\"SC\",2\r", "+CPIN=\r1234\r",
                             "1234567890123\r", "+CPIN: SIM PIN2\r\n"})
        EXPECT_EQ(tapped.shownOf(text), text);
    Tapped own({"pin*##", "A#B", "#*!"});
    EXPECT_EQ(own.shownOf("PIN 1 22 333\ra123b A2C\r1 2!\r3\r!"),
              "PIN 1 ** ***\ra***b A2C\r* *!\r3\r!");
}

TEST(TapTransport, HidesSecretsInLongLinesAndLargeExchanges) {
    for (std::size_t blanks = 480; blanks < 600; ++blanks) {
        // Behind its start, across a piece's end; before it, digits that are no secret.
        std::string text = "AT+CPWD=";
        text.append(blanks, ' ').append("777\r").append(blanks, ' ');
        text.append("1234568890,77777777777777\r");
        ASSERT_EQ(Tapped().shownOf(text), hidden(text)) << blanks;
    }
    Tapped tapped;
    tapped.write(std::string(1500, 'x'));
    EXPECT_EQ(tapped.records.all.at(2).heading, "> 1500 bytes, ok, from byte 1024");
    EXPECT_EQ(tapped.records.bytes('>'), std::string(1500, 'x'));
}

TEST(TapTransport, HidesTheRestOfALineThatLostBytes) {
    Tapped tapped;
    tapped.read("AT+CPIN");
    tapped.tap.flushRead(&tapped.tap);
    EXPECT_EQ(tapped.shownOf("7\"\r1,2\r"), "*\"\r1,2\r");
    tapped.line.succeeds = false;
    tapped.read("", true);
    EXPECT_EQ(tapped.shownOf("7\"\r1,2\r"), "*\"\r1,2\r");
}

TEST(TapTransport, ShowsReaderAndWriterOneAtATime) {
    FakeTransport line;
    struct Context {
        std::atomic<int> inside{0};
        int shown = 0;
    } context;
    const PelorinTransportTapConfig config = {[](void* opaque, const char*) {
                                                  auto& seen = *static_cast<Context*>(opaque);
                                                  EXPECT_EQ(seen.inside.fetch_add(1), 0);
                                                  ++seen.shown;
                                                  --seen.inside;
                                              },
                                              &context, nullptr, 0};
    PelorinTransport tap;
    ASSERT_TRUE(PelorinTransportCreateTap(&tap, &line.transport, &config));
    constexpr int kTimes = 1000;
    std::thread writer([&tap] {
        std::uint32_t count = 0;
        for (int i = 0; i < kTimes; ++i)
            tap.write(&tap, "", 0, &count, true, 0, nullptr);
    });
    plr::test::succeedingAllocations = 0;  // of this thread, which makes none
    for (int i = 0; i < kTimes; ++i) {
        std::uint32_t count = 0;
        char byte = 0;
        tap.read(&tap, &byte, 1, &count, false, 0, nullptr);
    }
    plr::test::succeedingAllocations = -1;
    writer.join();
    EXPECT_EQ(context.shown, 2 * kTimes);
    EXPECT_TRUE(PelorinTransportFree(&tap));
}

}  // namespace
