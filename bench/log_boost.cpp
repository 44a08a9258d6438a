// Boost.Log's asynchronous sink: records in a bounded queue, one thread behind
// it, callers that wait when it is full. A logger for each thread, as its
// documentation advises.

#include <boost/log/attributes/clock.hpp>
#include <boost/log/core.hpp>
#include <boost/log/expressions.hpp>
#include <boost/log/sinks/async_frontend.hpp>
#include <boost/log/sinks/block_on_overflow.hpp>
#include <boost/log/sinks/bounded_fifo_queue.hpp>
#include <boost/log/sinks/text_file_backend.hpp>
#include <boost/log/sources/record_ostream.hpp>
#include <boost/log/sources/severity_channel_logger.hpp>
#include <boost/log/support/date_time.hpp>
#include <boost/log/trivial.hpp>
#include <boost/smart_ptr/make_shared.hpp>

#include "bench/log_cases.h"

namespace {

namespace cases = bench::log_cases;
namespace logging = boost::log;
namespace expr = boost::log::expressions;
using Level = logging::trivial::severity_level;
using Sink = logging::sinks::asynchronous_sink<
    logging::sinks::text_file_backend,
    logging::sinks::bounded_fifo_queue<cases::kQueued, logging::sinks::block_on_overflow>>;

class BoostPeer {
  public:
    BoostPeer(const std::string& file, cases::Gate* gate) {
        const auto backend = boost::make_shared<logging::sinks::text_file_backend>();
        backend->set_file_name_pattern(file);
        sink_ = boost::make_shared<Sink>(backend);
        const logging::formatter layout =
            expr::stream << expr::format_date_time<boost::posix_time::ptime>("TimeStamp",
                                                                             "%Y-%m-%d %H:%M:%S.%f")
                         << ' ' << expr::attr<Level>("Severity") << ' '
                         << expr::attr<std::string>("Channel") << ' ' << expr::smessage;
        if (gate)
            sink_->set_formatter([layout, gate](const logging::record_view& record,
                                                logging::formatting_ostream& stream) {
                gate->pass();
                layout(record, stream);
            });
        else
            sink_->set_formatter(layout);
        logging::core::get()->add_global_attribute("TimeStamp", logging::attributes::local_clock());
        logging::core::get()->set_filter(expr::attr<Level>("Severity") >= Level::info);
        logging::core::get()->add_sink(sink_);
    }

    void finish() {
        logging::core::get()->remove_sink(sink_);
        sink_->stop();
        sink_->flush();
        sink_.reset();
    }

    class Caller {
      public:
        explicit Caller(BoostPeer&) : logger_(logging::keywords::channel = cases::kLogger) {}

        void message(int a, int b) {
            BOOST_LOG_SEV(logger_, Level::info) << cases::kText << a << ' ' << b;
        }
        void disabled(int a, int b) {
            BOOST_LOG_SEV(logger_, Level::debug) << cases::kText << a << ' ' << b;
        }

      private:
        logging::sources::severity_channel_logger<Level> logger_;
    };

  private:
    boost::shared_ptr<Sink> sink_;
};

}  // namespace

int main(int argc, char** argv) {
    return cases::run<BoostPeer>(argc, argv);
}
