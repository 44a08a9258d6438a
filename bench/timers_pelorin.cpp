// Our timer sources, on one serial queue; all of it may be called on any thread.
// Also `service`: a timer of the timer service, made and destroyed.

#include "bench/support/event.h"
#include "bench/timers_cases.h"
#include "dispatch/dispatch.h"
#include "plr/concurrency/dispatch_timer_service.h"

namespace {

struct PelorinPeer {
    template <class Work>
    void inTurns(std::uint64_t turns, Work work) {
        bench::Event done;
        turn(turns, work, done);
        done.wait();
    }

    // The queue runs by itself.
    void run() { stopped.wait(); }
    void stop() { stopped.signal(); }

    class Timer {
      public:
        template <class Callable>
        Timer(PelorinPeer& peer, Callable handler) : source_(dispatch::source::timer(peer.queue)) {
            source_.set_event_handler(dispatch::block<void()>(handler));
        }
        ~Timer() = default;  // the last handle cancels
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        void arm(std::int64_t deadline, std::int64_t) { set(deadline, dispatch::kOnce); }
        void repeat(std::int64_t first, std::int64_t period) {
            set(first, std::chrono::nanoseconds(period));
        }
        void disarm() { source_.set_timer(dispatch::forever, dispatch::kOnce); }
        std::int64_t periods() const { return static_cast<std::int64_t>(source_.data()); }

      private:
        void set(std::int64_t deadline, std::chrono::nanoseconds interval) {
            source_.set_timer(dispatch::time::at(dispatch::clock::monotonic, deadline), interval);
            if (!resumed_)
                source_.resume();
            resumed_ = true;
        }

        dispatch::source source_;
        bool resumed_ = false;
    };

    dispatch::queue queue = dispatch::queue::create("bench");
    bench::Event stopped;

  private:
    template <class Work>
    void turn(std::uint64_t left, Work& work, bench::Event& done) {
        queue.async([this, left, &work, &done] {
            if (left == 0)
                return done.signal();
            work();
            turn(left - 1, work, done);
        });
    }
};

std::int64_t serviceLife(PelorinPeer& peer, plr::TimerService& service, std::uint64_t operations) {
    using bench::timers_cases::kPerTurn;
    bench::timers_cases::Delays delays;
    std::uint64_t fired = 0;
    const std::int64_t start = bench::nowNs();
    peer.inTurns(operations / kPerTurn, [&] {
        for (std::uint64_t i = 0; i < kPerTurn; ++i) {
            const plr::TimerDelay delay = std::chrono::nanoseconds(delays.next());
            const auto timer = service.createOneShotTimerImpl(
                {}, delay.time(), peer.queue, dispatch::block<void()>([&fired] { ++fired; }));
        }
    });
    const std::int64_t taken = bench::nowNs() - start;
    if (fired != 0)
        bench::fail("a cancelled timer fired");
    return taken;
}

int runService(std::size_t others) {
    PelorinPeer peer;
    const auto service = plr::DispatchTimerService::create(nullptr);
    const auto waiting = bench::timers_cases::waiting(peer, others);
    return bench::timers_cases::report(bench::timers_cases::kOperations, [&](std::uint64_t count) {
        return serviceLife(peer, *service, count);
    });
}

}  // namespace

int main(int argc, char** argv) {
    if (argc > 1 && std::string_view(argv[1]) == "service")
        return runService(argc > 2 ? std::strtoul(argv[2], nullptr, 10) : 0);
    return bench::timers_cases::run<PelorinPeer>(argc, argv);
}
