// What every transport does.

#include <sys/stat.h>

#include <cstring>
#include <functional>
#include <future>

#include "io/serial_line.h"
#include "io/uart_device.h"
#include "support/descriptors.h"
#include "support/scratch_folder.h"

namespace plr::test {
namespace {

using Got = OpenTransport::Got;

// A transport with its other side: what is written to `in` can be read from it, what it
// writes is read from `out`.
struct Peer {
    virtual ~Peer() = default;
    void send(const std::string& text) const {
        EXPECT_EQ(::write(in, text.data(), text.size()), static_cast<ssize_t>(text.size()));
    }
    [[nodiscard]] std::string receive(std::uint32_t length) const {
        std::string text(length, '\0');
        const auto boundMs = static_cast<std::uint32_t>(std::chrono::milliseconds(kBound).count());
        return PelorinUnblockableReadToCompletionWithTimeout(out, -1, text.data(), length, boundMs)
                   ? text
                   : "nothing";
    }

    int in = -1;
    int out = -1;
    OpenTransport transport;
};

struct SocketPeer : Peer {
    SocketPeer() {
        in = out = ends.in();
        EXPECT_TRUE(PelorinTransportCreateWithFD(&transport, ends.out()));
    }
    Ends ends{SOCK_STREAM};
};

struct FifoPeer : Peer {
    FifoPeer() {
        in = open("in");
        out = open("out");
        EXPECT_TRUE(PelorinTransportCreateWithFile(&transport, folder.at("in").c_str(),
                                                   folder.at("out").c_str()));
    }
    ~FifoPeer() override {
        ::close(in);
        ::close(out);
    }
    [[nodiscard]] int open(const char* name) const {
        EXPECT_EQ(::mkfifo(folder.at(name).c_str(), 0600), 0);
        return ::open(folder.at(name).c_str(), O_RDWR | O_CLOEXEC);
    }
    ScratchFolder folder;
};

struct TerminalPeer : Peer {
    explicit TerminalPeer(bool timed) {
        in = out = line.farEnd();
        device::path = line.path();
        PelorinUARTTimeoutConfig config{"debug", 115'200, 0, 4096, 0};
        EXPECT_TRUE(timed ? PelorinTransportCreateWithUARTTimeout(&transport, &config)
                          : PelorinTransportCreateWithUART(&transport, "modem", 115'200, 1, 0));
    }
    SerialLine line;
};

struct Case {
    const char* name;
    std::function<std::unique_ptr<Peer>()> make;
    bool isTerminal = false;         // what is sent may still be on the way
    bool unblockedIsSuccess = true;  // the result of a read that was unblocked
    bool unblocksCount = true;       // three end three reads; else they are as one
    bool readsToCompletion = true;
    friend void PrintTo(const Case& self, std::ostream* out) { *out << self.name; }
};

class TransportContract : public testing::TestWithParam<Case> {
  protected:
    void SetUp() override { ASSERT_TRUE(transport.isValid && transport.isValid(&transport)); }

    const Got nothing{GetParam().unblockedIsSuccess, ""};
    const DebugRecords records;
    const std::unique_ptr<Peer> peer = GetParam().make();
    OpenTransport& transport = peer->transport;
};

INSTANTIATE_TEST_SUITE_P(
    , TransportContract,
    testing::Values(Case{"FD", std::make_unique<SocketPeer>},
                    Case{"file", std::make_unique<FifoPeer>},
                    Case{"serial", [] { return std::make_unique<TerminalPeer>(false); }, true, true,
                         false, false},
                    Case{"timed", [] { return std::make_unique<TerminalPeer>(true); }, true, false,
                         false}),
    testing::PrintToStringParamName());

TEST_P(TransportContract, BytesGoBothWays) {
    EXPECT_TRUE(transport.put("AT\r"));
    EXPECT_EQ(peer->receive(3), "AT\r");
    EXPECT_TRUE(transport.put("+", false));
    EXPECT_EQ(peer->receive(1), "+");
    peer->send("OKAY");
    std::string got;
    while (got.size() < 4 && !HasFailure()) {
        const auto [success, text] = transport.get(3);
        EXPECT_TRUE(success);
        got += text;
    }
    EXPECT_EQ(got, "OKAY");
}

TEST_P(TransportContract, AReadToCompletionWaitsForAll) {
    peer->send("ab");
    auto later = std::async(std::launch::async, [&] { return transport.get(4, true); });
    peer->send("cd");
    EXPECT_EQ(later.get(), GetParam().readsToCompletion ? Got(true, "abcd") : Got(false, ""));
}

TEST_P(TransportContract, AnUnblockEndsOneReadAndNoLaterOne) {
    for (int i = 0; i < 100; ++i) {
        auto waiting = std::async(std::launch::async, [&] { return transport.get(4); });
        EXPECT_TRUE(transport.unblockRead(&transport));
        EXPECT_EQ(waiting.get(), nothing);
        auto later = std::async(std::launch::async, [&] { return transport.get(1); });
        peer->send("z");
        EXPECT_EQ(later.get(), Got(true, "z"));
    }
}

TEST_P(TransportContract, EachUnblockEndsARead) {
    if (!GetParam().unblocksCount)
        GTEST_SKIP() << "several are as one";
    for (int i = 0; i < 3; i++)
        EXPECT_TRUE(transport.unblockRead(&transport));
    peer->send("x");
    for (int i = 0; i < 3; i++)
        EXPECT_EQ(transport.get(4), nothing);
    EXPECT_EQ(transport.get(4), Got(true, "x"));
}

TEST_P(TransportContract, AFlushDiscardsWhatCame) {
    if (GetParam().isTerminal)
        GTEST_SKIP() << "tested where it is seen what came";
    peer->send(std::string(3000, 'j'));
    EXPECT_EQ(transport.get(1), Got(true, "j"));
    EXPECT_TRUE(transport.flushRead(&transport));
    peer->send("fresh");
    EXPECT_EQ(transport.get(1), Got(true, "f"));
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
    EXPECT_EQ(std::memcmp(static_cast<PelorinTransport*>(&transport), &empty, sizeof empty), 0);
    EXPECT_TRUE(PelorinTransportFree(&transport));
}

}  // namespace
}  // namespace plr::test
