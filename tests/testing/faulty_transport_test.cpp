#include "plr/test/faulty_transport.h"

#include <gtest/gtest.h>

#include <string>

#include "plr/test/fake_transport.h"

namespace {

using plr::test::FakeTransport;
using plr::test::FaultyTransport;

struct Line {
    FakeTransport inner;
    FaultyTransport faulty{inner.transport};

    // What one read gives; "!" in front when it failed.
    std::string read(std::uint32_t length, bool toCompletion = false) {
        std::string bytes(length, '\0');
        std::uint32_t count = 99;
        PelorinTransport& line = faulty.transport();
        const bool result =
            line.read(&line, bytes.data(), length, &count, toCompletion, 0, nullptr);
        return (result ? "" : "!") + bytes.substr(0, count);
    }
    // The bytes that one write took; "!" in front when it failed.
    std::string write(const std::string& bytes, bool toCompletion = false) {
        std::uint32_t count = 99;
        PelorinTransport& line = faulty.transport();
        const bool result =
            line.write(&line, bytes.data(), static_cast<std::uint32_t>(bytes.size()), &count,
                       toCompletion, 0, nullptr);
        return (result ? "" : "!") + bytes.substr(0, count);
    }
};

TEST(FaultyTransport, PassesPieces) {
    Line line;
    line.inner.input = "abcdef";
    EXPECT_EQ(line.read(2), "ab");
    line.faulty.setMostAtOnce(1);
    EXPECT_EQ(line.read(2), "c");
    EXPECT_EQ(line.read(2, true), "de");
    EXPECT_EQ(line.write("xyz"), "x");
    EXPECT_EQ(line.write("xyz", true), "xyz");
    EXPECT_EQ(line.inner.output, "xxyz");
}

TEST(FaultyTransport, InterruptsReads) {
    Line line;
    line.inner.input = "abc";
    line.faulty.interruptReads(2);
    EXPECT_EQ(line.read(1), "");
    EXPECT_EQ(line.read(1, true), "!");
    EXPECT_EQ(line.read(1), "a");
}

TEST(FaultyTransport, DiesAtAnyByte) {
    Line line;
    PelorinTransport& transport = line.faulty.transport();
    line.inner.input = "abcdef";
    line.faulty.dieAfter(4);
    EXPECT_EQ(line.read(3), "abc");
    EXPECT_TRUE(transport.isValid(&transport));
    EXPECT_EQ(line.write("xy", true), "!x");
    EXPECT_FALSE(transport.isValid(&transport));
    EXPECT_FALSE(transport.flushRead(&transport));
    EXPECT_EQ(line.write("y"), "!");
    EXPECT_EQ(line.read(3), "!");
    line.faulty.dieAfter(2);
    EXPECT_EQ(line.read(3), "de");
    EXPECT_EQ(line.inner.output, "x");
}

}  // namespace
