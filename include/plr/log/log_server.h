#pragma once

#include <cstddef>
#include <memory>
#include <string>

#include "dispatch/group.h"
#include "plr/base/export.h"
#include "plr/concurrency/shared_synchronizable.h"
#include "plr/ipc/dict.h"
#include "plr/log/log_level.h"
#include "plr/log/logger_tree.h"

// A LogServer takes finished messages from loggers on any thread and hands them,
// in logging order, to its writers. It owns the tree of domains: which level
// applies where, and who is to be told when that changes.
//
// Owner:   the process, through std::shared_ptr made by create().
// Queues:  "logmaster::<name>" owns the tree and the configuration;
//          "logmaster::<name>::writers" makes every writer call.
// Order:   all writers see one order, in which two messages that one thread
//          logged one after the other stay in order.
// Cost:    log() takes one short lock and waits for no writer; while messages
//          keep coming nobody is woken for them. A burst is delivered at once
//          when it starts, what follows within 100 microseconds after that, or
//          when 256 messages wait or an Error came.
// Memory:  what waits for the writers is not bounded unless limitPending() says so.
// Fork:    fork(2) waits for the writer call that is under way. In the child, what is
//          logged from then on is written; what waited is the parent's to write.
namespace plr {

class LevelTable;
class LogDelivery;
class LogMessage;
class LogWriter;
class MemoryBufferedLogWriter;
class TrackedLogger;

class PLR_EXPORT LogServer : public SharedSynchronizable<LogServer> {
  public:
    // With a startup buffer, messages are kept in it until start().
    [[nodiscard]] static std::shared_ptr<LogServer> create(const std::string& name);
    [[nodiscard]] static std::shared_ptr<LogServer> create(
        const std::string& name, std::unique_ptr<MemoryBufferedLogWriter> startupBuffer);
    virtual ~LogServer();

    [[nodiscard]] const std::string& getName() const noexcept { return name_; }

    // Levels take effect: Info where nothing is configured (before, everything is
    // enabled). Then the startup buffer goes to the writers, behind a note of how
    // many messages it had to drop. Waits for both queues: not on one of them.
    void start();

    // Any thread. Null is ignored.
    void log(std::shared_ptr<LogMessage> message);

    // Takes effect behind what was logged before. Any thread. Null is ignored.
    void addWriter(std::shared_ptr<LogWriter> writer);

    // The logger is told its level now when its domain has a configured one, and
    // again, and at every change, from the server's queue. Held weakly. Any thread.
    void registerLogger(const std::string& domain, const std::shared_ptr<TrackedLogger>& logger);
    // Forgets loggers of `domain` that are gone, and the domain when nothing else
    // needs it: for domains that others make up. Asynchronous. Any thread.
    void tidyUp(const std::string& domain);

    // The level of the nearest configured domain above `domain`, without a lock:
    // Unset before start(). Any thread.
    [[nodiscard]] LogLevel getCurrentLogLevel(const std::string& domain) const;
    // The same from the tree itself; waits for the server's queue: not on it.
    [[nodiscard]] LogLevel getCurrentLogLevelSlow(const std::string& domain) const;

    // Sets levels by domain: the integers in the dictionary config["kDomainLogLevels"];
    // domains that are not named keep theirs, Unset (0) takes one back. Asynchronous.
    void updateConfig(vox::dict config);

    // "kDomainLogLevels": levels by domain; "kLoggers": dictionaries with
    // "kLoggerName", "kLoggerLevel" and "kLoggerDomain"; "kLogWriters": what the
    // writers tell. The simple form has what was set, the full one everything.
    // Waits for both queues: not on one of them.
    [[nodiscard]] vox::dict getConfig() const;
    [[nodiscard]] vox::dict getSimpleConfig() const;

    // The group is empty once every writer has passed on what was logged before.
    // Any thread.
    [[nodiscard]] dispatch::group flush() const;
    // Returns when what was queued on the server's queue before has run, and
    // messages logged before have been written. Not on the server's queues.
    void debugFlush() const;

    // Closes every writer behind what was logged before. Asynchronous.
    void close();

    // What happens to log() while `messages` wait for the writers: callers wait
    // for room (those on the writers queue never do), or new messages are dropped,
    // counted and reported where the gap is. 0 takes the limit off. Any thread.
    enum class WhenFull { Wait, Drop };
    void limitPending(std::size_t messages, WhenFull policy);

  protected:
    LogServer(const std::string& name, std::unique_ptr<MemoryBufferedLogWriter> startupBuffer);

    // What getConfig() and getSimpleConfig() put into `config`.
    virtual void fillLogWriterFullConfig_sync(vox::dict& config) const PLR_ON(ownQueue_);
    virtual void fillLogWriterSimpleConfig_sync(vox::dict& config) const PLR_ON(ownQueue_);
    virtual void fillLoggerFullConfig_sync(vox::dict& config) const PLR_ON(ownQueue_);
    virtual void fillLoggerSimpleConfig_sync(vox::dict& config) const PLR_ON(ownQueue_);

  private:
    friend class SharedSynchronizable<LogServer>;
    friend class CrashDrain;
    void commitLevels_sync() PLR_ON(ownQueue_);
    void updateConfig_sync(const vox::dict& config) PLR_ON(ownQueue_);

    const std::string name_;
    const std::unique_ptr<LevelTable> levels_;
    LoggerTree tree_ PLR_CONFINED_TO(ownQueue_);
    const std::shared_ptr<LogDelivery> delivery_;
};

}  // namespace plr
