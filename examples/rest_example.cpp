#include <unistd.h>

#include <iostream>

#include "plr/rest.h"

using namespace plr::rest;
constexpr const char* kService = "net.example.radio";

std::shared_ptr<RestServerExample> createService() {
    auto server = RestServerExample::create(dispatch::queue::create("radio"), "radio");
    server->registerResource("/connections", std::make_shared<ConnectionRestResource>());
    server->registerResource("/radio", std::make_shared<PropertyRestResource>(true),
                             {"properties", "What the radio reports."});
    server->registerResource("/assertions", std::make_shared<AssertionRestResource>(provider_only),
                             {"assertions", "What clients need the radio to do."});
    server->registerResource("/requests", std::make_shared<RequestRestResource>(),
                             {"requests", "What clients ask for."});
    server->registerResource("/messages", std::make_shared<MapRestResource>(1000),
                             {"map", "Messages by number."});
    server->describe("/radio/power", {"bool", "Whether the radio is on."});
    server->registerResource("/descriptions", server->descriptions());
    return server;
}

// Others watch, hold and ask; reports, grants and answers come from this user only.
void restrictAccess(RestServerExample& server) {
    const uid_t self = ::geteuid();
    server.setAccessRules({
        {.path = "/radio", .operations = {Operation::kSet}, .users = {self}},
        {.path = "/assertions/keep_radio_on/provider",
         .operations = {Operation::kPush},
         .users = {self}},
        {.path = "/requests", .operations = {Operation::kPush}, .users = {self}},
    });
}

// Grants an assertion and answers a request, as a client of the service.
class Power : public plr::SharedSynchronizable<Power> {
  public:
    static std::shared_ptr<Power> create() {
        auto power = make_shared_ptr(new Power);
        power->execute_wrapped([self = power.get()] { self->start_sync(); });
        return power;
    }

  private:
    Power() : SharedSynchronizable("power") {}
    void start_sync() {
        keepOn_.emplace(rest_, "/assertions/keep_radio_on",
                        [this](const AssertionAcquireState& wanted) {
                            const bool on = wanted.state != AssertionState::kIdle;
                            rest_.setProperty("/radio/power", vox::boolean(on));
                            if (wanted.state == AssertionState::kPending)
                                keepOn_->grant();  // now, or when the radio is up
                        });
        rest_.registerAsRequestSink("/requests/reset", [](auto&& /*value*/, const auto& reply) {
            if (reply)  // else nobody waits
                *reply = vox::string("done");
        });
        rest_.connectToService(kService);
    }

    const plr::RestModule rest_{ownQueue_.queue(), "power"};
    std::optional<AssertionProvider> keepOn_;
};

// Has the radio on, resets it, leaves a message and sees it come.
class Dialer : public plr::SharedSynchronizable<Dialer> {
  public:
    static std::shared_ptr<Dialer> create(dispatch::group open) {
        auto dialer = make_shared_ptr(new Dialer(std::move(open)));
        dialer->execute_wrapped([self = dialer.get()] { self->start_sync(); });
        return dialer;
    }

  private:
    explicit Dialer(dispatch::group open)
        : SharedSynchronizable("dialer"), open_(std::move(open)) {}
    void start_sync() {
        keepOn_ = AssertionHandle(rest_, "/assertions/keep_radio_on", [this](bool granted) {
            std::cout << (granted ? "granted" : "not granted") << '\n';
            if (granted)
                reset_sync();
        });
        const auto onChange = [](Dialer& self, const std::optional<MapChange>& change) {
            if (change)
                change->applyTo(self.messages_);
            if (self.messages_.contains("1"))
                self.open_.leave();
        };
        rest_.watch<MapChange>("/messages", plr::whileAlive(weak_from_this(), onChange));
        rest_.connectToService(kService);
    }
    void reset_sync() {
        const auto onAnswer = [](Dialer& self, const plr::Result<vox::object>& answer) {
            std::cout << (answer ? answer.value() : answer.error()).to_string() << '\n';
            self.rest_.setProperty("/messages/1", vox::string("hello"));
        };
        rest_.sendRequest("/requests/reset", nullptr, std::chrono::seconds(5),
                          plr::whileAlive(weak_from_this(), onAnswer));
    }

    const dispatch::group open_;  // left when all is done
    const plr::RestModule rest_{ownQueue_.queue(), "net.example.dialer"};
    AssertionHandle keepOn_;
    std::map<std::string, vox::object> messages_;
};

int main() {
    const auto service = createService();
    restrictAccess(*service);
    service->connect(vox::listener::create(kService));
    const auto power = Power::create();
    const dispatch::group open;
    open.enter();
    const auto dialer = Dialer::create(open);
    return static_cast<int>(open.wait());
}
