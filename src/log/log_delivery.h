#pragma once

#include <pthread.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "dispatch/block.h"
#include "dispatch/group.h"
#include "dispatch/queue.h"
#include "plr/concurrency/queue_role.h"
#include "plr/ipc/array.h"
#include "plr/log/log_server.h"
#include "src/base/brief_mutex.h"

// How messages get from log() to the writers.
//
// Threads: log() on any; the rest on the writers queue, or queueing there.
// Order:   messages and operations on writers wait in one list, so that an
//          operation comes exactly between what was logged before and after it.
// State:   Idle: nothing waits, the next message schedules a delivery.
//          Scheduled: a delivery is queued or running.
//          Lingering: a delivery has just run; a timer looks again soon, so
//          that messages that follow each other wake nobody, one by one.
// fork():  waits for the writer call that is under way. The child goes on with the
//          writers as they are; what waits is its parent's to write.
namespace plr {

class BatchLogWriter;

class LogDelivery {
  public:
    using MessagePtr = std::shared_ptr<LogMessage>;

    LogDelivery(LogServer& server, const std::string& name,
                std::unique_ptr<MemoryBufferedLogWriter> startupBuffer);
    ~LogDelivery();

    void log(MessagePtr&& message);
    void limitPending(std::size_t messages, LogServer::WhenFull policy);

    void addWriter(std::shared_ptr<LogWriter>&& writer);
    void flush(const dispatch::group_session& session);
    void close();
    // These wait for the writers queue.
    void flushStartupMessages();
    void debugFlush();
    enum class Report { Simple, Full };
    [[nodiscard]] vox::array describeWriters(Report report);

    // In a signal handler of a dying process: stops the writers queue and writes
    // what it did not get to. Async-signal-safe.
    void drainInCrash() noexcept;

    // Around a fork, on the thread that forks.
    void beforeFork() noexcept;
    void afterForkInParent() noexcept;
    void afterForkInChild();

  private:
    // Runs before the message at `position`.
    struct Operation {
        std::size_t position;
        dispatch::block<void()> run;
    };
    struct Batch {
        std::vector<MessagePtr> messages;
        std::vector<Operation> operations;
        [[nodiscard]] bool empty() const noexcept { return messages.empty() && operations.empty(); }
    };
    enum class State : std::uint8_t { Idle, Scheduled, Lingering };
    struct Writer {
        std::shared_ptr<LogWriter> writer;
        BatchLogWriter* batching;  // the same one, or null
    };

    // From any thread.
    [[nodiscard]] bool makeRoom() PLR_REQUIRES(lock_);
    [[nodiscard]] bool mustSchedule(LogLevel level) PLR_REQUIRES(lock_);
    void schedule();
    void announceRoom() noexcept;
    [[nodiscard]] std::shared_ptr<LogServer> ownerOfServer() const noexcept;
    void queueOperation(dispatch::block<void()>&& operation);
    template <class Work>
    auto syncOnWriters(Work&& work);

    // On the writers queue.
    void deliverScheduled() PLR_ON(writersQueue_);
    void lookAgain() PLR_ON(writersQueue_);
    void linger() PLR_ON(writersQueue_);
    bool deliverPending() PLR_ON(writersQueue_);
    [[nodiscard]] bool takePending() PLR_ON(writersQueue_);
    void writeBatch() PLR_ON(writersQueue_);
    void write(const MessagePtr& message) PLR_ON(writersQueue_);
    void endBatch() PLR_ON(writersQueue_);
    void writeStartupMessages() PLR_ON(writersQueue_);
    [[nodiscard]] MessagePtr note(std::uint64_t count, const char* what) const;

    class AtWork;

    // In a signal handler.
    void stopWriters() noexcept;
    void writeInCrash(const LogMessage& message) noexcept;
    void writeBatchInCrash() noexcept;
    void writePendingInCrash() noexcept;

    // What a crash must know about the writers queue. A cache line of its own: it
    // changes with each message, while others call log().
    struct alignas(64) Progress {
        std::atomic<std::size_t> next{0};   // message of batch_ that is not written
        std::atomic<pthread_t> worker{0};   // the thread that calls writers
        std::atomic<bool> atWork{false};    // a writer is being called
        std::atomic<bool> crashing{false};  // writers are not to be called any more
    };

    Progress progress_;
    detail::BriefMutex writing_;  // held while writers are called; taken before lock_
    bool forksInWriter_ = false;  // the thread that forks holds writing_ already
    LogServer& server_;
    const QueueRole writersQueue_;

    std::unique_ptr<MemoryBufferedLogWriter> startupBuffer_ PLR_CONFINED_TO(writersQueue_);
    std::vector<Writer> writers_ PLR_CONFINED_TO(writersQueue_);
    Batch batch_ PLR_CONFINED_TO(writersQueue_);

    Batch pending_ PLR_GUARDED_BY(lock_);
    std::size_t limit_ PLR_GUARDED_BY(lock_) = 0;      // messages; 0 for none
    std::uint64_t dropped_ PLR_GUARDED_BY(lock_) = 0;  // behind what is in pending_
    detail::BriefMutex lock_;
    std::atomic<std::uint32_t> room_{0};  // counts times that pending_ was taken
    LogServer::WhenFull whenFull_ PLR_GUARDED_BY(lock_) = LogServer::WhenFull::Wait;
    State state_ PLR_GUARDED_BY(lock_) = State::Idle;
    bool timerIsSet_ PLR_CONFINED_TO(writersQueue_)
    = false;
};

}  // namespace plr
