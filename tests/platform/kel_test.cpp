#include "kel/kel.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <utility>
#include <vector>

#include "support/fake_log.h"

namespace {

using namespace plr::test;
using Client = LogClient;
using Kel = LogClientFixture;

TEST_F(Kel, KeysAndLevelsBecomeFieldsByTheDocumentedRules) {
    const Client radiod("radiod", "local3");
    struct Row {
        const char* name;
        std::string key;
        std::string value;
        JournalFields fields;  // after those of the client
    };
    const std::string bytes("a\n\0b=\n\x1b[1m\xff", 12);
    const std::vector<Row> rows = {
        {"with digits", "ZTStart2", "1", {{"PRIORITY", "6"}, {"ZTSTART2", "1"}}},
        {"other characters", "a.b-\xc3\xa4", "", {{"PRIORITY", "6"}, {"A_B___", ""}}},
        {"underscore first", "_x", "1", {{"PRIORITY", "6"}, {"KEY__X", "1"}}},
        {"digit first", "1st", "1", {{"PRIORITY", "6"}, {"KEY_1ST", "1"}}},
        {"empty", "", "1", {{"PRIORITY", "6"}, {"KEY_", "1"}}},
        {"too long", std::string(70, 'k'), "1", {{"PRIORITY", "6"}, {std::string(64, 'K'), "1"}}},
        {"ours", "priority", "0", {{"PRIORITY", "6"}, {"KEY_PRIORITY", "0"}}},
        {"not the text", "MESSAGE", "m", {{"PRIORITY", "6"}, {"KEY_MESSAGE", "m"}}},
        {"no level", "Level", "info", {{"PRIORITY", "6"}, {"LEVEL", "info"}}},
        {"any bytes", "Message", bytes, {{"PRIORITY", "6"}, {"MESSAGE", bytes}}},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(std::string(row.name) + ": " + row.key + "=" + row.value);
        radiod.send({{row.key, row.value}});
        JournalFields expected = {{"SYSLOG_IDENTIFIER", "radiod"}, {"SYSLOG_FACILITY", "19"}};
        expected.insert(expected.end(), row.fields.begin(), row.fields.end());
        EXPECT_EQ(journal.receiveFields(), expected);
    }
    int priority = 0;
    for (const char* level :
         {"Emergency", "Alert", "Critical", "Error", "Warning", "Notice", "Info", "Debug"}) {
        radiod.send({{"Level", level}});
        EXPECT_EQ(journal.receiveField("PRIORITY"), std::to_string(priority++)) << level;
    }
}

TEST_F(Kel, AFacilityThatSyslogDoesNotKnowIsTheMessagesOwn) {
    const Client radio(nullptr, "radio");
    radio.send({{"Message", "m"}, {"Message", "n"}});
    EXPECT_EQ(journal.receiveFields(),
              (JournalFields{{"SYSLOG_IDENTIFIER", program_invocation_short_name},
                             {"PRIORITY", "6"},
                             {"MESSAGE", "n"},
                             {"FACILITY", "radio"}}));
    radio.send({{"Facility", "sms"}});
    EXPECT_EQ(journal.receiveField("FACILITY"), "sms");
}

TEST_F(Kel, TheFilterLetsThroughByPriority) {
    EXPECT_EQ(kel_set_filter(client.handle, 1 << 3), 0xff);
    for (const char* level : {"Debug", "Error", "Critical"})
        client.send({{"Level", level}, {"Message", level}});
    EXPECT_EQ(journal.receiveField("MESSAGE"), "Error");
    EXPECT_EQ(kel_set_filter(client.handle, 0xff), 1 << 3);
    EXPECT_FALSE(journal.hasMore());
}

TEST_F(Kel, WhatNoDatagramHoldsTravelsInASealedFile) {
    const std::string text = "first\n" + std::string(1 << 20, 'x') + '\0' + "last";
    client.send(text);
    EXPECT_EQ(journal.receiveField("MESSAGE"), text);
    client.send("small");
    EXPECT_EQ(journal.receiveField("MESSAGE"), "small");
}

TEST_F(Kel, WithoutAJournalMessagesAreLinesForSyslogAndThenForTheConsole) {
    journal.stop();
    const std::string text = "a\nb\x1b[31m\\\x7f\xc2\x9b \xc3\xa4";
    const std::string shown = "radio.sms: a\\nb\\x1b[31m\\\\\\x7f\xc2\\x9b \xc3\xa4";
    const std::string pid = std::to_string(::getpid());
    const std::vector<std::pair<std::string, std::string>> fields = {
        {"Level", "Error"}, {"Facility", "radio.sms"}, {"Message", text}};
    {
        FakeLog syslog(places.syslog());
        const Client radiod("radiod", "daemon");
        radiod.send(fields);
        const std::string line = syslog.receive();
        EXPECT_THAT(line, testing::ContainsRegex(
                              "^<27>[A-Z][a-z][a-z] [ 0-9][0-9] [0-9:]{8} radiod\\[" + pid));
        EXPECT_THAT(line, testing::EndsWith("]: " + shown));
    }
    const Client radiod("radiod", "daemon");
    radiod.send(fields);
    EXPECT_EQ(places.readConsole(), "<3>radiod[" + pid + "]: " + shown + "\n");
}

TEST_F(Kel, ACrashHandlersMessageGoesPastEverythingThatWaits) {
    const std::string text = "what\nhappened";
    const auto sendNow = [&text](const Client& by, const char* domain) {
        return kel_send_now(by.handle, 2, domain, text.data(), text.size());
    };
    {
        const Client radiod("radiod", "radio");
        EXPECT_TRUE(sendNow(radiod, nullptr));
        EXPECT_EQ(journal.receiveFields(), (JournalFields{{"SYSLOG_IDENTIFIER", "radiod"},
                                                          {"PRIORITY", "2"},
                                                          {"FACILITY", "radio"},
                                                          {"MESSAGE", text}}));
        const std::string endless(KEL_SEND_NOW_BYTES + 1, 'x');
        EXPECT_TRUE(kel_send_now(radiod.handle, 2, "d\n", endless.data(), endless.size()));
        EXPECT_EQ(journal.receiveField("MESSAGE").size(), KEL_SEND_NOW_BYTES);
        while (sendNow(radiod, "d")) {
        }  // until the journal is full: it does not wait
    }
    journal.stop();
    {
        FakeLog syslog(places.syslog());
        const Client radiod("radiod", "local0");
        EXPECT_TRUE(sendNow(radiod, "sms"));
        EXPECT_EQ(syslog.receive(), "<130>radiod: sms: what\\nhappened");
    }
    const Client radiod("radiod");
    EXPECT_TRUE(sendNow(radiod, "sms"));
    EXPECT_EQ(places.readConsole(), "<2>radiod: sms: what\\nhappened\n");
    const std::string endless(KEL_SEND_NOW_LINE, 'x');
    EXPECT_TRUE(kel_send_now(radiod.handle, 2, nullptr, endless.data(), endless.size()));
    const std::string line = places.readConsole();
    EXPECT_EQ(line.size(), KEL_SEND_NOW_LINE);
    EXPECT_EQ(line.back(), '\n');
}

TEST_F(Kel, NullClientsAndMessagesAreIgnored) {
    const kel_message_t message = kel_new(0);
    EXPECT_EQ(kel_new(1), nullptr);
    EXPECT_EQ(kel_set(message, nullptr, "x"), EINVAL);
    EXPECT_EQ(kel_set(message, "Key", nullptr), 0);
    EXPECT_EQ(kel_set(nullptr, "Key", "x"), 0);
    kel_send(nullptr, message);
    kel_free(message);
    kel_free(nullptr);
    EXPECT_EQ(kel_close(nullptr), 0u);
}

}  // namespace
