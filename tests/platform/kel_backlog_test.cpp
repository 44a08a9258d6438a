// Logs that are slow, full, away, back.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <string>
#include <vector>

#include "kel/kel.h"
#include "support/child.h"
#include "support/fake_log.h"

namespace {

using plr::test::FakeLog;
using Client = plr::test::LogClient;
using KelBacklog = plr::test::LogClientFixture;

constexpr unsigned kLong = 60'000;  // ms

void limitMessages(const Client& client, std::size_t messages) {
    kel_set_limits(client.handle, {messages, KEL_DEFAULT_BYTES, KEL_DEFAULT_PATIENCE_MS});
}

std::uint64_t numberOf(const plr::test::JournalFields& fields, const std::string& name) {
    for (const auto& [each, value] : fields)
        if (each == name)
            return std::stoull(value);
    return 0;
}

TEST_F(KelBacklog, BytesAreLimitedTooButOneMessageOfAnySizeIsTaken) {
    kel_set_limits(client.handle, {1000, 1000, KEL_DEFAULT_PATIENCE_MS});
    while (client.statistics().waiting == 0)
        client.send(std::string(2000, 'x'));
    EXPECT_EQ(client.statistics().dropped, 0u);
    client.send("");
    EXPECT_EQ(client.statistics().dropped, 1u);
}

// Every thread's messages arrive in order; with one thread, every gap is where
// its messages are missing.
struct KelFlood : KelBacklog, testing::WithParamInterface<unsigned> {};
INSTANTIATE_TEST_SUITE_P(Threads, KelFlood, testing::Values(1u, 4u));

TEST_P(KelFlood, IsInOrderAndAccountedForMessageByMessage) {
    const unsigned threads = GetParam();
    limitMessages(client, 40);
    constexpr std::uint64_t kEach = 3000;
    plr::test::Threads writers(threads, [this](unsigned t) {
        for (std::uint64_t i = 0; i < kEach; i++)
            client.send({{"Thread", std::to_string(t)}, {"Number", std::to_string(i)}});
    });
    std::vector<std::uint64_t> next(threads, 0);
    std::uint64_t arrived = 0;
    std::uint64_t gaps = 0;
    while (arrived + gaps < threads * kEach) {
        const auto fields = journal.receiveFields();
        ASSERT_FALSE(fields.empty());
        if (const std::uint64_t dropped = numberOf(fields, "KEL_DROPPED")) {
            EXPECT_EQ(numberOf(fields, "PRIORITY"), 4u);
            EXPECT_EQ(fields[2].second, std::to_string(dropped) + " messages dropped");
            gaps += dropped;
            next[0] += threads == 1 ? dropped : 0;
            continue;
        }
        const auto thread = static_cast<std::size_t>(numberOf(fields, "THREAD"));
        const std::uint64_t number = numberOf(fields, "NUMBER");
        ASSERT_TRUE(threads == 1 ? number == next[0] : number >= next[thread]);
        next[thread] = number + 1;
        arrived++;
    }
    writers.join();
    EXPECT_TRUE(kel_flush(client.handle, kLong));
    EXPECT_FALSE(journal.hasMore());
    EXPECT_EQ(client.statistics().sent, arrived);
    EXPECT_EQ(client.statistics().dropped, gaps);
}

TEST_F(KelBacklog, AJournalThatComesBackGetsInOrderWhatFitted) {
    FakeLog syslog(places.syslog());
    limitMessages(client, 20);
    client.send("first");
    EXPECT_EQ(journal.receiveField("MESSAGE"), "first");
    journal.stop();
    for (int i = 0; i < 25; i++)
        client.send(std::to_string(i));
    EXPECT_EQ(client.statistics().waiting, 20u);
    EXPECT_EQ(client.statistics().dropped, 5u);
    journal.start();
    for (int i = 0; i < 20; i++)
        EXPECT_EQ(journal.receiveField("MESSAGE"), std::to_string(i));
    EXPECT_EQ(journal.receiveField("MESSAGE"), "5 messages dropped");
    EXPECT_FALSE(syslog.hasMore());
}

TEST_F(KelBacklog, TheNextBestLogServesUntilTheBetterOneIsBack) {
    kel_set_limits(client.handle, {10, KEL_DEFAULT_BYTES, 0});
    journal.stop();
    client.send("console");
    EXPECT_NE(places.readConsole().find("console"), std::string::npos);
    FakeLog syslog(places.syslog());
    while (!syslog.hasMore())
        client.send("syslog");
    journal.start();
    while (!journal.hasMore()) {
        client.send("journal");
        while (syslog.hasMore())
            static_cast<void>(syslog.receive());
        while (places.hasConsoleText())
            static_cast<void>(places.readConsole());
    }
    EXPECT_EQ(journal.receiveField("MESSAGE"), "journal");
}

TEST_F(KelBacklog, AConsoleThatNobodyReadsHoldsNobodyUp) {
    journal.stop();
    kel_set_limits(client.handle, {1000, KEL_DEFAULT_BYTES, 0});
    const std::string end(3000, '.');
    constexpr int kCount = 100;  // several times what a pipe holds
    for (int i = 0; i < kCount; i++)
        client.send(std::to_string(i) + end);
    EXPECT_GT(client.statistics().waiting, 0u);
    const std::string head = "<6>test[" + std::to_string(::getpid()) + "]: ";
    std::string expected;
    for (int i = 0; i < kCount; i++)
        expected += head + std::to_string(i) + end + "\n";
    std::string text;
    while (text.size() < expected.size())
        text += places.readConsole();
    EXPECT_EQ(text, expected);
}

TEST_F(KelBacklog, AForkedChildLogsAndLeavesItsParentsBacklogAlone) {
    journal.stop();
    client.send("parent");
    EXPECT_TRUE(plr::test::holdsInChild([&] {
        client.send("child");
        return client.statistics().sent == 1 && client.statistics().waiting == 0;
    }));
    EXPECT_NE(places.readConsole().find(": child\n"), std::string::npos);
    journal.start();
    EXPECT_EQ(journal.receiveField("MESSAGE"), "parent");
    EXPECT_TRUE(kel_flush(client.handle, kLong));
    EXPECT_FALSE(journal.hasMore());
}

TEST_F(KelBacklog, ACrashHandsOverWhatWaits) {
    const kel_client_t crashed = kel_open("test", nullptr, 0);  // not used afterwards
    const kel_message_t message = kel_new(0);
    std::uint64_t count = 0;
    for (; kel_get_statistics(crashed).waiting < 3; count++) {
        kel_set(message, "Number", std::to_string(count).c_str());
        kel_send(crashed, message);
    }
    kel_free(message);
    for (std::uint64_t i = 0; i < count - 3; i++)
        EXPECT_EQ(journal.receiveField("NUMBER"), std::to_string(i));
    EXPECT_TRUE(kel_flush_now(crashed));
    for (std::uint64_t last = 0; last != count - 1;)  // some may come twice
        last = numberOf(journal.receiveFields(), "NUMBER");
}

}  // namespace
