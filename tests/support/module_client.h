#pragma once

#include <utility>

#include "plr/rest/rest_module.h"

namespace plr::test {

// A module on a queue of its own, disconnected at the end.
class ModuleClient {
  public:
    explicit ModuleClient(const char* name = "me") : module(queue, name) {}
    ~ModuleClient() {
        queue.sync([this] { module.disconnect(); });
    }
    ModuleClient(const ModuleClient&) = delete;
    ModuleClient& operator=(const ModuleClient&) = delete;

    // Runs on the queue, as the owner of a module makes all its calls.
    template <class Callable>
    auto on(Callable&& work) const {
        return queue.is_current() ? work() : queue.sync(std::forward<Callable>(work));
    }

    const dispatch::queue queue = dispatch::queue::create("client");
    const RestModule module;
};

}  // namespace plr::test
