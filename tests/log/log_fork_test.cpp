#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

#include "plr/log.h"
#include "support/function_log_writer.h"
#include "support/sanitized.h"
#include "support/waiting.h"

namespace {

using namespace plr;
using namespace plr::test;

constexpr std::string_view kOfChild = "child";

// While threads log, a child that forks logs too, and does not write what its
// parent has to write.
TEST(LogFork, TheChildLogsWhateverTheParentsThreadsWereAt) {
    if (kSanitized)
        GTEST_SKIP() << "sanitizers' heaps stay locked when other threads allocate at a fork";
    int ends[2];
    ASSERT_EQ(::pipe(ends), 0);
    std::atomic<std::uint64_t> written{0};
    const auto server = LogServer::create("s", nullptr);
    server->addWriter(std::make_shared<FunctionLogWriter>([&](const LogMessage& message) {
        ++written;
        if (message.getText() == kOfChild)
            static_cast<void>(!::write(ends[1], "c", 1));
    }));
    server->start();
    const StaticLogger logger(std::string("d"), server);

    std::atomic<bool> stop{false};
    std::atomic<std::uint64_t> logged{0};
    std::vector<std::jthread> threads;
    for (int i = 0; i < 2; ++i)
        threads.emplace_back([&] {
            while (!stop) {
                logger.forceLog(LogLevel::Info, LogMessageBuffer() << "parent");
                if (++logged % 64 == 0)
                    server->debugFlush();
            }
        });
    for (int i = 0; i < 200; ++i) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::prctl(PR_SET_PDEATHSIG, SIGKILL);
            ::alarm(static_cast<unsigned>(kBound.count()));
            const std::uint64_t before = written;
            logger.forceLog(LogLevel::Info, LogMessageBuffer() << kOfChild);
            server->debugFlush();
            ::_exit(written == before + 1 ? 0 : 1);
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
    EXPECT_EQ(written, logged) << "the parent lost nothing, and wrote nothing twice";
    ::close(ends[0]);
    ::close(ends[1]);
}

}  // namespace
