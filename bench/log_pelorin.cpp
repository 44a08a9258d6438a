// Ours: a LogServer with a file writer; loggers are StaticLoggers.

#include <time.h>

#include "bench/log_cases.h"
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

// Lines like those of the peers, through a standard file's buffer.
class FileWriter final : public plr::LogWriter {
  public:
    explicit FileWriter(const std::string& file) : file_(std::fopen(file.c_str(), "w")) {}
    ~FileWriter() override { close(); }
    FileWriter(const FileWriter&) = delete;
    FileWriter& operator=(const FileWriter&) = delete;

    void close() override {
        if (file_)
            std::fclose(std::exchange(file_, nullptr));
    }
    using LogWriter::write;
    void write(const plr::LogMessage& message) override {
        line_.clear();
        addTime(message.getTimeStamp());
        line_.append(plr::asString(message.getLevel())).append(1, ' ');
        line_.append(message.getDomain()).append(1, ' ');
        line_.append(message.getText()).append(1, '\n');
        std::fwrite(line_.data(), 1, line_.size(), file_);
    }
    void flush(dispatch::group_session) override { std::fflush(file_); }

  private:
    void addTime(plr::TimeStamp time) {
        const time_t second = time / 1'000'000'000;
        if (std::exchange(second_, second) != second) {
            tm parts{};
            ::localtime_r(&second, &parts);
            secondLength_ = ::strftime(secondText_, sizeof secondText_, "%F %T.", &parts);
        }
        line_.append(secondText_, secondLength_);
        const auto millisecond = static_cast<unsigned>(time / 1'000'000 % 1'000);
        line_.push_back(static_cast<char>('0' + millisecond / 100));
        line_.push_back(static_cast<char>('0' + millisecond / 10 % 10));
        line_.push_back(static_cast<char>('0' + millisecond % 10));
        line_.push_back(' ');
    }

    FILE* file_;
    time_t second_ = -1;
    char secondText_[32] = {};
    std::size_t secondLength_ = 0;
    std::string line_;
};

class PelorinPeer {
  public:
    PelorinPeer(const std::string& file, cases::Gate* gate)
        : server_(plr::LogServer::create("bench")) {
        if (gate)
            server_->addWriter(std::make_shared<GateWriter>(*gate));
        server_->addWriter(std::make_shared<FileWriter>(file));
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
