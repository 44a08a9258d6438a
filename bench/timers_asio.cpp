// Boost.Asio: steady_timer in an io_context that is told that one thread uses
// it. A cancelled wait still calls its handler, which learns why.

#include <boost/asio/io_context.hpp>
#include <boost/asio/steady_timer.hpp>
#include <functional>

#include "bench/timers_cases.h"

namespace {

struct AsioPeer {
    template <class Work>
    void inTurns(std::uint64_t turns, Work work) {
        for (std::uint64_t i = 0; i < turns; ++i) {
            work();
            context.restart();
            context.poll();
        }
    }
    void run() {
        context.restart();
        context.run();
    }
    void stop() { context.stop(); }

    class Timer {
      public:
        template <class Callable>
        Timer(AsioPeer& peer, Callable handler) : timer_(peer.context), handler_(handler) {}
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        void arm(std::int64_t deadline, std::int64_t) {
            timer_.expires_at(at(deadline));
            timer_.async_wait([this](const boost::system::error_code& error) {
                if (!error)
                    handler_();
            });
        }
        void repeat(std::int64_t first, std::int64_t period) {
            timer_.expires_at(at(first));
            timer_.async_wait([this, first, period](const boost::system::error_code& error) {
                if (error)
                    return;
                repeat(first + period, period);
                handler_();
            });
        }
        void disarm() { timer_.cancel(); }
        static std::int64_t periods() { return 1; }

      private:
        static std::chrono::steady_clock::time_point at(std::int64_t nanoseconds) {
            return std::chrono::steady_clock::time_point(std::chrono::nanoseconds(nanoseconds));
        }
        boost::asio::steady_timer timer_;
        std::function<void()> handler_;
    };

    boost::asio::io_context context{1};
};

}  // namespace

int main(int argc, char** argv) {
    return bench::timers_cases::run<AsioPeer>(argc, argv);
}
