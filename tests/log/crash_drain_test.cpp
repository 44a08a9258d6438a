#include "plr/log.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <csignal>
#include <exception>
#include <stdexcept>

#include "plr/base/assert.h"
#include "plr/base/report.h"

namespace {

using namespace plr;

void print(const std::string& text) noexcept {
    static_cast<void>(!::write(STDERR_FILENO, text.data(), text.size()));
}

// Prints "<text>" for every message; what it gathers goes out with the burst.
class PrintingWriter : public BatchLogWriter {
  public:
    void close() override {}
    using LogWriter::write;
    void write(const LogMessage& message) override {
        if (message.getText() == "crash in the writer")
            ::raise(SIGSEGV);
        gathered_ += "<" + message.getText() + ">";
    }
    void endBatch() override { flushInCrash(); }
    void flushInCrash() noexcept override {
        print(gathered_);
        gathered_.clear();
    }
    void writeInCrash(const LogMessage& message) noexcept override {
        print("<");
        print(message.getText());
        print(">");
    }

  private:
    std::string gathered_;
};

// Logs "0" to "499", and ends the process in the given way on the way.
void crashAfterLogging(const std::function<void(const StaticLogger&)>& crash, bool start) {
    ::signal(SIGBUS, [](int) {
        print("the old handler");
        ::_exit(1);
    });
    const auto server =
        LogServer::create("s", start ? nullptr : MemoryBufferedLogWriter::create(-1, -1));
    server->addWriter(std::make_shared<PrintingWriter>());
    if (start)
        server->start();
    else
        server->debugFlush();
    drainLogsOnCrash(server);
    const StaticLogger logger(std::string("d"), server);
    for (int i = 0; i < 500; ++i)
        logger.forceLog(LogLevel::Info, LogMessageBuffer() << i);
    crash(logger);
    ::pause();
}

std::string allLines() {
    std::string lines;
    for (int i = 0; i < 500; ++i)
        lines += "<" + std::to_string(i) + ">";
    return lines;
}

TEST(CrashDrainDeathTest, WritesWhatWasLoggedBefore) {
    const struct {
        const char* name;
        std::function<void(const StaticLogger&)> crash;
        bool start = true;
        const char* end = "";  // of what is printed
    } rows[] = {
        {"abort", [](const auto&) { std::abort(); }},
        {"a failed assertion",
         [](const auto&) {
             setReportHook([](const char*) noexcept {});
             PLR_ASSERT(false, "as it should");
         }},
        {"a signal on another thread",
         [](const auto&) { std::thread([] { ::raise(SIGSEGV); }).join(); }},
        {"an uncaught exception",
         [](const auto&) {
             std::set_terminate([] { std::abort(); });  // the usual one, without its text
             std::thread([] { throw std::runtime_error("uncaught"); }).join();
         }},
        {"a crash in a writer",
         [](const auto& logger) {
             logger.forceLog(LogLevel::Error, LogMessageBuffer() << "crash in the writer");
         }},
        {"before the start", [](const auto&) { std::abort(); }, false},
        {"a handler from before", [](const auto&) { ::raise(SIGBUS); }, true, "the old handler"},
    };
    testing::FLAGS_gtest_death_test_style = "threadsafe";
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        EXPECT_DEATH(crashAfterLogging(row.crash, row.start),
                     testing::ContainsRegex(allLines() + row.end));
    }
}

}  // namespace
