#include <chrono>
#include <iostream>
#include <string>
#include <vector>

#include "dispatch/dispatch.h"

using namespace std::chrono_literals;

namespace {

// State that only its queue's work touches needs no lock.
class Inbox {
  public:
    void add(std::string text) {
        queue_.async([this, text = std::move(text)] { texts_.push_back(text); });
    }
    [[nodiscard]] std::size_t size() const {
        return queue_.sync([this] { return texts_.size(); });
    }

  private:
    const dispatch::queue queue_ = dispatch::queue::create("inbox");
    std::vector<std::string> texts_;  // on queue_
};

// Two lines of work that never run at once.
void showTargets() {
    const auto modem = dispatch::queue::create("modem");
    const auto calls = dispatch::queue::create("calls", modem);
    const auto messages = dispatch::queue::create("messages", modem);
    int exchanges = 0;  // in work of the modem
    modem.suspend();    // nothing starts
    calls.async([&exchanges] { ++exchanges; });
    messages.async([&exchanges] { ++exchanges; });
    modem.resume();
    calls.sync([] {});
    messages.sync([] {});
    std::cout << modem.sync([&exchanges] { return exchanges; }) << " exchanges\n";
}

// Work on several queues, and what comes when all of it is done.
void showGroup() {
    const dispatch::group saved;
    for (const char* name : {"first", "second"})
        saved.async(dispatch::queue::create(name), [] { /* … */ });
    saved.notify(dispatch::main_queue(), dispatch::block<void()>([] { std::cout << "saved\n"; }));
}

// A timer on the main queue, which ends the program's loop.
void showTimer(int& ticks, const dispatch::source& timer) {
    timer.set_event_handler(dispatch::block<void()>([&ticks] {
        if (++ticks == 3)
            dispatch::stop_main_queue();
    }));
    timer.set_timer(dispatch::time::after(10ms), 10ms);
    timer.resume();
}

}  // namespace

int main() {
    Inbox inbox;
    inbox.add("hello");
    std::cout << inbox.size() << " text\n";
    showTargets();
    showGroup();
    int ticks = 0;
    const auto timer = dispatch::source::timer(dispatch::main_queue());
    showTimer(ticks, timer);
    dispatch::run_main_queue();
    std::cout << ticks << " ticks\n";
}
