#include "examples/modem_requests.h"

#include <algorithm>
#include <utility>

#include "examples/logging.h"

namespace radio {
namespace {

using plr::LogLevel;

constexpr std::size_t kMostParts = 255;  // of a message

// TS 27.007, 8.3 and TS 31.101, 9.5.1: 4 to 8 digits.
bool isPin(std::string_view text) {
    return text.size() >= 4 && text.size() <= 8 &&
           std::ranges::all_of(text, [](char c) { return c >= '0' && c <= '9'; });
}

AtChannel::Handler answerWith(const std::shared_ptr<vox::object>& reply) {
    return [reply](const AtAnswer& answer) {
        if (reply)
            *reply = vox::string(answer.result.empty() ? "no answer" : answer.result);
    };
}

// One after the other, up to the first that is not sent.
void sendFrom(const std::shared_ptr<ModemControl>& modem, std::vector<std::string> pdus,
              std::size_t index, const AtChannel::Handler& onAnswer) {
    if (index == pdus.size())
        return onAnswer({index == 0 ? "no PDU" : "OK", {}});
    const std::string pdu = pdus[index];
    modem->sendMessage(pdu, [modem, pdus = std::move(pdus), index, onAnswer](const auto& answer) {
        if (answer.isOk())
            sendFrom(modem, pdus, index + 1, onAnswer);
        else
            onAnswer(answer);
    });
}

}  // namespace

std::shared_ptr<ModemRequests> ModemRequests::create(
    const std::shared_ptr<plr::LogServer>& logServer, std::shared_ptr<ModemControl> modem,
    vox::connection service) {
    auto requests = make_shared_ptr(new ModemRequests(logServer, std::move(modem)));
    requests->execute_wrapped([self = requests.get(), service = std::move(service)] {
        self->ownQueue_.assertCurrent();
        self->init_sync(service);
    });
    return requests;
}

void ModemRequests::init_sync(vox::connection service) {
    // This object goes on its queue, and with it the handlers.
    rest_.registerAsRequestSink("/requests/enter_pin", [this](const auto& pin, const Reply& reply) {
        ownQueue_.assertCurrent();
        enterPin_sync(pin, reply);
    });
    rest_.registerAsRequestSink("/requests/refresh", [this](auto&&, const Reply& reply) {
        ownQueue_.assertCurrent();
        modem_->refresh(answerWith(reply));
    });
    rest_.registerAsRequestSink("/requests/reset_modem", [this](auto&&, const Reply& reply) {
        ownQueue_.assertCurrent();
        reset_sync(reply);
    });
    rest_.registerAsRequestSink("/requests/send_sms", [this](const auto& pdus, const Reply& reply) {
        ownQueue_.assertCurrent();
        sendMessages_sync(pdus, reply);
    });
    rest_.connect(std::move(service));
}

// Whatever else the text may be would be a command.
void ModemRequests::enterPin_sync(const vox::object& pin, const Reply& reply) {
    const std::string digits(pin.text());
    if (isPin(digits))
        modem_->send("AT+CPIN=\"" + digits + '"', answerWith(reply));
    else if (reply)
        *reply = vox::string("no PIN");
}

void ModemRequests::sendMessages_sync(const vox::object& pdus, const Reply& reply) {
    const vox::array values(pdus);
    std::vector<std::string> texts;
    for (std::size_t i = 0; values && values.count() <= kMostParts && i < values.count(); ++i)
        texts.emplace_back(vox::object(values[i]).text());
    sendFrom(modem_, std::move(texts), 0, answerWith(reply));
}

void ModemRequests::reset_sync(const Reply& reply) {
    log(logger(), LogLevel::Notice, "the modem is to be reset");
    modem_->reset(plr::whileAlive(weak_from_this(), [reply](ModemRequests& self, bool isBack) {
        log(self.logger(), LogLevel::Notice, "the modem is ", isBack ? "reset" : "not reset");
        const std::int64_t resets = self.resets_ += isBack ? 1 : 0;
        if (reply)
            *reply = isBack ? vox::int64(resets) : vox::string("not reset");
    }));
}

}  // namespace radio
