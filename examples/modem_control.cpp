#include "examples/modem_control.h"

#include <array>
#include <optional>
#include <random>
#include <utility>

#include "examples/at_line.h"
#include "examples/logging.h"
#include "examples/radio_reports.h"
#include "plr/format/hex.h"
#include "plr/rest/reconnect_policy.h"

namespace radio {
namespace {

using plr::LogLevel;

// No echo, error numbers, registration told with its place (V.250, 6.2.4; TS 27.007, 9.1, 7.2);
// messages as PDUs, told as they come (TS 27.005, 3.2.3, 3.4.1).
constexpr std::array kFirst = {"ATE0", "AT+CMEE=1", "AT+CREG=2", "AT+CMGF=0", "AT+CNMI=2,2"};
constexpr std::array kQuestions = {"AT+CPIN?", "AT+CREG?", "AT+COPS?", "AT+CMGL=4", "AT+CSQ"};

constexpr std::size_t kMostPduOctets = 12 + 164;  // SMSC and message (TS 24.011, 8.2.5)

std::chrono::nanoseconds pauseAfter(unsigned failures) {
    static thread_local std::minstd_rand random{std::random_device()()};
    return plr::rest::pauseAfter(failures, {}, std::uniform_real_distribution<>()(random));
}

// What every attempt would say again, an operator need not read.
LogLevel unlessAgain(LogLevel level, unsigned failures) {
    return failures == 0 ? level : LogLevel::Debug;
}

}  // namespace

ModemControl::ModemControl(std::shared_ptr<plr::LogServer> logServer,
                           std::shared_ptr<plr::TimerService> timers, ReportHandler onReport)
    : SharedLoggable("modem", "radio.modem", std::move(logServer)),
      timers_(std::move(timers)),
      onReport_(std::move(onReport)) {}

void ModemControl::use(ModemSettings settings) {
    execute_wrapped([this, settings = std::move(settings)] {
        ownQueue_.assertCurrent();
        use_sync(settings);
    });
}

void ModemControl::close() {
    execute_wrapped_sync([this] {
        ownQueue_.assertCurrent();
        isClosed_ = true;
        next_.reset();
        channel_.reset();
        modem_.reset();
    });
}

void ModemControl::send(std::string command, AtChannel::Handler onAnswer) {
    execute_wrapped([this, command = std::move(command), onAnswer = std::move(onAnswer)] {
        ownQueue_.assertCurrent();
        send_sync(command, onAnswer);
    });
}

// TS 27.005, 4.3: the length is without the SMSC, whose own length is the first octet.
void ModemControl::sendMessage(std::string pdu, AtChannel::Handler onAnswer) {
    execute_wrapped([this, pdu = std::move(pdu), onAnswer = std::move(onAnswer)] {
        ownQueue_.assertCurrent();
        const auto octets = plr::parse_hex(pdu, plr::kHexWhitespaceNone);
        if (octets.empty() || octets.size() < 2U + octets[0] || octets.size() > kMostPduOctets)
            return onAnswer({"no PDU", {}});
        send_sync("AT+CMGS=" + std::to_string(octets.size() - 1 - octets[0]), onAnswer,
                  std::chrono::minutes(1), pdu);
    });
}

void ModemControl::refresh(AtChannel::Handler onAnswer) {
    execute_wrapped([this, onAnswer = std::move(onAnswer)] {
        ownQueue_.assertCurrent();
        refresh_sync(onAnswer);
    });
}

void ModemControl::reset(std::function<void(bool)> onBack) {
    send("AT+CFUN=1,1", [this, onBack = std::move(onBack)](const AtAnswer& answer) {
        ownQueue_.assertCurrent();
        if (!answer.isOk())
            return onBack(false);
        begin_sync([onBack](const AtAnswer& last) { onBack(!last.result.empty()); });
    });
}

// ---- The line ---------------------------------------------------------------------

void ModemControl::use_sync(const ModemSettings& settings) {
    if (settings == settings_)
        return;
    if (!settings_.path.empty())
        log(logger(), LogLevel::Notice, "the settings changed: ", settings.path, ", ",
            settings.baud, " bits a second");
    settings_ = settings;
    failures_ = 0;
    leave_sync();
    open_sync();
}

void ModemControl::open_sync() {
    next_.reset();
    if (isClosed_)
        return;
    try {
        modem_ = std::make_unique<Modem>(settings_, ownQueue_.queue(), handlers());
    } catch (const std::runtime_error& error) {
        log(logger(), unlessAgain(LogLevel::Warn, failures_), error.what());
        return openAgain_sync();
    }
    log(logger(), unlessAgain(LogLevel::Info, failures_), settings_.path, " is open");
    if (!modem_->isTerminal())
        return;
    channel_ = createChannel();
    begin_sync([](const AtAnswer&) {});
}

void ModemControl::openAgain_sync() {
    next_ = timers_->startTimer(pauseAfter(failures_++), ownQueue_.queue(),
                                plr::whileAlive(weak_from_this(), [](ModemControl& self) {
                                    self.ownQueue_.assertCurrent();
                                    self.open_sync();
                                }));
}

// What these call is on the queue, and ends there together with this object.
ModemHandlers ModemControl::handlers() {
    ModemHandlers handlers;
    handlers.onLine = [this](const ModemLine& line) {
        ownQueue_.assertCurrent();
        channel_ ? channel_->handleLine(line) : handleLine_sync(line);
    };
    handlers.onLine = [lines = std::make_shared<PduLines>(std::move(handlers.onLine))](
                          const ModemLine& line) { lines->feed(line); };
    handlers.onEnd = [this] {
        ownQueue_.assertCurrent();
        handleEnd_sync();
    };
    handlers.onTrace = [this](std::string_view exchange) { trace(exchange); };
    return handlers;
}

std::unique_ptr<AtChannel> ModemControl::createChannel() {
    AtChannel::Output output;
    output.write = [this](const std::string& bytes) {
        ownQueue_.assertCurrent();
        return modem_->write(bytes);
    };
    output.onUnsolicited = [this](const ModemLine& line) {
        ownQueue_.assertCurrent();
        handleLine_sync(line);
    };
    output.onSilence = [this] {
        execute_wrapped([this] {  // not in the middle of the channel's work
            ownQueue_.assertCurrent();
            lose_sync("does not answer");
        });
    };
    return std::make_unique<AtChannel>(ownQueue_.queue(), timers_, std::move(output));
}

void ModemControl::handleEnd_sync() {
    if (channel_)
        return lose_sync("has hung up");
    log(logger(), LogLevel::Notice, "the modem has ended");
}

void ModemControl::lose_sync(const char* why) {
    if (!channel_)
        return;
    log(logger(), unlessAgain(LogLevel::Warn, failures_), "the modem ", why);
    leave_sync();
    openAgain_sync();
}

// What is asked and answered meanwhile finds no channel any more.
void ModemControl::leave_sync() {
    const auto channel = std::exchange(channel_, nullptr);
    modem_.reset();
    for (const std::string& path : std::exchange(reported_, {}))
        onReport_(path, {});
}

// ---- Questions and reports --------------------------------------------------------

void ModemControl::begin_sync(const AtChannel::Handler& onAnswer) {
    for (const char* command : kFirst)
        send_sync(command, {});
    refresh_sync(onAnswer);
}

void ModemControl::refresh_sync(const AtChannel::Handler& onAnswer) {
    for (const char* command : kQuestions)
        send_sync(command, command == kQuestions.back() ? onAnswer : AtChannel::Handler());
}

void ModemControl::send_sync(const std::string& command, AtChannel::Handler onAnswer,
                             std::chrono::milliseconds limit, const std::string& text) {
    if (!channel_) {
        if (onAnswer)
            onAnswer({});
        return;
    }
    channel_->send(
        command,
        [this, command, onAnswer = std::move(onAnswer)](const auto& answer) {
            ownQueue_.assertCurrent();
            handleAnswer_sync(command, answer);
            if (onAnswer)
                onAnswer(answer);
        },
        limit, text);
}

void ModemControl::handleAnswer_sync(const std::string& command, const AtAnswer& answer) {
    for (const ModemLine& line : answer.lines)
        handleLine_sync(line);
    if (answer.result.empty())
        return;
    if (std::exchange(failures_, 0) > 0)
        log(logger(), LogLevel::Notice, "the modem answers");
    if (!answer.isOk())
        log(logger(), LogLevel::Info, nameOfCommand(command), " gets ", answer.result);
}

void ModemControl::handleLine_sync(const ModemLine& said) {
    log(logger(), LogLevel::Debug, "line ", said.number, ": ", said.text);
    const auto line = said.cut ? std::nullopt : parseAtLine(said.text);
    const Reading reading = !line                    ? Reading{{}, {}, "unreadable"}
                            : SmsInbox::isFor(*line) ? inbox_.read(*line)
                                                     : readLine(*line);
    if (reading.complaint)
        log(logger(), LogLevel::Warn, "line ", said.number, " is ", reading.complaint,
            ", skipped: ", said.text);
    if (!reading.path.empty())
        report_sync(reading.path, reading.value);
}

void ModemControl::report_sync(const std::string& path, const vox::object& value) {
    if (path.starts_with("/radio/") && !path.starts_with("/radio/sms/"))
        reported_.insert(path);
    onReport_(path, value);
}

// Line by line: a text of the log has no line feeds.
void ModemControl::trace(std::string_view exchange) const {
    if (!logger().enabled(LogLevel::Trace))
        return;
    while (!exchange.empty()) {
        const auto end = exchange.find('\n');
        log(logger(), LogLevel::Trace, std::string(exchange.substr(0, end)));
        exchange.remove_prefix(end == std::string_view::npos ? exchange.size() : end + 1);
    }
}

}  // namespace radio
