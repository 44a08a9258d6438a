#include "src/log/log_delivery.h"

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <utility>

#include "plr/log/log_message.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/log_writer.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "plr/log/static_logger.h"
#include "src/log/log_forks.h"

namespace plr {
namespace {

// How long messages may wait while others keep coming; bench/log_cases.h.
constexpr std::chrono::microseconds kLinger{100};
// So many that wait are delivered at once.
constexpr std::size_t kPromptMessages = 256;
// Room that is kept for the next burst, in messages: 1 MiB of pointers.
constexpr std::size_t kKeptCapacity = 65536;

// For a thread that came too late: the process is about to end.
[[noreturn]] void restForEver() noexcept {
    for (;;)
        ::pause();
}

bool isUrgent(LogLevel level) noexcept {
    return level == LogLevel::Error || level == LogLevel::Fatal;
}

}  // namespace

// While one exists, writers may be in any state: a crash waits until it is gone,
// or, on the same thread, carries on behind it.
class LogDelivery::AtWork {
  public:
    explicit AtWork(LogDelivery& owner) noexcept : owner_(owner) {
        owner_.progress_.worker.store(::pthread_self(), std::memory_order_relaxed);
        owner_.progress_.atWork.store(true, std::memory_order_release);
        if (owner_.progress_.crashing.load(std::memory_order_acquire)) [[unlikely]] {
            owner_.progress_.atWork.store(false, std::memory_order_release);
            restForEver();
        }
    }
    ~AtWork() { owner_.progress_.atWork.store(false, std::memory_order_release); }
    AtWork(const AtWork&) = delete;
    AtWork& operator=(const AtWork&) = delete;

  private:
    LogDelivery& owner_;
};

LogDelivery::LogDelivery(LogServer& server, const std::string& name,
                         std::unique_ptr<MemoryBufferedLogWriter> startupBuffer)
    : server_(server),
      writersQueue_(dispatch::queue::create("logmaster::" + name + "::writers")),
      startupBuffer_(std::move(startupBuffer)) {
    log_forks::add(*this);
}

LogDelivery::~LogDelivery() {
    log_forks::remove(*this);
}

template <class Work>
auto LogDelivery::syncOnWriters(Work&& work) {
    return writersQueue_.queue().sync([&] {
        writersQueue_.assertCurrent();
        const detail::BriefLock writing(writing_);
        deliverPending();
        return work();
    });
}

// ---- From any thread ----

// Hot path: bench/log_cases.h.
void LogDelivery::log(MessagePtr&& message) {
    const LogLevel level = message->getLevel();
    bool wake = false;
    {
        const detail::BriefLock guard(lock_);
        if (limit_ != 0 && pending_.messages.size() >= limit_ && !makeRoom()) [[unlikely]]
            return;
        pending_.messages.push_back(std::move(message));
        wake = mustSchedule(level);
    }
    if (wake)
        schedule();
}

// Returns with the lock held, as it came, and whether there is room now.
bool LogDelivery::makeRoom() {
    while (limit_ != 0 && pending_.messages.size() >= limit_) {
        if (whenFull_ == LogServer::WhenFull::Drop) {
            ++dropped_;
            return false;
        }
        if (writersQueue_.queue().is_current())
            return true;
        const std::uint32_t seen = room_.load();
        const bool wake = std::exchange(state_, State::Scheduled) != State::Scheduled;
        lock_.unlock();
        if (wake)
            schedule();
        room_.wait(seen);
        lock_.lock();
    }
    return true;
}

bool LogDelivery::mustSchedule(LogLevel level) {
    const bool wake =
        state_ == State::Idle || (state_ == State::Lingering &&
                                  (pending_.messages.size() >= kPromptMessages || isUrgent(level)));
    if (wake)
        state_ = State::Scheduled;
    return wake;
}

void LogDelivery::schedule() {
    // Without an owner the server is on its way out: nobody is left to write for.
    if (auto server = ownerOfServer())
        writersQueue_.queue().async([server = std::move(server), this] {
            writersQueue_.assertCurrent();
            deliverScheduled();
        });
}

std::shared_ptr<LogServer> LogDelivery::ownerOfServer() const noexcept {
    return server_.std::enable_shared_from_this<LogServer>::weak_from_this().lock();
}

void LogDelivery::limitPending(std::size_t messages, LogServer::WhenFull policy) {
    {
        const detail::BriefLock guard(lock_);
        limit_ = messages;
        whenFull_ = policy;
    }
    announceRoom();
}

void LogDelivery::announceRoom() noexcept {
    room_.fetch_add(1);
    room_.notify_all();
}

void LogDelivery::queueOperation(dispatch::block<void()>&& operation) {
    bool wake = false;
    {
        const detail::BriefLock guard(lock_);
        pending_.operations.push_back({pending_.messages.size(), std::move(operation)});
        wake = std::exchange(state_, State::Scheduled) != State::Scheduled;
    }
    if (wake)
        schedule();
}

void LogDelivery::addWriter(std::shared_ptr<LogWriter>&& writer) {
    queueOperation(dispatch::block<void()>([this, writer = std::move(writer)] {
        writersQueue_.assertCurrent();
        writers_.push_back({writer, dynamic_cast<BatchLogWriter*>(writer.get())});
    }));
}

void LogDelivery::flush(const dispatch::group_session& session) {
    queueOperation(dispatch::block<void()>([this, session] {
        writersQueue_.assertCurrent();
        for (const Writer& to : writers_)
            to.writer->flush(session);
    }));
}

void LogDelivery::close() {
    queueOperation(dispatch::block<void()>([this] {
        writersQueue_.assertCurrent();
        for (const Writer& to : writers_)
            to.writer->close();
    }));
}

void LogDelivery::flushStartupMessages() {
    syncOnWriters([this] {
        writersQueue_.assertCurrent();
        writeStartupMessages();
    });
}

void LogDelivery::debugFlush() {
    syncOnWriters([] {});
}

vox::array LogDelivery::describeWriters(Report report) {
    return syncOnWriters([this, report] {
        writersQueue_.assertCurrent();
        const AtWork guard(*this);
        const vox::array descriptions = vox::array::create();
        for (const Writer& asked : writers_) {
            const vox::dict description(report == Report::Full ? asked.writer->getFullConfig()
                                                               : asked.writer->getSimpleConfig());
            if (description)
                descriptions.append(description);
        }
        return descriptions;
    });
}

// ---- Around a fork ----

void LogDelivery::beforeFork() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    forksInWriter_ = writersQueue_.queue().is_current();
    if (!forksInWriter_)
        writing_.lock();
    lock_.lock();
}

void LogDelivery::afterForkInParent() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    lock_.unlock();
    if (!forksInWriter_)
        writing_.unlock();
}

// The queue is idle here, whatever it was at in the parent, and the timer is gone.
void LogDelivery::afterForkInChild() PLR_NO_THREAD_SAFETY_ANALYSIS {
    pending_.messages.clear();
    for (Operation& operation : pending_.operations)
        operation.position = 0;
    dropped_ = 0;
    timerIsSet_ = false;
    state_ = pending_.empty() ? State::Idle : State::Scheduled;
    const bool wake = state_ == State::Scheduled;
    afterForkInParent();
    if (wake)
        schedule();
}

// ---- On the writers queue ----

void LogDelivery::deliverScheduled() {
    bool delivered = false;
    {
        const detail::BriefLock writing(writing_);
        delivered = deliverPending();
    }
    State next{};
    {
        const detail::BriefLock guard(lock_);
        next = !pending_.empty() ? State::Scheduled : delivered ? State::Lingering : State::Idle;
        state_ = next;
    }
    // More goes behind what others have queued here meanwhile.
    if (next == State::Scheduled)
        schedule();
    else if (next == State::Lingering)
        linger();
}

void LogDelivery::linger() {
    if (std::exchange(timerIsSet_, true))
        return;
    writersQueue_.queue().after(dispatch::time::after(kLinger),
                                dispatch::block<void()>([server = ownerOfServer(), this] {
                                    writersQueue_.assertCurrent();
                                    lookAgain();
                                }));
}

void LogDelivery::lookAgain() {
    timerIsSet_ = false;
    {
        const detail::BriefLock guard(lock_);
        if (state_ != State::Lingering)
            return;
        state_ = State::Scheduled;
    }
    deliverScheduled();
}

// Returns whether there was anything.
bool LogDelivery::deliverPending() {
    if (!takePending())
        return false;
    writeBatch();
    return true;
}

bool LogDelivery::takePending() {
    std::uint64_t dropped = 0;
    bool limited = false;
    {
        const detail::BriefLock guard(lock_);
        if (pending_.empty())
            return false;
        std::swap(batch_, pending_);
        dropped = std::exchange(dropped_, 0);
        limited = limit_ != 0;
    }
    if (limited)
        announceRoom();
    if (dropped != 0)
        batch_.messages.push_back(note(dropped, " log messages dropped, too many were waiting"));
    return true;
}

// Hot path: bench/log_cases.h.
void LogDelivery::writeBatch() {
    auto operation = batch_.operations.begin();
    const auto lastOperation = batch_.operations.end();
    for (std::size_t i = 0; i <= batch_.messages.size(); ++i) {
        const AtWork guard(*this);
        for (; operation != lastOperation && operation->position == i; ++operation)
            std::exchange(operation->run, nullptr)();
        if (i == batch_.messages.size())
            break;
        write(batch_.messages[i]);
        progress_.next.store(i + 1, std::memory_order_release);
        batch_.messages[i].reset();
    }
    endBatch();
}

void LogDelivery::write(const MessagePtr& message) {
    if (startupBuffer_)
        return startupBuffer_->write(message);
    for (const Writer& to : writers_)
        to.writer->write(message);
}

void LogDelivery::endBatch() {
    const AtWork guard(*this);
    for (const Writer& to : writers_)
        if (to.batching)
            to.batching->endBatch();
    batch_.operations.clear();
    batch_.messages.clear();
    progress_.next.store(0, std::memory_order_release);
    if (batch_.messages.capacity() > kKeptCapacity)
        batch_ = Batch();
}

void LogDelivery::writeStartupMessages() {
    if (!startupBuffer_)
        return;
    {
        const AtWork guard(*this);  // a crash finds them in the one place or in the other
        std::deque<MessagePtr> held = startupBuffer_->drain();
        const std::int64_t dropped = startupBuffer_->getDroppedMessageCount();
        if (dropped >= 1)
            held.push_front(note(static_cast<std::uint64_t>(dropped),
                                 " log messages dropped prior to log start"));
        batch_.messages.assign(std::make_move_iterator(held.begin()),
                               std::make_move_iterator(held.end()));
        startupBuffer_ = nullptr;
    }
    writeBatch();
}

LogDelivery::MessagePtr LogDelivery::note(std::uint64_t count, const char* what) const {
    const StaticLogger logger(server_.getName(), ownerOfServer());
    LogMessageBuffer text;
    text << "Note: " << count << what;
    return logger.buildMessage(LogLevel::Info, std::move(text));
}

}  // namespace plr
