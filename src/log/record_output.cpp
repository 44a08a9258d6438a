#include "src/log/record_output.h"

#include <algorithm>
#include <ctime>
#include <utility>

#include "dispatch/dispatch.h"
#include "plr/concurrency/clock.h"
#include "plr/concurrency/while_alive.h"
#include "src/log/crash_sink.h"

namespace plr {
namespace {

constexpr std::chrono::milliseconds kFirstDelay{100};
constexpr std::chrono::milliseconds kLongestDelay{5000};
constexpr std::size_t kRoomToKeep = 65536;  // bytes, when nothing is kept
constexpr int kPatienceInCrash = 200;       // milliseconds

}  // namespace

RecordOutput::RecordOutput(std::unique_ptr<RecordDevice> device, std::size_t limit,
                           std::string_view note, RecordFormat format)
    : device_(std::move(device)),
      limit_(std::max<std::size_t>(limit, 1)),
      note_(note),
      format_(format),
      delay_(kFirstDelay) {}

bool RecordOutput::take(RecordBuffer& burst) {
    Sessions done;  // leave their groups behind the lock
    const detail::BriefLock guard(lock_);
    const bool sent = sendKept() && device_->send(burst);
    if (!sent)
        keep(burst);
    done = settle(sent);
    return sent;
}

bool RecordOutput::sendKept() {
    if (kept_.empty() && missing_ == 0) [[likely]]
        return true;
    if (!device_->send(kept_))
        return false;
    dropping_ = false;
    if (missing_ == 0)
        return true;
    noteGap();
    return device_->send(kept_);
}

// Once records are dropped, this goes on until half of the room is free: one long
// gap is better than many short ones.
void RecordOutput::keep(RecordBuffer& burst) {
    if (device_->isDead() || (dropping_ && kept_.waiting().size() > limit_ / 2)) {
        drop(burst.messages());
        return burst.clear();
    }
    if (missing_ != 0)
        noteGap();
    const std::size_t dropped = burst.moveTo(kept_, limit_);
    dropping_ = dropped != 0;
    drop(dropped);
}

void RecordOutput::drop(std::size_t messages) {
    missing_ += messages;
    dropped_ += messages;
}

void RecordOutput::noteGap() {
    format_.putNote(kept_, static_cast<TimeStamp>(Clock::now_in_nanoseconds()),
                    std::exchange(missing_, 0), note_);
    kept_.endRecord(true);
}

// What follows an attempt to send. Returns the sessions that waited for it.
RecordOutput::Sessions RecordOutput::settle(bool sent) {
    if (sent) [[likely]] {
        delay_ = kFirstDelay;
        kept_.trim(kRoomToKeep);
        return std::exchange(sessions_, {});
    }
    if (!device_->isDead()) {
        tryAgainLater();
        return {};
    }
    drop(kept_.messages());
    kept_.clear();
    return std::exchange(sessions_, {});
}

void RecordOutput::tryAgainLater() {
    if (std::exchange(timerIsSet_, true))
        return;
    dispatch::queue::global(dispatch::priority::low)
        .after(dispatch::time::after(delay_),
               dispatch::block<void()>(
                   whileAlive(weak_from_this(), [](RecordOutput& self) { self.tryAgain(); })));
    delay_ = std::min(2 * delay_, kLongestDelay);
}

void RecordOutput::tryAgain() {
    Sessions done;
    const detail::BriefLock guard(lock_);
    timerIsSet_ = false;
    if (kept_.empty())
        return;
    const std::size_t before = kept_.waiting().size();
    const bool sent = sendKept();
    if (kept_.waiting().size() < before)
        delay_ = kFirstDelay;
    done = settle(sent);
}

void RecordOutput::whenSent(const dispatch::group_session& session) {
    const detail::BriefLock guard(lock_);
    if (!kept_.empty())
        sessions_.push_back(session);
}

std::uint64_t RecordOutput::close() {
    Sessions done;
    const detail::BriefLock guard(lock_);
    if (!sendKept())
        drop(kept_.messages());
    kept_.clear();
    device_->close();
    done.swap(sessions_);
    return missing_;
}

RecordOutput::Counts RecordOutput::counts() {
    const detail::BriefLock guard(lock_);
    return {dropped_, kept_.waiting().size(), device_->error()};
}

// The lock is kept for good, if it can be had: nobody else is to send any more.
void RecordOutput::flushInCrash(std::string_view burst) noexcept PLR_NO_THREAD_SAFETY_ANALYSIS {
    for (int waited = 0; !lock_.tryLock() && waited < kPatienceInCrash; ++waited) {
        const timespec millisecond{0, 1'000'000};
        ::nanosleep(&millisecond, nullptr);
    }
    device_->sendInCrash(kept_.waiting());
    if (missing_ != 0) {
        timespec now{};
        ::clock_gettime(CLOCK_REALTIME, &now);
        CrashSink sink(*device_);
        format_.putNote(sink, now.tv_sec * TimeStamp{1'000'000'000} + now.tv_nsec, missing_, note_,
                        RecordFormat::Offset::Keep);
    }
    device_->sendInCrash(burst);
}

}  // namespace plr
