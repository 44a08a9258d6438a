#include "kel/kel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <utility>
#include <vector>

#include "support/fake_log.h"

namespace {

using plr::test::FakeLog;
using Client = plr::test::LogClient;
using plr::test::JournalFields;
using plr::test::LogPlaces;

TEST(Kel, KeysAndLevelsBecomeFieldsByTheDocumentedRules) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client("radiod", "local3");
    const std::string longKey(70, 'k');
    struct Row {
        const char* name;
        std::string key;
        std::string value;
        JournalFields fields;  // after those of the client
    };
    const std::vector<Row> rows = {
        {"upper case", "Facility", "radio", {{"PRIORITY", "6"}, {"FACILITY", "radio"}}},
        {"with digits", "ZTStart2", "1", {{"PRIORITY", "6"}, {"ZTSTART2", "1"}}},
        {"other characters", "a.b-\xc3\xa4", "", {{"PRIORITY", "6"}, {"A_B___", ""}}},
        {"underscore first", "_x", "1", {{"PRIORITY", "6"}, {"KEY__X", "1"}}},
        {"digit first", "1st", "1", {{"PRIORITY", "6"}, {"KEY_1ST", "1"}}},
        {"empty", "", "1", {{"PRIORITY", "6"}, {"KEY_", "1"}}},
        {"too long", longKey, "1", {{"PRIORITY", "6"}, {std::string(64, 'K'), "1"}}},
        {"ours", "priority", "0", {{"PRIORITY", "6"}, {"KEY_PRIORITY", "0"}}},
        {"not the text", "MESSAGE", "m", {{"PRIORITY", "6"}, {"KEY_MESSAGE", "m"}}},
        {"level", "Level", "Debug", {{"PRIORITY", "7"}}},
        {"level", "Level", "Emergency", {{"PRIORITY", "0"}}},
        {"level", "Level", "Alert", {{"PRIORITY", "1"}}},
        {"level", "Level", "Critical", {{"PRIORITY", "2"}}},
        {"level", "Level", "Error", {{"PRIORITY", "3"}}},
        {"level", "Level", "Warning", {{"PRIORITY", "4"}}},
        {"level", "Level", "Notice", {{"PRIORITY", "5"}}},
        {"level", "Level", "Info", {{"PRIORITY", "6"}}},
        {"no level", "Level", "info", {{"PRIORITY", "6"}, {"LEVEL", "info"}}},
        {"any bytes",
         "Message",
         std::string("a\n\0b=\n\x1b[1m\xff", 12),
         {{"PRIORITY", "6"}, {"MESSAGE", std::string("a\n\0b=\n\x1b[1m\xff", 12)}}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(std::string(row.name) + ": " + row.key + "=" + row.value);
        client.send({{row.key, row.value}});
        JournalFields expected = {{"SYSLOG_IDENTIFIER", "radiod"}, {"SYSLOG_FACILITY", "19"}};
        expected.insert(expected.end(), row.fields.begin(), row.fields.end());
        EXPECT_EQ(journal.receiveFields(), expected);
    }
}

TEST(Kel, AFacilityThatSyslogDoesNotKnowIsTheMessagesOwn) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client(nullptr, "radio");
    client.send({{"Message", "m"}, {"Message", "n"}});
    EXPECT_EQ(journal.receiveFields(),
              (JournalFields{{"SYSLOG_IDENTIFIER", program_invocation_short_name},
                             {"PRIORITY", "6"},
                             {"MESSAGE", "n"},
                             {"FACILITY", "radio"}}));
    client.send({{"Facility", "sms"}});
    EXPECT_EQ(journal.receiveField("FACILITY"), "sms");
}

TEST(Kel, TheFilterLetsThroughByPriority) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    EXPECT_EQ(kel_set_filter(client.handle, 1 << 3), 0xff);
    for (const char* level : {"Debug", "Error", "Critical"})
        client.send({{"Level", level}, {"Message", level}});
    EXPECT_EQ(journal.receiveField("MESSAGE"), "Error");
    EXPECT_EQ(kel_set_filter(client.handle, 0xff), 1 << 3);
    EXPECT_FALSE(journal.hasMore());
    EXPECT_EQ(client.statistics().sent, 1u);
}

TEST(Kel, WhatNoDatagramHoldsTravelsInASealedFile) {
    LogPlaces places;
    FakeLog journal(places.journal());
    const Client client;
    const std::string text = "first\n" + std::string(1 << 20, 'x') + '\0' + "last";
    client.send(text);
    EXPECT_EQ(journal.receiveField("MESSAGE"), text);
    client.send("small");
    EXPECT_EQ(journal.receiveField("MESSAGE"), "small");
}

TEST(Kel, WithoutAJournalMessagesAreLinesForSyslogAndThenForTheConsole) {
    LogPlaces places;
    const std::string text = "a\nb\x1b[31m\\\x7f\xc2\x9b \xc3\xa4";
    const std::string shown = "radio.sms: a\\nb\\x1b[31m\\\\\\x7f\xc2\\x9b \xc3\xa4";
    const std::string pid = std::to_string(::getpid());
    const std::vector<std::pair<std::string, std::string>> fields = {
        {"Level", "Error"}, {"Facility", "radio.sms"}, {"Message", text}};
    {
        FakeLog syslog(places.syslog());
        const Client client("radiod", "daemon");
        client.send(fields);
        const std::string line = syslog.receive();
        EXPECT_THAT(line, testing::ContainsRegex(
                              "^<27>[A-Z][a-z][a-z] [ 0-9][0-9] [0-9:]{8} radiod\\[" + pid));
        EXPECT_THAT(line, testing::EndsWith("]: " + shown));
    }
    const Client client("radiod", "daemon");
    client.send(fields);
    EXPECT_EQ(places.readConsole(), "<3>radiod[" + pid + "]: " + shown + "\n");
}

TEST(Kel, TheLibrarysOwnMessagesNeedNoClient) {
    LogPlaces places;  // before the process's client is opened, once
    FakeLog journal(places.journal());
    errno = 7;
    kel_log(3, "Failed to get time, %d\n", 5);
    EXPECT_EQ(errno, 7);
    const JournalFields fields = journal.receiveFields();
    EXPECT_EQ(fields[1], (std::pair<std::string, std::string>("PRIORITY", "3")));
    EXPECT_EQ(fields[2],
              (std::pair<std::string, std::string>("MESSAGE", "Failed to get time, 5\n")));
}

TEST(Kel, ACrashHandlersMessageGoesPastEverythingThatWaits) {
    LogPlaces places;
    const std::string text = "what\nhappened";
    const auto sendNow = [&text](const Client& client, const char* domain) {
        return kel_send_now(client.handle, 2, domain, text.data(), text.size());
    };
    {
        FakeLog journal(places.journal());
        const Client client("radiod", "radio");
        EXPECT_TRUE(sendNow(client, nullptr));
        EXPECT_EQ(journal.receiveFields(), (JournalFields{{"SYSLOG_IDENTIFIER", "radiod"},
                                                          {"PRIORITY", "2"},
                                                          {"FACILITY", "radio"},
                                                          {"MESSAGE", text}}));
        const std::string endless(KEL_SEND_NOW_BYTES + 1, 'x');
        EXPECT_TRUE(kel_send_now(client.handle, 2, "d\n", endless.data(), endless.size()));
        EXPECT_EQ(journal.receiveField("MESSAGE").size(), KEL_SEND_NOW_BYTES);
        while (sendNow(client, "d")) {
        }  // until the journal is full: it does not wait
    }
    {
        FakeLog syslog(places.syslog());
        const Client client("radiod", "local0");
        EXPECT_TRUE(sendNow(client, "sms"));
        EXPECT_EQ(syslog.receive(), "<130>radiod: sms: what\\nhappened");
    }
    const Client client("radiod");
    EXPECT_TRUE(sendNow(client, "sms"));
    EXPECT_EQ(places.readConsole(), "<2>radiod: sms: what\\nhappened\n");
    const std::string endless(KEL_SEND_NOW_LINE, 'x');
    EXPECT_TRUE(kel_send_now(client.handle, 2, nullptr, endless.data(), endless.size()));
    const std::string line = places.readConsole();
    EXPECT_EQ(line.size(), KEL_SEND_NOW_LINE);
    EXPECT_EQ(line.back(), '\n');
}

TEST(Kel, NullClientsAndMessagesAreIgnored) {
    const kel_message_t message = kel_new(0);
    EXPECT_EQ(kel_new(1), nullptr);
    EXPECT_EQ(kel_set(message, nullptr, "x"), EINVAL);
    EXPECT_EQ(kel_set(message, "Key", nullptr), 0);
    EXPECT_EQ(kel_set(nullptr, "Key", "x"), 0);
    kel_send(nullptr, message);
    kel_free(message);
    kel_free(nullptr);
    EXPECT_EQ(kel_set_filter(nullptr, 1), 0);
    EXPECT_EQ(kel_get_statistics(nullptr).sent, 0u);
    EXPECT_TRUE(kel_flush(nullptr, 1));
    EXPECT_FALSE(kel_send_now(nullptr, 1, nullptr, "x", 1));
    EXPECT_EQ(kel_close(nullptr), 0u);
}

}  // namespace
