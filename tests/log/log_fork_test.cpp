#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <string>
#include <thread>
#include <vector>

#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/log_writer.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "plr/log/static_logger.h"
#include "support/sanitized.h"
#include "support/waiting.h"

namespace {

using plr::LogLevel;
using plr::LogMessage;

constexpr std::string_view kOfChild = "child";

// Counts what there is, and passes on what children say.
class CountingWriter : public plr::LogWriter {
  public:
    explicit CountingWriter(int pipe) : pipe_(pipe) {}
    void close() override {}
    using LogWriter::write;
    void write(const LogMessage& message) override {
        ++written;
        if (message.getText() == kOfChild)
            static_cast<void>(!::write(pipe_, "c", 1));
    }
    std::atomic<std::uint64_t> written{0};

  private:
    const int pipe_;
};

// While threads log, a child that forks logs too, and does not write what its
// parent has to write.
TEST(LogFork, TheChildLogsWhateverTheParentsThreadsWereAt) {
    if (plr::test::kSanitized)
        GTEST_SKIP() << "sanitizers' heaps stay locked when other threads allocate at a fork";
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    const auto server = plr::LogServer::create("s", nullptr);
    const auto writer = std::make_shared<CountingWriter>(ends[1]);
    server->addWriter(std::shared_ptr<CountingWriter>(writer));
    server->start();
    const plr::StaticLogger logger(std::string("d"), server);

    std::atomic<bool> stop{false};
    std::atomic<std::uint64_t> logged{0};
    std::vector<std::jthread> threads;
    for (int i = 0; i < 2; ++i)
        threads.emplace_back([&] {
            while (!stop) {
                logger.forceLog(LogLevel::Info, plr::LogMessageBuffer() << "parent");
                if (++logged % 64 == 0)
                    server->debugFlush();
            }
        });
    for (int i = 0; i < 200; ++i) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::prctl(PR_SET_PDEATHSIG, SIGKILL);
            ::alarm(static_cast<unsigned>(plr::test::kBound.count()));
            const std::uint64_t before = writer->written;
            logger.forceLog(LogLevel::Info, plr::LogMessageBuffer() << kOfChild);
            server->debugFlush();
            ::_exit(writer->written == before + 1 ? 0 : 1);
        }
        int status = -1;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        ASSERT_EQ(status, 0) << "child " << i;
        char said = 0;
        ASSERT_EQ(::read(ends[0], &said, 1), 1);
    }
    stop = true;
    threads.clear();
    server->debugFlush();
    EXPECT_EQ(writer->written, logged) << "the parent lost nothing, and wrote nothing twice";
    ::close(ends[0]);
    ::close(ends[1]);
}

}  // namespace
