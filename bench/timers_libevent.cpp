// libevent: a binary heap in one base, on one thread (no locks enabled).

#include <event2/event.h>

#include "bench/timers_cases.h"

namespace {

timeval delayOf(std::int64_t nanoseconds) {
    timeval result{};
    result.tv_sec = nanoseconds / bench::timers_cases::kSecond;
    result.tv_usec = nanoseconds % bench::timers_cases::kSecond / 1'000;
    return result;
}

struct LibeventPeer {
    LibeventPeer() {
        event_config* config = event_config_new();
        event_config_set_flag(config, EVENT_BASE_FLAG_PRECISE_TIMER);
        base = event_base_new_with_config(config);
        event_config_free(config);
    }

    template <class Work>
    void inTurns(std::uint64_t turns, Work work) {
        for (std::uint64_t i = 0; i < turns; ++i) {
            work();
            event_base_loop(base, EVLOOP_NONBLOCK);
        }
    }
    void run() { event_base_dispatch(base); }
    void stop() { event_base_loopbreak(base); }

    class Timer {
        struct Base {
            virtual void call() = 0;
            virtual ~Base() = default;
        };
        template <class Callable>
        struct Made final : Base {
            explicit Made(Callable given) : handler(given) {}
            void call() override { handler(); }
            Callable handler;
        };

      public:
        template <class Callable>
        Timer(LibeventPeer& peer, Callable handler)
            : peer_(peer), made_(new Made<Callable>(handler)), event_(make(0)) {}
        ~Timer() { event_free(event_); }
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        void arm(std::int64_t deadline, std::int64_t now) {
            const timeval delay = delayOf(deadline - now);
            event_add(event_, &delay);
        }
        // Its periodic timers start one period from now.
        void repeat(std::int64_t, std::int64_t period) {
            event_free(event_);
            event_ = make(EV_PERSIST);
            const timeval delay = delayOf(period);
            event_add(event_, &delay);
        }
        void disarm() { event_del(event_); }
        static std::int64_t periods() { return 1; }

      private:
        event* make(short kind) {
            return event_new(
                peer_.base, -1, kind,
                [](evutil_socket_t, short, void* made) { static_cast<Base*>(made)->call(); },
                made_.get());
        }

        LibeventPeer& peer_;
        std::unique_ptr<Base> made_;
        event* event_;
    };

    event_base* base;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::timers_cases::run<LibeventPeer>(argc, argv);
}
