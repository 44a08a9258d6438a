// radio_hold: holds an assertion until it is asked to end.
//
//   radio_hold PATH         for instance /assertions/keep_radio_on
//
// It says "granted" and "not granted" whenever that changes; not granted at first.
// When the service goes away it asks the next one again.

#include <unistd.h>

#include <iostream>
#include <string>

#include "examples/end_signals.h"
#include "examples/radio_settings.h"
#include "examples/show.h"
#include "plr/rest.h"

int main(int argc, char** argv) {
    if (argc != 2) {
        std::cerr << "usage: radio_hold PATH\n";
        return 2;
    }
    const radio::EndSignals end;
    const auto queue = dispatch::queue::create("radio_hold");
    const plr::RestModule rest(queue, "radio_hold." + std::to_string(::getpid()));
    plr::rest::AssertionHandle held;
    queue.sync([&] {
        held = plr::rest::AssertionHandle(
            rest, argv[1], [](bool granted) { radio::say(granted ? "granted" : "not granted"); });
        rest.connectToService(radio::serviceName());
    });
    const int status = end.wait();
    queue.sync([&] { held.reset(); });
    rest.flush();
    return status;
}
