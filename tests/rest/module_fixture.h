#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "plr/rest/rest_module.h"
#include "support/raw_rest_client.h"

namespace plr::test {

using Texts = std::vector<std::string>;

// A module and, at the other end of its connection, a server played by hand.
class Module : public testing::Test {
  protected:
    ~Module() override {
        module_.reset();
        drain(queue_);
    }

    // Runs on the module's queue, as its owner's calls do.
    template <class Callable>
    auto on(Callable&& work) {
        return queue_.sync(std::forward<Callable>(work));
    }
    void connect() {
        auto [mine, theirs] = vox::connection::create_pair();
        server_ = std::make_unique<RawRestClient>(theirs, "server");
        on([this, &mine = mine] { module_->connect(mine); });
    }
    // What the module has sent since the last call, as "operation path value".
    Texts heard() {
        Texts texts;
        for (const vox::dict& message : server_->takeMessagesBefore(rest::createPingMessage())) {
            EXPECT_EQ(vox::object(message["a"]).text(), "me");
            texts.push_back(std::string(vox::object(message["o"]).text()) + " " +
                            std::string(vox::object(message["r"]).text()) + " " +
                            RawRestClient::oneLine(message["v"]));
        }
        return texts;
    }
    // Sends to the module and waits until that was handled.
    void tell(const vox::dict& message) {
        server_->send(message);
        static_cast<void>(heard());
    }
    void notify(const char* path, const vox::object& value) {
        tell(server_->message(rest::Operation::kNotify, path, value));
    }
    // A handler that remembers what it is called with.
    RestModule::Handler remember(const char* label) {
        return [this, label](const vox::object& value) {
            calls_.push_back(label + (" " + RawRestClient::oneLine(value)));
        };
    }
    Texts calls() {
        return on([this] { return std::exchange(calls_, {}); });
    }

    const dispatch::queue queue_ = dispatch::queue::create("module");
    std::optional<RestModule> module_{std::in_place, queue_, "me"};
    std::unique_ptr<RawRestClient> server_;
    Texts calls_;  // touched on the module's queue only
};

}  // namespace plr::test
