#include "examples/at_channel.h"

#include <utility>

namespace radio {
namespace {

constexpr char kEndOfText = '\x1A';  // Ctrl-Z

bool isFinal(const std::string& text) {
    return text == "OK" || text == "ERROR" || text.starts_with("+CME ERROR:") ||
           text.starts_with("+CMS ERROR:");
}

// +CREG of AT+CREG?: what the lines of its answer begin with.
bool belongsTo(const std::string& command, const std::string& line) {
    const std::string name = nameOfCommand(command).substr(2);
    return !name.empty() && line.starts_with(name + ':');
}

}  // namespace

std::string nameOfCommand(const std::string& command) {
    return command.substr(0, command.find_first_of("=?"));
}

AtChannel::AtChannel(dispatch::queue queue, std::shared_ptr<plr::TimerService> timers,
                     Output output)
    : queue_(std::move(queue)), timers_(std::move(timers)), output_(std::move(output)) {}

AtChannel::~AtChannel() {
    for (const Command& command : commands_)
        command.onAnswer({});
}

void AtChannel::send(std::string command, Handler onAnswer, std::chrono::milliseconds limit,
                     std::string text) {
    commands_.push_back({std::move(command), std::move(onAnswer), limit, std::move(text)});
    if (commands_.size() == 1)
        sendNext();
}

void AtChannel::sendNext() {
    const Command& next = commands_.front();
    limit_ = timers_->startTimer(next.limit, queue_, [this] { output_.onSilence(); });
    write(next.line + '\r');
}

void AtChannel::write(const std::string& bytes) {
    if (!output_.write(bytes))
        output_.onSilence();
}

void AtChannel::handleLine(const ModemLine& line) {
    if (commands_.empty())
        return output_.onUnsolicited(line);
    const std::string& command = commands_.front().line;
    if (line.text == command)
        return;
    if (line.text == LineSplitter::kPrompt && !commands_.front().text.empty())
        return write(std::exchange(commands_.front().text, {}) + kEndOfText);
    if (isFinal(line.text))
        finish(line.text);
    else if (belongsTo(command, line.text) && answer_.lines.size() < kMostLines)
        answer_.lines.push_back(line);
    else
        output_.onUnsolicited(line);
}

// The handler may send more.
void AtChannel::finish(const std::string& result) {
    limit_.reset();
    const Command done = std::move(commands_.front());
    AtAnswer answer = std::exchange(answer_, {});
    answer.result = result;
    commands_.pop_front();
    if (!commands_.empty())
        sendNext();
    done.onAnswer(answer);
}

}  // namespace radio
