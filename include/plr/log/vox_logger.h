#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/base/export.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/vox_client.h"
#include "plr/log/logger_base.h"

// A VoxLogger logs into the log server of another process, which has a
// VoxLogServer. It logs as every logger does; its level follows the
// configuration over there, by its domain.
//
//   const auto logger = plr::VoxLogger::create(queue, "dialer", "calls", endpoint);
//   if (logger->enabled(LogLevel::Info))
//       logger->forceLog(LogLevel::Info, plr::LogMessageBuffer() << "dialling");
//
// Owner:    a std::shared_ptr from create(). What was logged before the last
//           owner went is still handed to the kernel, if there is a connection.
// Queue:    the one given, serial; connection and callback run there.
// Threads:  logging and levels on any thread; so every other public member but
//           init_sync().
// Delivery: messages are kept until the server says that its writers have them.
//           What a lost connection left unconfirmed comes again over the next
//           one, in the same order. So each message arrives once, or twice where
//           the server ended between writing it and saying so. (A server of
//           another make may not confirm: then what was handed to the kernel
//           counts as delivered.)
// Memory:   bounded, limitBuffer(). While it is full new messages are dropped and
//           counted; at that place comes "Note: 17 log messages dropped, too many
//           were waiting", at Warn.
// Errors:   a connection that ends is told by the invalidation callback, once;
//           the owner decides when to reconnect(). Until then messages wait, and
//           the last level stays.
// Cost:     a call makes the message and takes one short lock; it waits for
//           nobody (bench/log_remote.cpp). A burst wakes the queue once.
namespace plr {

class RemoteLogSender;

class PLR_EXPORT VoxLogger : private LoggerBase<DummyLogServer>, public VoxClient {
  public:
    // `name` tells loggers of one domain apart; `domain` is components joined by
    // "."; 1 to 256 bytes of UTF-8 each. `server` is a VoxLogServer's endpoint, or
    // a connection that is not started yet; the null object for later: messages
    // wait for reconnect().
    [[nodiscard]] static std::shared_ptr<VoxLogger> create(dispatch::queue queue, std::string name,
                                                           std::string domain,
                                                           vox::endpoint server);
    [[nodiscard]] static std::shared_ptr<VoxLogger> create(dispatch::queue queue, std::string name,
                                                           std::string domain,
                                                           vox::connection server);
    ~VoxLogger() override;

    [[nodiscard]] const std::string& getName() const noexcept { return name_; }
    using LoggerCommonBase::getInheritedLogLevel;
    using LoggerCommonBase::getLocalLogLevel;
    using LoggerCommonBase::getLogDomain;
    using LoggerCommonBase::getLogLevel;

    // Whether messages of that level go out; ask before composing one. Until the
    // server has handed a level down that is the one set by the second; Unset, as
    // it starts, lets everything through.
    using LoggerCommonBase::enabled;
    using LoggerCommonBase::setInheritedLogLevel;
    // Logs what the buffer holds, whatever the level. The buffer is empty then.
    void forceLog(LogLevel level, LogMessageBuffer&& buffer) const;
    // The local level, in force at once; Unset leaves it to the domain. The server
    // shows it in its configuration.
    void setLogLevel(LogLevel level);

    // Runs on the queue whenever the connection has ended by itself; now when
    // there is none. A null block takes it back.
    void setInvalidationCallback(dispatch::block<void()> callback);
    // Replaces the connection, lost or not. The null object counts as one that is
    // lost at once.
    void reconnect(vox::endpoint server);
    void reconnect(vox::connection server);

    // Messages that are held, and what they take in memory, in bytes: 8192 and
    // 4 MiB unless told. One message always fits.
    void limitBuffer(std::size_t messages, std::size_t bytes);
    [[nodiscard]] std::size_t getHeldMessageCount() const;
    // Since the start.
    [[nodiscard]] std::uint64_t getDroppedMessageCount() const;

    // The group is empty once everything logged before has been confirmed, or the
    // connection is lost; at once when there is none. Wait with a bound.
    [[nodiscard]] dispatch::group flush() const;

    // Starts over on `server`: checks in, tells the local level, sends what is
    // held.
    void init_sync(vox::connection server) PLR_ON(ownQueue_);

  protected:
    void handleServerErrorImpl(vox::object error) override PLR_ON(ownQueue_);
    void handleMessageImpl(vox::dict message) override PLR_ON(ownQueue_);

  private:
    VoxLogger(dispatch::queue queue, std::string name, std::string domain);
    void handleMessage_sync(const vox::dict& message) PLR_ON(ownQueue_);
    void handleServerError_sync(const vox::object& error) PLR_ON(ownQueue_);
    [[nodiscard]] vox::dict checkIn() const;

    const std::string name_;
    dispatch::block<void()> invalidated_ PLR_CONFINED_TO(ownQueue_);
    LogLevel toldLevel_ PLR_CONFINED_TO(ownQueue_)
    = LogLevel::Unset;  // the local one, for the server
    const std::shared_ptr<RemoteLogSender> sender_;
};

}  // namespace plr
