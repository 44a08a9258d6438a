// Logs that are slow, full, away, back.
#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "kel/kel.h"
#include "support/fake_log.h"

namespace {

using plr::test::FakeLog;
using plr::test::kBound;
using plr::test::LogPlaces;
using Client = plr::test::LogClient;

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

TEST(KelBacklog, WhatDoesNotFitIsCountedAndReportedOnceInItsPlace) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    limitMessages(client, 20);
    constexpr std::uint64_t kCount = 100;
    for (std::uint64_t i = 0; i < kCount; i++)
        client.send(std::to_string(i));
    const kel_statistics full = client.statistics();
    EXPECT_EQ(full.waiting, 20u);
    EXPECT_GT(full.dropped, 0u);
    EXPECT_EQ(full.sent + full.waiting + full.dropped, kCount);
    for (std::uint64_t i = 0; i < kCount - full.dropped; i++)
        EXPECT_EQ(journal.receiveField("MESSAGE"), std::to_string(i));
    const auto gap = journal.receiveFields();
    EXPECT_EQ(numberOf(gap, "KEL_DROPPED"), full.dropped);
    EXPECT_EQ(numberOf(gap, "PRIORITY"), 4u);
    EXPECT_EQ(gap[2].second, std::to_string(full.dropped) + " messages dropped");
    EXPECT_TRUE(kel_flush(client.handle, kLong));
    client.send("next");
    EXPECT_EQ(journal.receiveField("MESSAGE"), "next");
    EXPECT_EQ(client.statistics().sent, kCount - full.dropped + 1);
    EXPECT_EQ(client.statistics().dropped, full.dropped);
}

TEST(KelBacklog, BytesAreLimitedTooButOneMessageOfAnySizeIsTaken) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    kel_set_limits(client.handle, {1000, 1000, KEL_DEFAULT_PATIENCE_MS});
    while (client.statistics().waiting == 0)
        client.send(std::string(2000, 'x'));
    EXPECT_EQ(client.statistics().dropped, 0u);
    client.send("");
    EXPECT_EQ(client.statistics().dropped, 1u);
}

// Every thread's messages arrive in order; with one thread, every gap is where
// its messages are missing.
void flood(std::size_t threads) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    limitMessages(client, 40);
    constexpr std::uint64_t kEach = 3000;
    std::vector<std::jthread> writers;
    for (std::size_t t = 0; t < threads; t++)
        writers.emplace_back([&client, t] {
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
    writers.clear();
    EXPECT_TRUE(kel_flush(client.handle, kLong));
    EXPECT_FALSE(journal.hasMore());
    EXPECT_EQ(client.statistics().sent, arrived);
    EXPECT_EQ(client.statistics().dropped, gaps);
}

TEST(KelBacklog, AFloodOfOneThreadIsAccountedForMessageByMessage) {
    flood(1);
}
TEST(KelBacklog, AFloodOfManyThreadsKeepsEachOnesOrderAndTheCounts) {
    flood(4);
}

TEST(KelBacklog, AJournalThatComesBackGetsEverythingInOrder) {
    LogPlaces places;
    FakeLog journal(places.journal());
    FakeLog syslog(places.syslog());
    const Client client;
    client.send("0");
    EXPECT_EQ(journal.receiveField("MESSAGE"), "0");
    journal.stop();
    for (int i = 1; i <= 50; i++)
        client.send(std::to_string(i));
    EXPECT_EQ(client.statistics().waiting, 50u);
    journal.start();
    for (int i = 1; i <= 50; i++)
        EXPECT_EQ(journal.receiveField("MESSAGE"), std::to_string(i));
    EXPECT_FALSE(syslog.hasMore());
}

TEST(KelBacklog, TheNextBestLogServesUntilTheBetterOneIsBack) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
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

TEST(KelBacklog, AConsoleThatNobodyReadsHoldsNobodyUp) {
    LogPlaces places;
    const Client client("test");
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

TEST(KelBacklog, ClosingGivesUpWhatTheLogDoesNotTake) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const kel_client_t client = kel_open("test", nullptr, 0);
    const kel_message_t message = kel_new(0);
    for (int i = 0; i < 50; i++)
        kel_send(client, message);
    kel_free(message);
    const kel_statistics before = kel_get_statistics(client);
    EXPECT_EQ(kel_close(client), 50 - before.sent);
}

TEST(KelBacklog, AForkedChildLogsAndLeavesItsParentsBacklogAlone) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    journal.stop();
    client.send("parent");
    const pid_t child = ::fork();
    if (child == 0) {
        client.send("child");
        ::_exit(client.statistics().sent == 1 && client.statistics().waiting == 0 ? 0 : 1);
    }
    int status = -1;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    EXPECT_NE(places.readConsole().find(": child\n"), std::string::npos);
    journal.start();
    EXPECT_EQ(journal.receiveField("MESSAGE"), "parent");
    EXPECT_TRUE(kel_flush(client.handle, kLong));
    EXPECT_FALSE(journal.hasMore());
}

TEST(KelBacklog, ACrashHandsOverWhatWaits) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const kel_client_t client = kel_open("test", nullptr, 0);  // not used after the crash
    const kel_message_t message = kel_new(0);
    std::uint64_t count = 0;
    for (; kel_get_statistics(client).waiting < 3; count++) {
        kel_set(message, "Number", std::to_string(count).c_str());
        kel_send(client, message);
    }
    kel_free(message);
    for (std::uint64_t i = 0; i < count - 3; i++)
        EXPECT_EQ(journal.receiveField("NUMBER"), std::to_string(i));
    EXPECT_TRUE(kel_flush_now(client));
    for (std::uint64_t last = 0; last != count - 1;)  // some may come twice
        last = numberOf(journal.receiveFields(), "NUMBER");
}

}  // namespace
