// Ours, into another process: a VoxLogger for all threads; over there a
// VoxLogServer, whose log server has a FileLogWriter. Callers wait while
// kQueued messages do, which a VoxLogger would drop.

#include <sched.h>
#include <stdlib.h>
#include <unistd.h>

#include <chrono>
#include <utility>

#include "bench/log_cases.h"
#include "plr/ipc/values.h"
#include "plr/log/file_log_writer.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/vox_log_server.h"
#include "plr/log/vox_logger.h"

namespace {

namespace cases = bench::log_cases;
using plr::LogLevel;

constexpr const char* kName = "bench.log";
constexpr std::size_t kBetweenLooks = 64;  // messages of one caller
constexpr std::chrono::milliseconds kRetry(1);

[[noreturn]] void serve(const char* file) {
    const auto log = plr::LogServer::create("bench");
    log->addWriter(plr::FileLogWriter::create({.path = file, .maxBytes = 0}));
    log->start();
    // The reader takes nothing but the messages.
    const vox::dict levels = vox::dict::create(), config = vox::dict::create();
    levels["remote"] = vox::int64(static_cast<int>(LogLevel::Never));
    config["kDomainLogLevels"] = levels;
    log->updateConfig(config);
    log->debugFlush();
    const auto remote = plr::VoxLogServer::create(log, "remote log", "remote");
    remote->startListeningOn(vox::listener::create(kName));
    for (;;)
        ::pause();
}

class RemotePeer {
  public:
    // With a gate the server is not connected before finish().
    RemotePeer(const std::string& file, cases::Gate* gate)
        : server_({"/proc/self/exe", "serve", file}, "/dev/null") {
        logger_->limitBuffer(2 * cases::kQueued, std::size_t{1} << 30);
        logger_->setInheritedLogLevel(LogLevel::Info);
        if (!gate)
            connect();
    }

    void finish() {
        connect();
        while (logger_->getHeldMessageCount() != 0)
            static_cast<void>(logger_->flush().wait(dispatch::time::after(kRetry)));
        if (logger_->getDroppedMessageCount() != 0)
            bench::fail("messages were dropped");
        logger_->setInvalidationCallback(nullptr);
        queue_.sync([] {});
    }

    class Caller {
      public:
        explicit Caller(RemotePeer& peer) : logger_(*peer.logger_) {}

        void message(int a, int b) { log(LogLevel::Info, a, b); }
        void disabled(int a, int b) { log(LogLevel::Debug, a, b); }

      private:
        void log(LogLevel level, int a, int b) {
            if (!logger_.enabled(level))
                return;
            if (++calls_ % kBetweenLooks == 0)
                while (logger_.getHeldMessageCount() >= cases::kQueued)
                    ::sched_yield();
            plr::LogMessageBuffer text;
            text << cases::kText << a << ' ' << b;
            logger_.forceLog(level, std::move(text));
        }

        plr::VoxLogger& logger_;
        std::size_t calls_ = 0;
    };

  private:
    // Tries until the server is there, and returns then: it hands Info down.
    void connect() {
        if (std::exchange(connects_, true))
            return;
        logger_->setInheritedLogLevel(LogLevel::Unset);
        logger_->setInvalidationCallback(dispatch::block<void()>([this] {
            queue_.after(dispatch::time::after(kRetry), dispatch::block<void()>([this] {
                             logger_->reconnect(vox::connection::create(kName));
                         }));
        }));
        while (logger_->getInheritedLogLevel() != LogLevel::Info)
            ::usleep(100);
    }

    bench::Child server_;
    bool connects_ = false;
    const dispatch::queue queue_ = dispatch::queue::create("client");
    const std::shared_ptr<plr::VoxLogger> logger_ =
        plr::VoxLogger::create(queue_, "bench", cases::kLogger, vox::connection());
};

}  // namespace

int main(int argc, char** argv) {
    if (argc == 3 && std::string_view(argv[1]) == "serve")
        serve(argv[2]);
    const bench::TemporaryFolder runtime;
    ::setenv("VOX_RUNTIME_DIR", runtime.path().c_str(), 1);
    return cases::run<RemotePeer>(argc, argv);
}
