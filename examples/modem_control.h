#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "examples/at_channel.h"
#include "examples/modem.h"
#include "examples/sms_inbox.h"
#include "plr/concurrency.h"
#include "plr/ipc.h"
#include "plr/log.h"

namespace radio {

// A ModemControl has the modem: it opens the line, asks, and makes reports of what the
// modem answers and says on its own, a path and a value each (radio_reports.h, sms_inbox.h).
//
// A terminal that is not there, hangs up or does not answer is opened again, after
// pauses that grow; what was reported of the radio is not known meanwhile: null, but for
// messages, which stay. A FIFO or a file is only read.
//
// Owner:   the std::shared_ptr of create().
// Queue:   its own, on which all handlers are called.
// Logs:    in the domain radio.modem: each exchange at Trace, with PINs masked, each
//          line that reports something at Debug, what is skipped at Warn.
class ModemControl : public plr::SharedLoggable<ModemControl> {
  public:
    using ReportHandler = std::function<void(const std::string& path, const vox::object& value)>;

    [[nodiscard]] static std::shared_ptr<ModemControl> create(
        std::shared_ptr<plr::LogServer> logServer, std::shared_ptr<plr::TimerService> timers,
        ReportHandler onReport) {
        return make_shared_ptr(
            new ModemControl(std::move(logServer), std::move(timers), std::move(onReport)));
    }

    // Opens the line. Once it is open, or tried: when these settings are others, it is
    // closed and opened anew, as if the modem had been unplugged; else nothing. Any thread.
    void use(ModemSettings settings);
    // Closes it for good: nothing is reported any more when this returns. Not on the queue.
    void close();

    // Any thread. `onAnswer` gets an empty answer when there is no terminal, or its line
    // was lost.
    void send(std::string command, AtChannel::Handler onAnswer);
    // `pdu`: of a message to send, with its SMSC; in hex. May take a minute.
    void sendMessage(std::string pdu, AtChannel::Handler onAnswer);
    // Asks for what there is to report. `onAnswer` gets the last answer.
    void refresh(AtChannel::Handler onAnswer);
    // Resets the modem (AT+CFUN=1,1) and begins anew with it. Whether it is back.
    void reset(std::function<void(bool)> onBack);

  private:
    ModemControl(std::shared_ptr<plr::LogServer> logServer,
                 std::shared_ptr<plr::TimerService> timers, ReportHandler onReport);
    void use_sync(const ModemSettings& settings) PLR_ON(ownQueue_);
    void open_sync() PLR_ON(ownQueue_);
    void openAgain_sync() PLR_ON(ownQueue_);
    void handleEnd_sync() PLR_ON(ownQueue_);
    void lose_sync(const char* why) PLR_ON(ownQueue_);
    void leave_sync() PLR_ON(ownQueue_);
    void begin_sync(const AtChannel::Handler& onAnswer) PLR_ON(ownQueue_);
    void refresh_sync(const AtChannel::Handler& onAnswer) PLR_ON(ownQueue_);
    void send_sync(const std::string& command, AtChannel::Handler onAnswer,
                   std::chrono::milliseconds limit = std::chrono::seconds(5),
                   const std::string& text = {}) PLR_ON(ownQueue_);
    void handleAnswer_sync(const std::string& command, const AtAnswer& answer) PLR_ON(ownQueue_);
    void handleLine_sync(const ModemLine& said) PLR_ON(ownQueue_);
    void report_sync(const std::string& path, const vox::object& value) PLR_ON(ownQueue_);
    [[nodiscard]] ModemHandlers handlers();
    [[nodiscard]] std::unique_ptr<AtChannel> createChannel();
    void trace(std::string_view exchange) const;

    const std::shared_ptr<plr::TimerService> timers_;
    const ReportHandler onReport_;
    ModemSettings settings_ PLR_CONFINED_TO(ownQueue_);  // without a path: none yet
    bool isClosed_ PLR_CONFINED_TO(ownQueue_)
    = false;
    std::unique_ptr<plr::Timer> next_ PLR_CONFINED_TO(ownQueue_);  // attempt to open
    std::unique_ptr<Modem> modem_ PLR_CONFINED_TO(ownQueue_);
    std::unique_ptr<AtChannel> channel_ PLR_CONFINED_TO(ownQueue_);  // of a terminal
    SmsInbox inbox_ PLR_CONFINED_TO(ownQueue_);
    unsigned failures_ PLR_CONFINED_TO(ownQueue_)
    = 0;  // attempts in a row without an answer
    std::set<std::string> reported_ PLR_CONFINED_TO(ownQueue_);  // paths below /radio
};

}  // namespace radio
