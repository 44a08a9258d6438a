#include "plr/log/log_message.h"

namespace plr {

LogMessage::LogMessage(TimeStamp timeStamp, LogLevel level, std::string domain, std::string&& text,
                       std::vector<std::string>&& metaData) noexcept
    : timeStamp_(timeStamp),
      level_(level),
      domain_(std::move(domain)),
      text_(std::move(text)),
      metaData_(std::move(metaData)) {}

LogMessage::LogMessage(const LogMessage& other) = default;

LogMessage::~LogMessage() = default;

std::shared_ptr<LogMessage> LogMessage::create(TimeStamp timeStamp, LogLevel level,
                                               const std::string& domain, std::string&& text,
                                               std::vector<std::string>&& metaData) {
    return std::make_shared<LogMessage>(timeStamp, level, domain, std::move(text),
                                        std::move(metaData));
}

}  // namespace plr
