#include "plr/log/vox_logger.h"

#include <utility>

#include "plr/ipc/values.h"
#include "plr/log/log_message_buffer.h"
#include "src/log/remote_log_format.h"
#include "src/log/remote_log_sender.h"

namespace plr {

std::shared_ptr<VoxLogger> VoxLogger::create(dispatch::queue queue, std::string name,
                                             std::string domain, vox::endpoint server) {
    return create(std::move(queue), std::move(name), std::move(domain), server.connect());
}

std::shared_ptr<VoxLogger> VoxLogger::create(dispatch::queue queue, std::string name,
                                             std::string domain, vox::connection server) {
    auto logger =
        make_shared_ptr(new VoxLogger(std::move(queue), std::move(name), std::move(domain)));
    logger->execute_wrapped([self = logger.get(), server = std::move(server)] {
        self->ownQueue_.assertCurrent();
        self->init_sync(server);
    });
    return logger;
}

VoxLogger::VoxLogger(dispatch::queue queue, std::string name, std::string domain)
    : LoggerBase(domain),
      VoxClient(name, std::move(queue)),
      name_(std::move(name)),
      sender_(std::make_shared<RemoteLogSender>(ownQueue_.queue())) {}

VoxLogger::~VoxLogger() {
    sender_->assertCurrent();
    sender_->sendTheRest();
}

void VoxLogger::init_sync(vox::connection server) {
    sender_->assertCurrent();
    setServer_sync(server);
    sender_->stop();
    if (!server)
        return;
    sender_->start(server, checkIn());
    if (toldLevel_ != LogLevel::Unset)
        server.send_message(remote_log::levelMessage(toldLevel_));
    sender_->send();
}

vox::dict VoxLogger::checkIn() const {
    vox::dict message = vox::dict::create();
    message[remote_log::kLoggerName] = vox::string(std::string_view(name_));
    message[remote_log::kLoggerDomain] = vox::string(std::string_view(getLogDomain()));
    return message;
}

void VoxLogger::reconnect(vox::endpoint server) {
    reconnect(server.connect());
}

void VoxLogger::reconnect(vox::connection server) {
    execute_wrapped([this, server = std::move(server)] {
        ownQueue_.assertCurrent();
        init_sync(server);
        if (!server && invalidated_)
            invalidated_();
    });
}

// Hot path: bench/log_remote.cpp.
void VoxLogger::forceLog(LogLevel level, LogMessageBuffer&& buffer) const {
    if (sender_->buffer().add(remote_log::encode(level, std::move(buffer))))
        execute_wrapped([sender = sender_.get()] {
            sender->assertCurrent();
            sender->send();
        });
}

void VoxLogger::setLogLevel(LogLevel level) {
    LoggerCommonBase::setLogLevel(level);
    execute_wrapped([this, level] {
        ownQueue_.assertCurrent();
        toldLevel_ = level;
        helper_sync().getServer().send_message(remote_log::levelMessage(level));
    });
}

void VoxLogger::setInvalidationCallback(dispatch::block<void()> callback) {
    execute_wrapped([this, callback = std::move(callback)] {
        ownQueue_.assertCurrent();
        invalidated_ = callback;
        if (invalidated_ && !helper_sync().getServer())
            invalidated_();
    });
}

void VoxLogger::limitBuffer(std::size_t messages, std::size_t bytes) {
    sender_->buffer().limit(messages, bytes);
}

std::size_t VoxLogger::getHeldMessageCount() const {
    return sender_->buffer().held();
}

std::uint64_t VoxLogger::getDroppedMessageCount() const {
    return sender_->buffer().dropped();
}

dispatch::group VoxLogger::flush() const {
    const dispatch::group confirmed;
    execute_wrapped([sender = sender_.get(), session = dispatch::group_session(confirmed)] {
        sender->assertCurrent();
        sender->flush(session);
    });
    return confirmed;
}

void VoxLogger::handleMessageImpl(vox::dict message) {
    handleMessage_sync(message);
}

void VoxLogger::handleMessage_sync(const vox::dict& message) {
    if (!message.contains(remote_log::kLoggerLevel))
        return;
    setInheritedLogLevel(remote_log::asLevel(message[remote_log::kLoggerLevel]));
    sender_->assertCurrent();
    sender_->levelCame();
}

void VoxLogger::handleServerErrorImpl(vox::object error) {
    handleServerError_sync(error);
}

void VoxLogger::handleServerError_sync(const vox::object& /*error*/) {
    sender_->assertCurrent();
    sender_->stop();
    if (invalidated_)
        invalidated_();
    setServer_sync(nullptr);
}

}  // namespace plr
