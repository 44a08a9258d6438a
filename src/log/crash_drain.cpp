#include "plr/log/crash_drain.h"

#include <pthread.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <ctime>
#include <iterator>
#include <mutex>
#include <vector>

#include "plr/log/log_message.h"
#include "plr/log/log_writer.h"
#include "plr/log/memory_buffered_log_writer.h"
#include "src/log/crash_drain.h"
#include "src/log/log_delivery.h"

namespace plr {
namespace {

constexpr long kPatience = 200;  // milliseconds, for whatever is under way elsewhere

void restOneMillisecond() noexcept {
    timespec left{0, 1'000'000};
    while (::nanosleep(&left, &left) != 0 && errno == EINTR) {
    }
}

template <class Condition>
bool waitUntil(Condition&& condition) noexcept {
    for (long waited = 0; waited < kPatience; ++waited) {
        if (condition())
            return true;
        restOneMillisecond();
    }
    return condition();
}

}  // namespace

// ---- What a delivery does in a crash ----

// The lock is taken first and for good: the worker then takes no more messages,
// so that each is either in its batch or still pending.
void LogDelivery::drainInCrash() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    progress_.crashing.store(true);
    const bool locked = waitUntil([this]() noexcept { return lock_.tryLock(); });
    stopWriters();
    writeBatchInCrash();
    if (locked)
        writePendingInCrash();
}

// The worker sees the flag before it calls a writer again. It does not fence the
// two for every message: a millisecond is ages for what it has stored.
void LogDelivery::stopWriters() noexcept {
    if (::pthread_equal(progress_.worker.load(), ::pthread_self()) != 0)
        return;
    restOneMillisecond();
    static_cast<void>(waitUntil([this]() noexcept { return !progress_.atWork.load(); }));
}

void LogDelivery::writeBatchInCrash() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    for (const Writer& to : writers_)
        if (to.batching)
            to.batching->flushInCrash();
    if (startupBuffer_)
        for (const MessagePtr& message : startupBuffer_->messages_)
            writeInCrash(*message);
    for (std::size_t i = progress_.next.load(); i < batch_.messages.size(); ++i)
        if (const MessagePtr& message = batch_.messages[i])
            writeInCrash(*message);
}

void LogDelivery::writePendingInCrash() noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    for (const MessagePtr& message : pending_.messages)
        writeInCrash(*message);
}

void LogDelivery::writeInCrash(const LogMessage& message) noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    for (const Writer& to : writers_)
        if (to.batching)
            to.batching->writeInCrash(message);
}

// ---- Signals ----

namespace {

constexpr std::array kSignals{SIGABRT, SIGBUS, SIGFPE, SIGILL, SIGSEGV, SIGSYS, SIGTRAP};
constexpr std::size_t kMaximumServers = 8;

std::array<struct sigaction, kSignals.size()> before;  // set before the handlers are
std::array<std::atomic<LogDelivery*>, kMaximumServers> deliveries;
std::atomic<pthread_t> crashed{0};
std::atomic<bool> drained{false};

void drainOnce() noexcept {
    pthread_t nobody = 0;
    if (crashed.compare_exchange_strong(nobody, ::pthread_self())) {
        for (const auto& delivery : deliveries)
            if (LogDelivery* found = delivery.load())
                found->drainInCrash();
        drained.store(true);
    } else if (::pthread_equal(nobody, ::pthread_self()) == 0) {
        // Another thread crashed first, and ends the process when it is done.
        static_cast<void>(waitUntil([]() noexcept { return drained.load(); }));
    }
    // The same thread again: the drain itself crashed; nothing is left to try.
}

// Faults that the instruction causes happen again when the handler returns.
bool happensAgain(int signal, const siginfo_t& info) noexcept {
    return info.si_code > 0 && signal != SIGABRT && signal != SIGSYS && signal != SIGTRAP;
}

void onCrash(int signal, siginfo_t* info, void* /*context*/) noexcept {
    drainOnce();
    for (std::size_t i = 0; i < kSignals.size(); ++i)
        if (kSignals[i] == signal)
            ::sigaction(signal, &before[i], nullptr);
    if (!happensAgain(signal, *info))
        ::raise(signal);  // delivered when this handler has returned
}

void installHandlers() noexcept {
    alignas(16) static std::array<std::byte, 65536> stack;
    const stack_t alternate{stack.data(), 0, stack.size()};
    ::sigaltstack(&alternate, nullptr);
    struct sigaction action {};
    action.sa_sigaction = onCrash;
    action.sa_flags = SA_SIGINFO | SA_ONSTACK;
    ::sigemptyset(&action.sa_mask);
    for (std::size_t i = 0; i < kSignals.size(); ++i)
        ::sigaction(kSignals[i], nullptr, &before[i]);
    for (const int signal : kSignals)
        ::sigaction(signal, &action, nullptr);
}

}  // namespace

void CrashDrain::add(const std::shared_ptr<LogServer>& server) {
    static std::mutex mutex;
    static auto& kept = *new std::vector<std::shared_ptr<LogServer>>;
    const std::lock_guard guard(mutex);
    for (auto& place : deliveries) {
        if (place.load() == server->delivery_.get())
            return;
        if (place.load() != nullptr)
            continue;
        if (&place == deliveries.data())
            installHandlers();
        kept.push_back(server);
        place.store(server->delivery_.get());
        return;
    }
}

void drainLogsOnCrash(const std::shared_ptr<LogServer>& server) {
    if (server)
        CrashDrain::add(server);
}

}  // namespace plr
