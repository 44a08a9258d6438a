// GLib: a main context a thread, whose idle sources are the work. A context is what
// keeps an order, so queues share them: as many as there are workers.

#include <glib.h>

#include <deque>
#include <thread>
#include <utility>

#include "bench/dispatch_cases.h"

namespace {

class Loop {
  public:
    Loop() : loop_(g_main_loop_new(context_, FALSE)), thread_([this] { run(); }) {}
    ~Loop() {
        post([this] { g_main_loop_quit(loop_); });
        thread_.join();
        g_main_loop_unref(loop_);
        g_main_context_unref(context_);
    }
    Loop(const Loop&) = delete;
    Loop& operator=(const Loop&) = delete;

    // Not g_main_context_invoke(), which runs the work in place on the loop's thread.
    template <class Callable>
    void post(Callable work) {
        GSource* source = g_idle_source_new();
        g_source_set_priority(source, G_PRIORITY_DEFAULT);
        g_source_set_callback(
            source,
            [](void* made) -> int {
                (*static_cast<Callable*>(made))();
                return G_SOURCE_REMOVE;
            },
            new Callable(std::move(work)), [](void* made) { delete static_cast<Callable*>(made); });
        g_source_attach(source, context_);
        g_source_unref(source);
    }

  private:
    void run() {
        g_main_context_push_thread_default(context_);
        g_main_loop_run(loop_);
        g_main_context_pop_thread_default(context_);
    }

    GMainContext* context_ = g_main_context_new();
    GMainLoop* loop_;
    std::thread thread_;
};

struct GlibPeer {
    explicit GlibPeer(unsigned workers) : loops(workers) {}

    class Queue {
      public:
        explicit Queue(GlibPeer& peer) : loop_(peer.loops[peer.next++ % peer.loops.size()]) {}
        template <class Callable>
        void post(Callable&& work) {
            loop_.post(std::forward<Callable>(work));
        }

      private:
        Loop& loop_;
    };

    std::deque<Loop> loops;
    std::size_t next = 0;
};

}  // namespace

int main(int argc, char** argv) {
    return bench::dispatch_cases::run<GlibPeer>(argc, argv);
}
