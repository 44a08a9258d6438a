#include "dispatch/pump.h"

#include <memory>

#include "dispatch/main_queue.h"
#include "platform/linux/dispatch/pump_core.h"
#include "platform/linux/dispatch/queue_core.h"

namespace dispatch {

using detail::pump_core;
using detail::queue_core;

pump::pump(std::string_view label)
    : queue_(dispatch::queue::adopt(
          queue_core::create(label, nullptr, std::make_unique<pump_core>()))) {}

pump::~pump() {
    if (queue_)
        queue_.get()->pump()->close(*queue_.get());
}

int pump::descriptor() const noexcept {
    return queue_.get()->pump()->descriptor();
}
bool pump::process() const {
    return queue_.get()->pump()->process(*queue_.get());
}
void pump::run() const {
    queue_.get()->pump()->run(*queue_.get());
}
void pump::stop() const noexcept {
    queue_.get()->pump()->stop();
}

const pump& main_pump() {
    static const pump& made = *new pump("main");
    return made;
}

}  // namespace dispatch
