// Ours: a LogServer with a FileLogWriter that never rotates, callers that wait
// when kQueued messages do; a StaticLogger for each thread.

#include "bench/log_cases.h"
#include "plr/log/file_log_writer.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/log_server.h"
#include "plr/log/log_writer.h"
#include "plr/log/static_logger.h"

namespace {

namespace cases = bench::log_cases;
using plr::LogLevel;

class GateWriter final : public plr::LogWriter {
  public:
    explicit GateWriter(cases::Gate& gate) : gate_(gate) {}
    void close() override {}
    using LogWriter::write;
    void write(const plr::LogMessage&) override { gate_.pass(); }

  private:
    cases::Gate& gate_;
};

class PelorinPeer {
  public:
    PelorinPeer(const std::string& file, cases::Gate* gate)
        : server_(plr::LogServer::create("bench")) {
        if (gate)
            server_->addWriter(std::make_shared<GateWriter>(*gate));
        server_->addWriter(plr::FileLogWriter::create({.path = file, .maxBytes = 0}));
        server_->limitPending(cases::kQueued, plr::LogServer::WhenFull::Wait);
        server_->start();
    }

    void finish() {
        if (server_->flush().wait() != 0)
            bench::fail("not flushed");
    }

    class Caller {
      public:
        explicit Caller(PelorinPeer& peer) : logger_(cases::kLogger, peer.server_) {}

        void message(int a, int b) const { log(LogLevel::Info, a, b); }
        void disabled(int a, int b) const { log(LogLevel::Debug, a, b); }

      private:
        void log(LogLevel level, int a, int b) const {
            if (logger_.enabled(level)) {
                plr::LogMessageBuffer text;
                text << cases::kText << a << ' ' << b;
                logger_.forceLog(level, std::move(text));
            }
        }

        const plr::StaticLogger logger_;
    };

  private:
    std::shared_ptr<plr::LogServer> server_;
};

}  // namespace

int main(int argc, char** argv) {
    return cases::run<PelorinPeer>(argc, argv);
}
