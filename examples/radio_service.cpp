#include "examples/radio_service.h"

#include <chrono>
#include <utility>

#include "examples/logging.h"
#include "examples/radio_reports.h"
#include "examples/radio_tree.h"
#include "examples/show.h"

namespace radio {

using plr::LogLevel;
using plr::rest::PropertyRestResource;

namespace {

// What people write to each other is not for logs.
std::string shown(const std::string& path, const vox::object& value) {
    return path.starts_with("/radio/sms/") ? "a message" : oneLine(value);
}

}  // namespace

// Properties that clients set and the service acts on.
class RadioService::Settings : public PropertyRestResource {
  public:
    explicit Settings(std::weak_ptr<RadioService> service)
        : PropertyRestResource(true), service_(std::move(service)) {}

    bool handleRestMessage_SET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override {
        if (const auto service = service_.lock()) {
            service->ownQueue_.assertCurrent();
            service->applySetting_sync(std::string(path.current()), context.getRestValue());
        }
        return PropertyRestResource::handleRestMessage_SET(context, path);
    }

  private:
    const std::weak_ptr<RadioService> service_;
};

RadioService::RadioService(const std::shared_ptr<plr::LogServer>& logServer,
                           std::shared_ptr<plr::TimerService> timers)
    : SharedLoggable("rest", "radio.rest", logServer),
      server_(plr::rest::RestServerExample::create(ownQueue_.queue(), "radio")),
      timers_(std::move(timers)) {}

std::shared_ptr<RadioService> RadioService::create(const std::shared_ptr<plr::LogServer>& logServer,
                                                   std::shared_ptr<plr::TimerService> timers) {
    auto service = make_shared_ptr(new RadioService(logServer, std::move(timers)));
    service->execute_wrapped([self = service.get()] {
        self->ownQueue_.assertCurrent();
        self->init_sync();
    });
    return service;
}

void RadioService::init_sync() {
    installResources(*server_,
                     plr::Logger::create(ownQueue_.queue(), logger().getLogServer(), "log levels",
                                         plr::TrelContext("net.example.radio", "radio.rest")));
    server_->registerResource("/settings", std::make_shared<Settings>(weak_from_this()),
                              {"properties", "What clients want the service to do."});
}

bool RadioService::serve(const vox::connection& listener, std::function<void()> onFailure) {
    server_->setListenerErrorHandler(plr::whileAlive(
        weak_from_this(),
        [onFailure = std::move(onFailure)](RadioService& self, const vox::object& error) {
            self.ownQueue_.assertCurrent();
            self.failed_ = true;
            log(self.logger(), LogLevel::Error, "cannot serve: ", oneLine(error));
            onFailure();
        }));
    server_->connect(listener);
    // A name that is taken is on the queue as an error by now.
    return execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        return !failed_;
    });
}

void RadioService::publish(const std::string& path, const vox::object& value) {
    execute_wrapped([this, path, value] {
        ownQueue_.assertCurrent();
        publish_sync(path, value);
    });
}

void RadioService::publish_sync(const std::string& path, const vox::object& value) {
    published_++;
    if (enabled(LogLevel::Info))
        forceLog(LogLevel::Info, plr::LogMessageBuffer() << path << " = " << shown(path, value));
    set_sync(path, value);
    if (path == "/events/sms")  // the modem keeps it
        set_sync("/messages/" + placeOf(value), value);
}

void RadioService::set_sync(const std::string& path, const vox::object& value) {
    using plr::rest::Operation;
    server_->handleRestMessage(
        nullptr, plr::rest::createRestMessage(asObject(Operation::kSet), vox::string("radiod"),
                                              vox::string(path), value));
}

void RadioService::applySetting_sync(const std::string& name, const vox::object& value) {
    log(logger(), LogLevel::Info, name, " is set to ", oneLine(value));
    if (name == "status_seconds")
        setStatusPeriod_sync(vox::dyn_cast_or_default(value, 0L));
}

// Zero and less end it.
void RadioService::setStatusPeriod_sync(std::int64_t seconds) {
    statusTimer_.reset();
    if (seconds <= 0)
        return;
    statusTimer_ = timers_->startPeriodicTimer(
        std::chrono::seconds(seconds), ownQueue_.queue(),
        plr::whileAlive(weak_from_this(), [](RadioService& self) {
            self.ownQueue_.assertCurrent();
            log(self.logger(), LogLevel::Info, "status: ", self.published_, " reports published");
        }));
}

}  // namespace radio
