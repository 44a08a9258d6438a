// spdlog's asynchronous logger: a ring of finished texts, one thread behind it,
// callers that wait when it is full.

#include <spdlog/async_logger.h>
#include <spdlog/details/thread_pool.h>
#include <spdlog/sinks/base_sink.h>
#include <spdlog/sinks/basic_file_sink.h>

#include <memory>
#include <mutex>

#include "bench/log_cases.h"

namespace {

namespace cases = bench::log_cases;

class GateSink final : public spdlog::sinks::base_sink<std::mutex> {
  public:
    explicit GateSink(cases::Gate& gate) : gate_(gate) {}

  private:
    void sink_it_(const spdlog::details::log_msg&) override { gate_.pass(); }
    void flush_() override {}

    cases::Gate& gate_;
};

class SpdlogPeer {
  public:
    SpdlogPeer(const std::string& file, cases::Gate* gate)
        : pool_(std::make_shared<spdlog::details::thread_pool>(cases::kQueued, 1)) {
        std::vector<spdlog::sink_ptr> sinks;
        if (gate)
            sinks.push_back(std::make_shared<GateSink>(*gate));
        sinks.push_back(std::make_shared<spdlog::sinks::basic_file_sink_mt>(file));
        logger_ =
            std::make_shared<spdlog::async_logger>(cases::kLogger, sinks.begin(), sinks.end(),
                                                   pool_, spdlog::async_overflow_policy::block);
        logger_->set_pattern("%Y-%m-%d %H:%M:%S.%e %l %n %v");
        logger_->set_level(spdlog::level::info);
    }

    // The pool's thread leaves when it has written everything; the file is closed
    // by its last owner.
    void finish() {
        pool_.reset();
        logger_.reset();
    }

    class Caller {
      public:
        explicit Caller(SpdlogPeer& peer) : logger_(*peer.logger_) {}

        void message(int a, int b) {
            logger_.info("The modem has registered on a new cell: {} {}", a, b);
        }
        void disabled(int a, int b) {
            logger_.debug("The modem has registered on a new cell: {} {}", a, b);
        }

      private:
        spdlog::logger& logger_;
    };

  private:
    std::shared_ptr<spdlog::details::thread_pool> pool_;
    std::shared_ptr<spdlog::async_logger> logger_;
};

}  // namespace

int main(int argc, char** argv) {
    return cases::run<SpdlogPeer>(argc, argv);
}
