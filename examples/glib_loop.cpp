#include <chrono>
#include <iostream>

#include "dispatch/dispatch.h"
#include "dispatch/glib.h"

// A program around a GLib main loop: work of queues on the loop's own thread.
namespace {

struct Program {
    GMainLoop* loop = g_main_loop_new(nullptr, FALSE);
    // Its work runs as the main queue's, on the thread of the loop.
    dispatch::queue view = dispatch::queue::create("view", dispatch::main_queue());
};

// On the main queue.
void show(Program& program) {
    std::cout << "work of the main queue\n";
    program.view.after(dispatch::time::after(std::chrono::milliseconds(10)),
                       dispatch::block<void()>([&program] {
                           std::cout << "work after a while\n";
                           g_main_loop_quit(program.loop);
                       }));
}

// A callback of GLib's, as they go on beside the queues.
gboolean begin(void* context) {
    std::cout << "a callback of GLib\n";
    dispatch::queue::global().async([context] {
        // What another thread has found out is shown by the loop's.
        dispatch::main_queue().async([context] { show(*static_cast<Program*>(context)); });
    });
    return G_SOURCE_REMOVE;
}

}  // namespace

int main() {
    Program program;
    {
        const dispatch::glib_service service;
        g_timeout_add(10, &begin, &program);
        g_main_loop_run(program.loop);
    }
    g_main_loop_unref(program.loop);
}
