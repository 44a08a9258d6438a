#include "src/io/timed_uart.h"

#include <algorithm>
#include <cerrno>
#include <chrono>

#include "serial/serial.h"
#include "src/io/descriptor_transport.h"

namespace plr::io {
namespace {

PelorinUARTTimeoutConfig terminated(PelorinUARTTimeoutConfig config) {
    config.node[sizeof config.node - 1] = '\0';
    return config;
}

}  // namespace

class PLR_SCOPED_CAPABILITY TimedUart::Visit {
  public:
    explicit Visit(TimedUart& uart) PLR_ACQUIRE(uart.mutex_) : uart_(uart) {
        uart_.mutex_.lock();
        ++uart_.visitors_;
    }
    ~Visit() PLR_RELEASE() {
        if (--uart_.visitors_ == 0 && uart_.ending_)
            uart_.quieter_.notify_all();
        uart_.mutex_.unlock();
    }
    Visit(const Visit&) = delete;
    Visit& operator=(const Visit&) = delete;

  private:
    TimedUart& uart_;
};

TimedUart::TimedUart(const PelorinUARTTimeoutConfig& config) : config_(terminated(config)) {}

bool TimedUart::write(const void* source, std::uint32_t length, std::uint32_t* count) {
    *count = 0;
    const Visit visit(*this);
    if (!mayWrite())
        return failed("PelorinTransportWriteUARTTimeout", "write to completion returned", EIO);
    WriteRequest request{source, length, count};
    append(request);
    writeRequested_.notify_one();
    while (!request.done)
        mutex_.wait(request.completed);
    return request.result;
}

void TimedUart::append(WriteRequest& request) {
    (firstRequest_ ? lastRequest_->next : firstRequest_) = &request;
    lastRequest_ = &request;
}

TimedUart::WriteRequest& TimedUart::takeFirst() {
    WriteRequest& request = *firstRequest_;
    firstRequest_ = request.next;
    return request;
}

// The request may be gone when the mutex is released.
void TimedUart::complete(WriteRequest& request, bool result) {
    request.result = result;
    request.done = true;
    request.completed.notify_one();
}

bool TimedUart::read(void* buffer, std::uint32_t length, std::uint32_t* count, bool toCompletion,
                     std::uint32_t timeoutMs) {
    const std::uint32_t target = toCompletion ? length : std::min(length, 1u);
    *count = 0;
    const Visit visit(*this);
    for (bool over = false; *count < target && !over;) {
        ++waitingReaders_;
        over = !awaitData(timeoutMs) || readsUnblocked_;
        if (--waitingReaders_ == 0)
            readsUnblocked_ = false;
        *count += take(static_cast<std::uint8_t*>(buffer) + *count, length - *count);
    }
    return *count >= target;
}

// False after `timeoutMs` and where nothing will come any more.
bool TimedUart::awaitData(std::uint32_t timeoutMs) {
    WaitMutex::Clock::time_point end{};
    while (PelorinRingBufferGetSize(&queue_) == 0 && !readsUnblocked_) {
        if (lost_ || timeoutMs == 0)
            return false;
        if (timeoutMs == PELORIN_FOREVER) {
            mutex_.wait(dataAvailable_);
            continue;
        }
        if (end == WaitMutex::Clock::time_point{})
            end = WaitMutex::Clock::now() + std::chrono::milliseconds(timeoutMs);
        if (!mutex_.waitUntil(dataAvailable_, end))
            return false;
    }
    return true;
}

std::uint32_t TimedUart::take(void* buffer, std::uint32_t most) {
    const std::uint32_t taken = PelorinRingBufferExtractRaw(&queue_, buffer, most);
    if (roomAwaited_ && taken > 0) {
        roomAwaited_ = false;
        serial_wake_post(readWake_);
    }
    return taken;
}

void TimedUart::unblockRead() {
    const Visit visit(*this);
    readsUnblocked_ = true;
    dataAvailable_.notify_all();
}

bool TimedUart::isValid() {
    const Visit visit(*this);
    return readWorker_.exists && writeWorker_.exists && !lost_;
}

// Nothing comes or goes any more.
void TimedUart::lose() {
    lost_ = true;
    dataAvailable_.notify_all();
    if (writeWake_ >= 0)
        serial_wake_post(writeWake_);
}

bool TimedUart::connect() {
    const WaitLock lock(mutex_);
    return open();
}

bool TimedUart::reconnect() {
    const Visit visit(*this);
    while (reconnecting_)
        mutex_.wait(quieter_);
    if (ending_)
        return false;
    reconnecting_ = true;
    tearDown();
    const bool connected = open();
    if (!connected || ending_)
        lose();
    reconnecting_ = false;
    quieter_.notify_all();
    return connected;
}

void TimedUart::end() {
    const WaitLock lock(mutex_);
    ending_ = true;
    lose();
    while (reconnecting_)
        mutex_.wait(quieter_);
    tearDown();
    while (visitors_ > 0)
        mutex_.wait(quieter_);
}

}  // namespace plr::io
