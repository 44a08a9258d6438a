#pragma once

#include <sys/epoll.h>
#include <systemd/sd-event.h>

#include <cstdint>
#include <system_error>

#include "dispatch/main_queue.h"

// Serves the main queue, or another pump, from an sd-event loop. For programs that use
// libsystemd, and link it themselves; no other header includes this one.
//
//   const dispatch::sd_event_service service(event);    // the main queue
//   sd_event_loop(event);
//
// Owner:   the thread that runs the loop; made and destroyed there. The pump outlives
//          it.
// Order:   a batch of work each time that the loop comes by, at `priority`.
namespace dispatch {

class sd_event_service {
  public:
    // Throws std::system_error.
    explicit sd_event_service(sd_event* event, const pump& served = main_pump(),
                              std::int64_t priority = SD_EVENT_PRIORITY_NORMAL) {
        check(sd_event_add_io(event, &source_, served.descriptor(), EPOLLIN,
                              &sd_event_service::process, const_cast<pump*>(&served)));
        if (const int result = sd_event_source_set_priority(source_, priority); result < 0) {
            sd_event_source_unref(source_);
            check(result);
        }
    }
    sd_event_service(const sd_event_service&) = delete;
    sd_event_service& operator=(const sd_event_service&) = delete;
    // Off first: the loop may hold the source a while longer.
    ~sd_event_service() {
        sd_event_source_set_enabled(source_, SD_EVENT_OFF);
        sd_event_source_unref(source_);
    }

  private:
    static int process(sd_event_source*, int, std::uint32_t, void* served) {
        static_cast<const pump*>(served)->process();
        return 0;
    }
    static void check(int result) {
        if (result < 0)
            throw std::system_error(-result, std::generic_category(), "sd_event");
    }

    sd_event_source* source_ = nullptr;
};

}  // namespace dispatch
