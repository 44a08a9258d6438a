// GLib: sources of one's own with a ready time, in one GMainContext on one thread.

#include <glib.h>

#include "bench/timers_cases.h"

namespace {

// In microseconds, never early.
gint64 readyTime(std::int64_t nanoseconds) {
    return (nanoseconds + 999) / 1'000;
}

struct GlibPeer {
    template <class Work>
    void inTurns(std::uint64_t turns, Work work) {
        for (std::uint64_t i = 0; i < turns; ++i) {
            work();
            g_main_context_iteration(context, FALSE);
        }
    }
    void run() {
        for (stopped = false; !stopped;)
            g_main_context_iteration(context, TRUE);
    }
    void stop() { stopped = true; }

    class Timer {
        struct Source {
            GSource source;
            std::int64_t next;
            std::int64_t period;
        };
        template <class Callable>
        struct Made {
            Source base;
            Callable handler;
        };

      public:
        template <class Callable>
        Timer(GlibPeer& peer, Callable handler) {
            static GSourceFuncs functions = {nullptr, nullptr, &Timer::dispatch<Callable>,
                                             nullptr, nullptr, nullptr};
            source_ = g_source_new(&functions, sizeof(Made<Callable>));
            new (&reinterpret_cast<Made<Callable>*>(source_)->handler) Callable(handler);
            own().period = 0;
            g_source_attach(source_, peer.context);
        }
        ~Timer() {
            g_source_destroy(source_);
            g_source_unref(source_);
        }
        Timer(const Timer&) = delete;
        Timer& operator=(const Timer&) = delete;

        void arm(std::int64_t deadline, std::int64_t) {
            g_source_set_ready_time(source_, readyTime(deadline));
        }
        void repeat(std::int64_t first, std::int64_t period) {
            own().next = first;
            own().period = period;
            arm(first, 0);
        }
        void disarm() { g_source_set_ready_time(source_, -1); }
        static std::int64_t periods() { return 1; }

      private:
        Source& own() { return *reinterpret_cast<Source*>(source_); }

        template <class Callable>
        static gboolean dispatch(GSource* source, GSourceFunc, gpointer) {
            auto* made = reinterpret_cast<Made<Callable>*>(source);
            made->base.next += made->base.period;
            g_source_set_ready_time(source,
                                    made->base.period > 0 ? readyTime(made->base.next) : -1);
            made->handler();
            return G_SOURCE_CONTINUE;
        }

        GSource* source_;
    };

    GMainContext* context = g_main_context_new();
    bool stopped = false;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::timers_cases::run<GlibPeer>(argc, argv);
}
