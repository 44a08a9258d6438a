#include "plr/log.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <unistd.h>

#include "plr/ipc/dict.h"
#include "support/fake_log.h"
#include "support/log_records.h"
#include "support/scratch_folder.h"
#include "support/waiting.h"

// What every writer promises. A new one gets a place of its own below.
namespace {

using namespace plr;
using namespace plr::test;
using testing::ElementsAre;

// A writer, and where its messages arrive.
struct Place {
    std::shared_ptr<LogWriter> writer;
    // The next texts that arrived, and all that did not ask for.
    std::function<std::vector<std::string>(std::size_t expected)> texts;
    bool escapes = true;  // for people, who see escapes
};

Place inMemory() {
    const std::shared_ptr<MemoryBufferedLogWriter> writer = MemoryBufferedLogWriter::create(-1, -1);
    const auto drain = [writer](std::size_t) {
        std::vector<std::string> texts;
        for (const auto& message : writer->drain())
            texts.push_back(message->getText());
        return texts;
    };
    return {writer, drain, false};
}

Place inFile() {
    const auto folder = std::make_shared<ScratchFolder>();
    return {FileLogWriter::create({.path = folder->at("log")}),
            [folder](std::size_t) { return textsOfRecords(folder->read("log")); }};
}

Place onConsole() {
    const auto folder = std::make_shared<ScratchFolder>();
    const int fd = ::open(folder->at("log").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600);
    const std::shared_ptr<void> closer(nullptr, [fd](void*) { ::close(fd); });
    return {ConsoleLogWriter::create({.descriptor = fd}),
            [folder, closer](std::size_t) { return textsOfRecords(folder->read("log")); }};
}

Place inJournal() {
    const auto places = std::make_shared<LogPlaces>();
    const auto journal = std::make_shared<FakeLog>(places->journal());
    const auto receive = [places, journal](std::size_t expected) {
        std::vector<std::string> texts;
        while (texts.size() < expected || journal->hasMore())
            texts.push_back(journal->receiveField("MESSAGE"));
        return texts;
    };
    return {KelLogWriter::create("test", nullptr, -1), receive, false};
}

struct Kind {
    const char* name;
    Place (*make)();
};

class WriterContract : public testing::TestWithParam<Kind> {
  protected:
    // True once the writer has passed everything on.
    bool flush() {
        dispatch::group sent;
        place_.writer->flush(dispatch::group_session(sent));
        return sent.wait(dispatch::time::after(kBound)) == 0;
    }

    Place place_ = GetParam().make();
    BatchLogWriter* const batching_ = dynamic_cast<BatchLogWriter*>(place_.writer.get());
};

INSTANTIATE_TEST_SUITE_P(, WriterContract,
                         testing::Values(Kind{"Memory", inMemory}, Kind{"File", inFile},
                                         Kind{"Console", onConsole}, Kind{"Kel", inJournal}),
                         [](const auto& kind) { return kind.param.name; });

TEST_P(WriterContract, KeepsTheOrderOfMessagesAndFlushesThem) {
    for (const char* text : {"1", "2", "3", "4", "5", "6"}) {
        place_.writer->write(std::make_shared<LogMessage>(logMessage(text)));
        if (*text == '3' && batching_)
            batching_->endBatch();
    }
    EXPECT_TRUE(flush());
    EXPECT_THAT(place_.texts(6), ElementsAre("1", "2", "3", "4", "5", "6"));
}

TEST_P(WriterContract, PassesEveryTextOn) {
    struct Row {
        std::string text, escaped;
    };
    const std::string mebibyte(1 << 20, 'm');
    const Row rows[] = {
        {"", ""},
        {"tab\tand C:\\x1b", "tab\tand C:\\x1b"},
        {"two\nlines\n", "two\n    lines\n    "},
        {"forged\n1970-01-01 00:00:00.000000+00:00 I d: x",
         "forged\n    1970-01-01 00:00:00.000000+00:00 I d: x"},
        {"\x1b[2Jseventeen bytes\r", "\\x1b[2Jseventeen bytes\\x0d"},
        {std::string("nul\0del\x7f", 8), "nul\\x00del\\x7f"},
        {"Gr\xc3\xbc\xc3\x9f\x65 \xe2\x82\xac \xf0\x9f\x93\xb6",
         "Gr\xc3\xbc\xc3\x9f\x65 \xe2\x82\xac \xf0\x9f\x93\xb6"},
        {"C1 \xc2\x9b", "C1 \\xc2\\x9b"},
        {"overlong \xc0\xaf, surrogate \xed\xa0\x80",
         "overlong \\xc0\\xaf, surrogate \\xed\\xa0\\x80"},
        {"beyond \xf4\x90\x80\x80, cut \xe2\x82", "beyond \\xf4\\x90\\x80\\x80, cut \\xe2\\x82"},
        {mebibyte + "\x1b", mebibyte + "\\x1b"},
    };
    std::vector<std::string> expected;
    for (const Row& row : rows) {
        place_.writer->write(std::make_shared<LogMessage>(logMessage(row.text)));
        expected.push_back(place_.escapes ? row.escaped : row.text);
    }
    EXPECT_TRUE(flush());
    EXPECT_EQ(place_.texts(expected.size()), expected);
}

TEST_P(WriterContract, IgnoresWhatComesAfterItsClose) {
    if (GetParam().name == std::string("Memory"))
        GTEST_SKIP() << "its close() does nothing";
    LogWriter& writer = *place_.writer;
    writer.write(logMessage("before"));
    writer.close();
    writer.write(logMessage("after"));
    writer.write(std::make_shared<LogMessage>(logMessage("after")));
    writer.close();
    EXPECT_TRUE(flush());
    EXPECT_THAT(place_.texts(1), ElementsAre("before"));
}

TEST_P(WriterContract, WritesInACrashBehindWhatItGathered) {
    if (!batching_)
        GTEST_SKIP() << "does nothing in a crash";
    batching_->write(logMessage("1"));
    batching_->write(logMessage("2"));
    batching_->flushInCrash();
    batching_->writeInCrash(logMessage(std::string(5000, '3') + "\x1b"));
    batching_->writeInCrash(logMessage("4"));
    EXPECT_THAT(
        place_.texts(4),
        ElementsAre("1", "2", std::string(5000, '3') + (place_.escapes ? "\\x1b" : "\x1b"), "4"));
    // A crash leaves a writer in a state of its own: it is not to be destroyed.
    static auto& abandoned = *new std::vector<std::shared_ptr<LogWriter>>;
    abandoned.push_back(std::move(place_.writer));
}

}  // namespace
