// log4cplus: an asynchronous appender before a file appender, one thread behind
// it, callers that wait when its queue is full.

#include <log4cplus/asyncappender.h>
#include <log4cplus/fileappender.h>
#include <log4cplus/initializer.h>
#include <log4cplus/layout.h>
#include <log4cplus/logger.h>
#include <log4cplus/loggingmacros.h>

#include "bench/log_cases.h"

namespace {

namespace cases = bench::log_cases;

class GateAppender final : public log4cplus::Appender {
  public:
    explicit GateAppender(cases::Gate& gate) : gate_(gate) {}
    ~GateAppender() override { destructorImpl(); }
    void close() override { closed = true; }

  private:
    void append(const log4cplus::spi::InternalLoggingEvent&) override { gate_.pass(); }

    cases::Gate& gate_;
};

class Log4cplusPeer {
  public:
    Log4cplusPeer(const std::string& file, cases::Gate* gate)
        : logger_(log4cplus::Logger::getInstance(cases::kLogger)) {
        file_ = new log4cplus::FileAppender(file, std::ios_base::trunc, false);
        file_->setLayout(
            std::make_unique<log4cplus::PatternLayout>("%D{%Y-%m-%d %H:%M:%S.%q} %p %c %m%n"));
        const log4cplus::SharedAppenderPtr first(gate ? new GateAppender(*gate) : file_.get());
        const log4cplus::AsyncAppenderPtr queue(
            new log4cplus::AsyncAppender(first, cases::kQueued));
        if (gate)
            queue->addAppender(file_);
        logger_.addAppender(log4cplus::SharedAppenderPtr(queue.get()));
        logger_.setLogLevel(log4cplus::INFO_LOG_LEVEL);
        logger_.setAdditivity(false);
    }

    // Closes the queue, which empties it first, then the file.
    void finish() {
        logger_.closeNestedAppenders();
        logger_.removeAllAppenders();
        file_->close();
    }

    class Caller {
      public:
        explicit Caller(Log4cplusPeer& peer) : logger_(peer.logger_) {}

        void message(int a, int b) { LOG4CPLUS_INFO(logger_, cases::kText << a << ' ' << b); }
        void disabled(int a, int b) { LOG4CPLUS_DEBUG(logger_, cases::kText << a << ' ' << b); }

      private:
        log4cplus::Logger logger_;
    };

  private:
    log4cplus::Logger logger_;
    log4cplus::SharedAppenderPtr file_;
};

}  // namespace

int main(int argc, char** argv) {
    const log4cplus::Initializer initialized;
    return cases::run<Log4cplusPeer>(argc, argv);
}
