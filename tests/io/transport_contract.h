#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <functional>
#include <future>
#include <memory>
#include <string>

#include "Pelorin"
#include "support/debug_records.h"
#include "support/waiting.h"

// What every transport does. A test program includes this and says
//   INSTANTIATE_TEST_SUITE_P(Fd, TransportContract, testing::Values(TransportCase{…}));
namespace plr::test {

// A transport with its other side.
class TransportPeer {
  public:
    TransportPeer() = default;
    TransportPeer(const TransportPeer&) = delete;
    TransportPeer& operator=(const TransportPeer&) = delete;
    virtual ~TransportPeer() { PelorinTransportFree(&transport); }
    // Descriptors of the other side: what is written to `in` can be read from the
    // transport, what the transport writes is read from `out`.
    [[nodiscard]] virtual int in() const = 0;
    [[nodiscard]] virtual int out() const = 0;

    void send(const std::string& text) const {
        EXPECT_EQ(::write(in(), text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }
    [[nodiscard]] std::string receive(std::size_t length) const {
        std::string text(length, '\0');
        const auto boundMs = static_cast<std::uint32_t>(std::chrono::milliseconds(kBound).count());
        return PelorinUnblockableReadToCompletionWithTimeout(
                   out(), -1, text.data(), static_cast<std::uint32_t>(length), boundMs)
                   ? text
                   : "nothing";
    }

    PelorinTransport transport{};
};

struct TransportCase {
    const char* name;
    std::function<std::unique_ptr<TransportPeer>()> make;
    bool nothingReadIsSuccess = true;  // the result of a read that was unblocked
    bool unblocksCount = true;         // one unblock for each read; else one for all
    bool readsToCompletion = true;
    friend void PrintTo(const TransportCase& self, std::ostream* out) { *out << self.name; }
};

// A read as its result and what it read.
struct TransportRead {
    bool success = false;
    std::string text;
    bool operator==(const TransportRead&) const = default;
    friend void PrintTo(const TransportRead& self, std::ostream* out) {
        *out << self.success << " \"" << self.text << "\"";
    }
};
inline TransportRead readFrom(PelorinTransport& transport, std::uint32_t most,
                              bool toCompletion = false,
                              std::uint32_t timeoutMs = PELORIN_FOREVER) {
    std::string text(most, '\0');
    std::uint32_t count = 0xEEEE;
    const bool success =
        transport.read(&transport, text.data(), most, &count, toCompletion, timeoutMs, nullptr);
    text.resize(std::min<std::size_t>(count, text.size()));
    return {success, text};
}

class TransportContract : public testing::TestWithParam<TransportCase> {
  protected:
    void SetUp() override { ASSERT_TRUE(transport.isValid && transport.isValid(&transport)); }
    [[nodiscard]] TransportRead nothing() const { return {GetParam().nothingReadIsSuccess, ""}; }

    DebugRecords records_;
    std::unique_ptr<TransportPeer> peer_ = GetParam().make();
    PelorinTransport& transport = peer_->transport;
};
GTEST_ALLOW_UNINSTANTIATED_PARAMETERIZED_TEST(TransportContract);

TEST_P(TransportContract, BytesGoBothWays) {
    std::uint32_t count = 0;
    EXPECT_TRUE(transport.write(&transport, "AT\r", 3, &count, true, PELORIN_FOREVER, nullptr));
    EXPECT_EQ(count, 3u);
    EXPECT_EQ(peer_->receive(3), "AT\r");
    EXPECT_TRUE(transport.write(&transport, "+", 1, &count, false, 0, nullptr));
    EXPECT_EQ(count, 1u);
    EXPECT_EQ(peer_->receive(1), "+");
    peer_->send("OKAY");
    std::string got;
    while (got.size() < 4 && !HasFailure()) {
        const TransportRead read = readFrom(transport, 3);
        EXPECT_TRUE(read.success);
        got += read.text;
    }
    EXPECT_EQ(got, "OKAY");
}

TEST_P(TransportContract, AReadToCompletionWaitsForAll) {
    peer_->send("ab");
    auto later = std::async(std::launch::async, [&] { return readFrom(transport, 4, true).text; });
    peer_->send("cd");
    EXPECT_EQ(later.get(), GetParam().readsToCompletion ? "abcd" : "");
}

TEST_P(TransportContract, AnUnblockEndsOneReadThatWaitsAndNoLaterOne) {
    auto waiting = std::async(std::launch::async, [&] { return readFrom(transport, 4); });
    EXPECT_TRUE(transport.unblockRead(&transport));
    EXPECT_EQ(waiting.get(), nothing());
    auto later = std::async(std::launch::async, [&] { return readFrom(transport, 1); });
    peer_->send("z");
    EXPECT_EQ(later.get(), (TransportRead{true, "z"}));
}

TEST_P(TransportContract, EachUnblockEndsARead) {
    if (!GetParam().unblocksCount)
        GTEST_SKIP() << "one unblock ends all reads";
    for (int i = 0; i < 3; i++)
        EXPECT_TRUE(transport.unblockRead(&transport));
    peer_->send("x");
    for (int i = 0; i < 3; i++)
        EXPECT_EQ(readFrom(transport, 4), nothing());
    EXPECT_EQ(readFrom(transport, 4), (TransportRead{true, "x"}));
}

TEST_P(TransportContract, AFlushDiscardsWhatCame) {
    peer_->send(std::string(3000, 'j'));
    EXPECT_EQ(readFrom(transport, 1).text, "j");
    EXPECT_TRUE(transport.flushRead(&transport));
    peer_->send("fresh");
    EXPECT_EQ(readFrom(transport, 1).text, "f");
}

TEST_P(TransportContract, TheLastArgumentMustBeNull) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    std::uint32_t count = 0;
    char byte = 'b';
    EXPECT_DEATH(transport.write(&transport, &byte, 1, &count, true, 0, &byte), "!dDtor");
    EXPECT_DEATH(transport.read(&transport, &byte, 1, &count, false, 0, &byte), "!dDtor");
}

TEST_P(TransportContract, FreeingLeavesAnEmptyRecord) {
    for (const auto* entries : {transport.reserved, transport.reserved2})
        EXPECT_TRUE(entries[0] == nullptr && entries[1] == nullptr);
    static_cast<void>(transport.unblockRead(&transport));
    EXPECT_TRUE(PelorinTransportFree(&transport));
    const PelorinTransport empty{};
    EXPECT_EQ(std::memcmp(&transport, &empty, sizeof empty), 0);
    EXPECT_TRUE(PelorinTransportFree(&transport));
}

}  // namespace plr::test
