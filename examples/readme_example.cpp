#include <iostream>
#include <memory>

#include "plr/rest.h"

// A service with a property, and a client that watches it.
int main() {
    const auto server =
        plr::rest::RestServerExample::create(dispatch::queue::create("service"), "example");
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<plr::rest::PropertyRestResource>(true));
    // Named listeners serve other processes; this one is for whom we tell.
    const auto listener = vox::listener::create_anonymous();
    server->connect(listener);

    const auto queue = dispatch::queue::create("client");
    const plr::RestModule client(queue, "client");
    const dispatch::group seen;
    seen.enter();
    queue.sync([&] {
        client.observeProperty("/radio/signal", [&](const vox::object& dBm) {
            std::cout << "signal: " << dBm.to_string() << '\n';  // null at first, then -85
            if (dBm)
                seen.leave();
        });
        client.connect(vox::endpoint::create(listener).connect());
        client.setProperty("/radio/signal", vox::int64(-85));
    });
    return static_cast<int>(seen.wait());
}
