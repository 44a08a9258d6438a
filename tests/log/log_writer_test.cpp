#include "plr/log/log_writer.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <unistd.h>

#include "plr/ipc/dict.h"
#include "plr/log/console_log_writer.h"
#include "plr/log/file_log_writer.h"
#include "plr/log/kel_log_writer.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "support/fake_log.h"
#include "support/log_records.h"
#include "support/scratch_folder.h"
#include "support/waiting.h"

// What every writer promises. A new one gets a place of its own below.
namespace {

using plr::LogMessage;
using plr::LogWriter;
using plr::test::logMessage;
using testing::ElementsAre;

// A writer, and where its messages arrive.
class Place {
  public:
    virtual ~Place() = default;
    [[nodiscard]] LogWriter& writer() const { return *writer_; }
    [[nodiscard]] plr::BatchLogWriter* batching() const {
        return dynamic_cast<plr::BatchLogWriter*>(writer_.get());
    }
    // The next texts that arrived, and all that did not ask for.
    [[nodiscard]] virtual std::vector<std::string> texts(std::size_t expected) = 0;
    // Whether it is for people, who see escapes.
    [[nodiscard]] virtual bool escapes() const { return true; }
    // A crash leaves a writer in a state of its own: it is not to be destroyed.
    void abandon() {
        static auto& abandoned = *new std::vector<std::shared_ptr<LogWriter>>;
        abandoned.push_back(std::move(writer_));
    }

  protected:
    std::shared_ptr<LogWriter> writer_;
};

class InMemory final : public Place {
  public:
    InMemory() { writer_ = plr::MemoryBufferedLogWriter::create(-1, -1); }
    std::vector<std::string> texts(std::size_t /*expected*/) override {
        std::vector<std::string> found;
        for (const auto& message : static_cast<plr::MemoryBufferedLogWriter&>(writer()).drain())
            found.push_back(message->getText());
        return found;
    }
    bool escapes() const override { return false; }
};

class InFile final : public Place {
  public:
    InFile() { writer_ = plr::FileLogWriter::create({.path = folder_.at("log")}); }
    std::vector<std::string> texts(std::size_t /*expected*/) override {
        return plr::test::textsOfRecords(folder_.read("log"));
    }

  private:
    plr::test::ScratchFolder folder_;
};

class OnConsole final : public Place {
  public:
    OnConsole() : fd_(::open(folder_.at("log").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600)) {
        writer_ = plr::ConsoleLogWriter::create({.descriptor = fd_});
    }
    ~OnConsole() override { ::close(fd_); }
    std::vector<std::string> texts(std::size_t /*expected*/) override {
        return plr::test::textsOfRecords(folder_.read("log"));
    }

  private:
    plr::test::ScratchFolder folder_;
    const int fd_;
};

class InJournal final : public Place {
  public:
    InJournal() { writer_ = plr::KelLogWriter::create("test", nullptr, -1); }
    std::vector<std::string> texts(std::size_t expected) override {
        std::vector<std::string> found;
        while (found.size() < expected)
            found.push_back(journal_.receiveField("MESSAGE"));
        while (journal_.hasMore())
            found.push_back(journal_.receiveField("MESSAGE"));
        return found;
    }
    bool escapes() const override { return false; }

  private:
    plr::test::LogPlaces places_;
    plr::test::FakeLog journal_{places_.journal()};
};

struct Kind {
    const char* name;
    std::function<std::unique_ptr<Place>()> make;
};

class WriterContract : public testing::TestWithParam<Kind> {
  protected:
    // True once the writer has passed everything on.
    bool flush() {
        dispatch::group sent;
        place_->writer().flush(dispatch::group_session(sent));
        return sent.wait(dispatch::time::after(plr::test::kBound)) == 0;
    }

    const std::unique_ptr<Place> place_ = GetParam().make();
};

INSTANTIATE_TEST_SUITE_P(
    , WriterContract,
    testing::Values(Kind{"Memory", [] { return std::make_unique<InMemory>(); }},
                    Kind{"File", [] { return std::make_unique<InFile>(); }},
                    Kind{"Console", [] { return std::make_unique<OnConsole>(); }},
                    Kind{"Kel", [] { return std::make_unique<InJournal>(); }}),
    [](const auto& kind) { return kind.param.name; });

TEST_P(WriterContract, KeepsTheOrderOfMessagesAndFlushesThem) {
    for (const char* text : {"1", "2", "3", "4", "5", "6"}) {
        place_->writer().write(std::make_shared<LogMessage>(logMessage(text)));
        if (*text == '3' && place_->batching())
            place_->batching()->endBatch();
    }
    EXPECT_TRUE(flush());
    EXPECT_THAT(place_->texts(6), ElementsAre("1", "2", "3", "4", "5", "6"));
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
        place_->writer().write(std::make_shared<LogMessage>(logMessage(row.text)));
        expected.push_back(place_->escapes() ? row.escaped : row.text);
    }
    EXPECT_TRUE(flush());
    EXPECT_EQ(place_->texts(expected.size()), expected);
}

TEST_P(WriterContract, IgnoresWhatComesAfterItsClose) {
    if (GetParam().name == std::string("Memory"))
        GTEST_SKIP() << "its close() does nothing";
    LogWriter& writer = place_->writer();
    writer.write(logMessage("before"));
    writer.close();
    writer.write(logMessage("after"));
    writer.write(std::make_shared<LogMessage>(logMessage("after")));
    writer.close();
    EXPECT_TRUE(flush());
    EXPECT_THAT(place_->texts(1), ElementsAre("before"));
}

TEST_P(WriterContract, WritesInACrashBehindWhatItGathered) {
    plr::BatchLogWriter* writer = place_->batching();
    if (!writer)
        GTEST_SKIP() << "does nothing in a crash";
    writer->write(logMessage("1"));
    writer->write(logMessage("2"));
    writer->flushInCrash();
    writer->writeInCrash(logMessage(std::string(5000, '3') + "\x1b"));
    writer->writeInCrash(logMessage("4"));
    EXPECT_THAT(place_->texts(4),
                ElementsAre("1", "2",
                            std::string(5000, '3') + (place_->escapes() ? "\\x1b" : "\x1b"), "4"));
    place_->abandon();
}

}  // namespace
