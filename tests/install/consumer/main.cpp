// A program of somebody else: everything it needs comes from the installation.
#include <iostream>
#include <memory>

#include "plr/plr.h"

extern "C" int values_work(void);

namespace {

// A value makes the way from one connection, through a server's tree, to another.
bool serviceWorks() {
    const auto server =
        plr::rest::RestServerExample::create(dispatch::queue::create("service"), "");
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<plr::rest::PropertyRestResource>(true));
    const auto listener = vox::listener::create_anonymous();
    server->connect(listener);

    const auto queue = dispatch::queue::create("client");
    const plr::RestModule client(queue, "client");
    const dispatch::group open;
    vox::object answer;
    queue.sync([&] {
        client.connect(vox::endpoint::create(listener).connect());
        client.setProperty("/radio/signal", vox::int64(-73));
        client.getPropertyOnce("/radio/signal", [&, session = dispatch::group_session(open)](
                                                    const vox::object& value) { answer = value; });
    });
    return open.wait() == 0 && vox::dyn_cast_or_default(answer, 0) == -73;
}

// What stands outside the namespaces is there, too.
bool callbackWorks() {
    const auto queue = dispatch::queue::create("callback");
    bool outcome = false;
    const dispatch::block<void(bool)> keep([&outcome](bool value) { outcome = value; });
    PelorinAsyncDispatchCallback callback(queue, keep);
    callback.invoke(true);
    return queue.sync([&outcome] { return outcome; });
}

}  // namespace

int main() {
    const bool works = values_work() != 0 && serviceWorks() && callbackWorks();
    std::cout << (works ? "works\n" : "does not work\n");
    return works ? 0 : 1;
}
