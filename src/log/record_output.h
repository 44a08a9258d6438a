#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string_view>
#include <vector>

#include "dispatch/group.h"
#include "plr/base/thread_annotations.h"
#include "plr/log/log_message.h"
#include "src/base/brief_mutex.h"
#include "src/log/record_buffer.h"
#include "src/log/record_format.h"

namespace plr {

// Where records go in the end: a file, a terminal. Under its RecordOutput's lock.
class RecordDevice {
  public:
    virtual ~RecordDevice() = default;
    // Sends from the front as much as goes, and consumes it. False when something
    // is left; error() says why.
    [[nodiscard]] virtual bool send(RecordBuffer& records) noexcept = 0;
    // Whether there is no use in trying again.
    [[nodiscard]] virtual bool isDead() const noexcept { return false; }
    // The last one (errno.h), 0 when there was none.
    [[nodiscard]] virtual int error() const noexcept = 0;
    virtual void close() noexcept = 0;
    // Async-signal-safe: sends what goes of these bytes, without waiting for long.
    virtual void sendInCrash(std::string_view bytes) noexcept = 0;
};

// What the writers of text share: records that their device does not take now
// are kept up to a limit, tried again with each burst and by a timer, and counted
// where they are dropped; a record at the gap says how many are missing.
//
// Owner:   a writer; timers hold it weakly.
// Threads: any; one lock, which is held while the device sends.
// Order:   records leave in the order in which they were taken.
class RecordOutput : public std::enable_shared_from_this<RecordOutput> {
  public:
    // `limit`: bytes that are kept at most, plus one record. `note`: what the
    // record at a gap says behind the number.
    RecordOutput(std::unique_ptr<RecordDevice> device, std::size_t limit, std::string_view note,
                 RecordFormat format);

    // Sends or keeps what is in `burst`, which is empty afterwards. False when
    // something is kept.
    bool take(RecordBuffer& burst);
    // Holds the session until nothing is kept.
    void whenSent(const dispatch::group_session& session);
    // Drops what cannot be sent now. Returns how many messages are missing at the end
    // without a note.
    std::uint64_t close();

    struct Counts {
        std::uint64_t dropped;  // messages, since creation
        std::size_t kept;       // bytes
        int error;              // the device's last one
    };
    [[nodiscard]] Counts counts();

    // Runs `work(device, kept records)` under the lock.
    template <class Work>
    void withDevice(Work&& work) {
        const detail::BriefLock guard(lock_);
        work(*device_, kept_);
    }

    // Async-signal-safe.
    void flushInCrash(std::string_view burst) noexcept;
    [[nodiscard]] RecordDevice& deviceInCrash() noexcept { return *device_; }

  private:
    using Sessions = std::vector<dispatch::group_session>;

    bool sendKept() PLR_REQUIRES(lock_);
    void keep(RecordBuffer& burst) PLR_REQUIRES(lock_);
    void noteGap() PLR_REQUIRES(lock_);
    void drop(std::size_t messages) PLR_REQUIRES(lock_);
    [[nodiscard]] Sessions settle(bool sent) PLR_REQUIRES(lock_);
    void tryAgainLater() PLR_REQUIRES(lock_);
    void tryAgain();

    const std::unique_ptr<RecordDevice> device_;
    const std::size_t limit_;
    const std::string_view note_;

    detail::BriefMutex lock_;
    RecordBuffer kept_ PLR_GUARDED_BY(lock_);
    bool dropping_ PLR_GUARDED_BY(lock_) = false;
    std::uint64_t missing_ PLR_GUARDED_BY(lock_) = 0;  // dropped, not in a note yet
    std::uint64_t dropped_ PLR_GUARDED_BY(lock_) = 0;
    RecordFormat format_ PLR_GUARDED_BY(lock_);
    Sessions sessions_ PLR_GUARDED_BY(lock_);
    bool timerIsSet_ PLR_GUARDED_BY(lock_) = false;
    std::chrono::milliseconds delay_ PLR_GUARDED_BY(lock_);
};

}  // namespace plr
