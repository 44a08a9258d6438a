#include <chrono>
#include <cstddef>
#include <cstdlib>
#include <iostream>
#include <memory>
#include <string>
#include <utility>

#include "plr/concurrency.h"
#include "plr/log.h"
#include "plr/test.h"

using namespace std::chrono_literals;

namespace {

// What is tested: a daemon's part that asks for something every minute, by way of a
// connection, and complains after ten seconds without an answer.
class Poller : public plr::SharedLoggable<Poller> {
  public:
    static std::shared_ptr<Poller> create(std::shared_ptr<plr::TimerService> timers,
                                          std::shared_ptr<plr::LogServer> log,
                                          vox::connection service) {
        auto made =
            make_shared_ptr(new Poller(std::move(timers), std::move(log), std::move(service)));
        made->execute_wrapped([self = made.get()] {
            self->ownQueue_.assertCurrent();
            self->init_sync();
        });
        return made;
    }
    ~Poller() override { service_.cancel(); }

  private:
    Poller(std::shared_ptr<plr::TimerService> timers, std::shared_ptr<plr::LogServer> log,
           vox::connection service)
        : SharedLoggable("poller", "poller", std::move(log)),
          timers_(std::move(timers)),
          service_(std::move(service)) {}

    void init_sync() PLR_ON(ownQueue_)
    {
        service_.set_target_queue(ownQueue_.queue());
        service_.set_event_handler([](const vox::object&) {});
        service_.resume();
        timer_ = timers_->startPeriodicTimer(
            1min, ownQueue_.queue(),
            plr::whileAlive(weak_from_this(), [](Poller& self) { self.ask(); }));
    }

    void ask() {
        ownQueue_.assertCurrent();
        service_.send_request(
            vox::dict::create(), 10s, ownQueue_.queue(),
            dispatch::block<void(vox::object)>(
                plr::whileAlive(weak_from_this(), [](Poller& self, const vox::object& reply) {
                    if (!vox::dict(reply))
                        self.forceLog(plr::LogLevel::Warn, plr::LogMessageBuffer() << "no answer");
                })));
    }

    const std::shared_ptr<plr::TimerService> timers_;
    const vox::connection service_;
    std::unique_ptr<plr::Timer> timer_ PLR_CONFINED_TO(ownQueue_);
};

void expect(bool holds, const char* claim) {
    std::cout << (holds ? "ok: " : "failed: ") << claim << std::endl;
    if (!holds)
        std::quick_exit(1);
}

}  // namespace

// A day of the poller's life, in a moment; any test framework would do.
int main() {
    plr::test::VirtualTime time;
    plr::test::VoxPeer service;
    const auto log = std::make_shared<plr::test::RecordingLogWriter>();
    const auto server = plr::LogServer::create("test");
    server->addWriter(log);
    server->start();

    const auto poller =
        Poller::create(plr::DispatchTimerService::create(nullptr), server, service.tested());
    service.answerWith([](const vox::dict&, vox::dict&) { return true; });
    time.advance(24h);
    expect(service.takeMessages().size() == std::size_t{24} * 60, "asks every minute");
    expect(log->takeLines().empty(), "does not complain about a service that answers");

    service.answerWith({});
    time.advance(1min + 9s);
    expect(log->takeLines().empty(), "has patience for ten seconds");
    time.advance(1s);
    expect(log->takeLines().size() == 1, "complains after that");
}
