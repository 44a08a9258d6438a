#include <chrono>
#include <ctime>
#include <iostream>

#include "dispatch/dispatch.h"
#include "dispatch/sd_event.h"

// A program around an sd-event loop: work of queues on the loop's own thread.
namespace {

struct Program {
    sd_event* event = nullptr;
    // Its work runs as the main queue's, on the thread of the loop.
    dispatch::queue view = dispatch::queue::create("view", dispatch::main_queue());
};

// On the main queue.
void show(Program& program) {
    std::cout << "work of the main queue\n";
    program.view.after(dispatch::time::after(std::chrono::milliseconds(10)),
                       dispatch::block<void()>([&program] {
                           std::cout << "work after a while\n";
                           sd_event_exit(program.event, 0);
                       }));
}

// A callback of sd-event's, as they go on beside the queues.
int begin(sd_event_source*, std::uint64_t, void* context) {
    std::cout << "a callback of sd-event\n";
    dispatch::queue::global().async([context] {
        // What another thread has found out is shown by the loop's.
        dispatch::main_queue().async([context] { show(*static_cast<Program*>(context)); });
    });
    return 0;
}

}  // namespace

int main() {
    Program program;
    if (sd_event_default(&program.event) < 0)
        return 1;
    int result = 0;
    {
        const dispatch::sd_event_service service(program.event);
        sd_event_add_time_relative(program.event, nullptr, CLOCK_MONOTONIC, 10'000, 0, &begin,
                                   &program);
        result = sd_event_loop(program.event);
    }
    sd_event_unref(program.event);
    return result;
}
