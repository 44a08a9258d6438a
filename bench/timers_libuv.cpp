// libuv: a binary heap in one loop, on one thread, in whole milliseconds. A
// handle may be freed after the loop has run its close callback.

#include <uv.h>

#include "bench/timers_cases.h"

namespace {

struct LibuvPeer {
    LibuvPeer() { uv_loop_init(&loop); }

    template <class Work>
    void inTurns(std::uint64_t turns, Work work) {
        for (std::uint64_t i = 0; i < turns; ++i) {
            uv_update_time(&loop);
            work();
            uv_run(&loop, UV_RUN_NOWAIT);
        }
    }
    void run() { uv_run(&loop, UV_RUN_DEFAULT); }
    void stop() { uv_stop(&loop); }

    class Timer {
        struct Base {
            uv_timer_t handle;
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
        Timer(LibuvPeer& peer, Callable handler) : made_(new Made<Callable>(handler)) {
            uv_timer_init(&peer.loop, &made_->handle);
            made_->handle.data = made_;
        }
        ~Timer() {
            uv_close(reinterpret_cast<uv_handle_t*>(&made_->handle),
                     [](uv_handle_t* closed) { delete static_cast<Base*>(closed->data); });
        }
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        void arm(std::int64_t deadline, std::int64_t now) { start(deadline - now, 0); }
        void repeat(std::int64_t first, std::int64_t period) {
            start(first - bench::nowNs(), period);
        }
        void disarm() { uv_timer_stop(&made_->handle); }

        static std::int64_t periods() { return 1; }

      private:
        void start(std::int64_t delay, std::int64_t period) {
            constexpr auto kUnit = static_cast<std::uint64_t>(bench::timers_cases::kMillisecond);
            uv_timer_start(
                &made_->handle, [](uv_timer_t* due) { static_cast<Base*>(due->data)->call(); },
                static_cast<std::uint64_t>(delay) / kUnit,
                static_cast<std::uint64_t>(period) / kUnit);
        }

        Base* made_;
    };

    uv_loop_t loop;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::timers_cases::run<LibuvPeer>(argc, argv);
}
