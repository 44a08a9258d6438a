#pragma once

#include <chrono>
#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "examples/line_splitter.h"
#include "plr/concurrency.h"

namespace radio {

// What a modem said to one command (ITU-T V.250, section 5.7; 3GPP TS 27.007, 9.2).
struct AtAnswer {
    std::string result;            // OK, ERROR, +CME ERROR: 10, …; empty: there was none
    std::vector<ModemLine> lines;  // the information text: those with the command's name

    [[nodiscard]] bool isOk() const noexcept { return result == "OK"; }
};

// An AtChannel asks a modem: commands go out one at a time and in order, each when the
// one before is answered. A line that belongs to no answer is what the modem says on
// its own; its echo is dropped.
//
// Owner: its creator.
// Queue: one has everything, handlers and destruction too. No handler may destroy it.
class AtChannel {
  public:
    static constexpr std::size_t kMostLines = 256;  // of an answer; others are unsolicited
    using Handler = std::function<void(const AtAnswer&)>;

    struct Output {
        std::function<bool(const std::string&)> write;  // false: the line is gone
        LineSplitter::Handler onUnsolicited;
        // The command under way was not answered within its time, or not written. Time to
        // end the channel: a late answer would be taken for that of the next command.
        std::function<void()> onSilence;
    };

    AtChannel(dispatch::queue queue, std::shared_ptr<plr::TimerService> timers, Output output);
    // Commands without an answer get the empty one.
    ~AtChannel();

    // `command`: without its CR; its name is all up to the first of "=?". `text`: goes out
    // when the modem prompts for it, and Ctrl-Z behind it.
    void send(std::string command, Handler onAnswer,
              std::chrono::milliseconds limit = std::chrono::seconds(5), std::string text = {});
    void handleLine(const ModemLine& line);

  private:
    struct Command {
        std::string line;
        Handler onAnswer;
        std::chrono::milliseconds limit;
        std::string text;  // to be prompted for
    };

    void sendNext();
    void write(const std::string& bytes);
    void finish(const std::string& result);

    const dispatch::queue queue_;
    const std::shared_ptr<plr::TimerService> timers_;
    const Output output_;
    std::deque<Command> commands_;  // the first one is under way
    AtAnswer answer_;               // to it, so far
    std::unique_ptr<plr::Timer> limit_;
};

// The name of a command without what may be secret: AT+CPIN of AT+CPIN="1234".
[[nodiscard]] std::string nameOfCommand(const std::string& command);

}  // namespace radio
