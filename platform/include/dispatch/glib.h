#pragma once

#include <glib-unix.h>
#include <glib.h>

#include "dispatch/main_queue.h"

// Serves the main queue, or another pump, from a GLib main loop. For programs that
// use GLib 2.36 or later, and link it themselves; no other header includes this one.
//
//   const dispatch::glib_service service;    // the main queue, from the default context
//   g_main_loop_run(loop);
//
// Owner:   the thread that runs the context; made and destroyed there. The pump
//          outlives it.
// Order:   a batch of work each time that the loop comes by, at `priority`.
namespace dispatch {

class glib_service {
  public:
    // `context` null for the default one.
    explicit glib_service(const pump& served = main_pump(), GMainContext* context = nullptr,
                          int priority = G_PRIORITY_DEFAULT)
        : source_(g_unix_fd_source_new(served.descriptor(), G_IO_IN)) {
        // A callback's real type depends on its source: here, GUnixFDSourceFunc.
        const auto function = reinterpret_cast<void (*)()>(&glib_service::process);
        g_source_set_callback(source_, reinterpret_cast<GSourceFunc>(function),
                              const_cast<pump*>(&served), nullptr);
        g_source_set_priority(source_, priority);
        g_source_attach(source_, context);
    }
    glib_service(const glib_service&) = delete;
    glib_service& operator=(const glib_service&) = delete;
    ~glib_service() {
        g_source_destroy(source_);
        g_source_unref(source_);
    }

  private:
    static gboolean process(int, GIOCondition, void* served) {
        static_cast<const pump*>(served)->process();
        return G_SOURCE_CONTINUE;
    }

    GSource* const source_;
};

}  // namespace dispatch
