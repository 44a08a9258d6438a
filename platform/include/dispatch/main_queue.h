#pragma once

#include "dispatch/pump.h"
#include "plr/base/export.h"

// The main queue: the pump that a process has anyway, for the thread with the
// program's event loop.
//
//   poll(…, main_queue_descriptor(), …);    // with whatever else the loop waits for
//   process_main_queue();                   // when it is readable
//
// or, in a program without a loop of its own, run_main_queue(). It is made when it is
// first asked for, and never destroyed. Where nobody serves it, its work does not run.
namespace dispatch {

// Throws as pump's constructor does, the first time.
[[nodiscard]] PLR_EXPORT const pump& main_pump();

[[nodiscard]] inline const queue& main_queue() {
    return main_pump().queue();
}
[[nodiscard]] inline int main_queue_descriptor() {
    return main_pump().descriptor();
}
inline bool process_main_queue() {
    return main_pump().process();
}
inline void run_main_queue() {
    main_pump().run();
}
inline void stop_main_queue() {
    main_pump().stop();
}

}  // namespace dispatch
