#include <pthread.h>
#include <signal.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstring>
#include <initializer_list>
#include <new>
#include <utility>

#include "serial/serial.h"
#include "src/io/timed_uart.h"
#include "src/io/uart_settings.h"

namespace plr::io {
namespace {

constexpr const char* kCreate = "PelorinTransportCreateWithUARTTimeout";
constexpr const char* kFree = "PelorinTransportFreeUARTTimeout";
constexpr std::uint32_t kMostLocalQueue = 0x20000;

}  // namespace

// A failed opening leaves what it made to tearDown().
bool TimedUart::open() {
    stopping_ = false;
    if (waitingReaders_ == 0)
        readsUnblocked_ = false;
    if (makeQueue() && openPort() && configurePort() && startWorkers()) {
        lost_ = false;
        return true;
    }
    tearDown();
    return false;
}

bool TimedUart::makeQueue() {
    if (config_.localQueueSize > kMostLocalQueue) {
        PelorinDebugPrint(kCreate, "Receive queue size %u exceeds max %u\n", config_.localQueueSize,
                          kMostLocalQueue);
        return false;
    }
    storage_.reset(new (std::nothrow) std::uint8_t[config_.localQueueSize]);
    if (!storage_) {
        PelorinDebugPrint(kCreate, "Out of memory!\n");
        return false;
    }
    return PelorinRingBufferInitialize(&queue_, storage_.get(), config_.localQueueSize);
}

bool TimedUart::openPort() {
    const bool isDebug = config_.node[0] == '\0' || std::strcmp(config_.node, "debug") == 0;
    const char* const path = isDebug ? "/dev/uart.debug" : config_.node;
    port_ = serial_open(path);
    if (port_ < 1) {
        PelorinDebugPrint(kCreate, "failed to open node (%s), ret = %s(%u)\n", path,
                          errorText(errno), static_cast<unsigned>(errno));
        return false;
    }
    readWake_ = serial_wake_open();
    writeWake_ = serial_wake_open();
    if (readWake_ >= 0 && writeWake_ >= 0)
        return true;
    PelorinDebugPrint(kCreate, "Failed to create wake FD's, err = %s (%u)\n", errorText(errno),
                      static_cast<unsigned>(errno));
    return false;
}

bool TimedUart::configurePort() {
    return setFlowControl(kCreate, port_, config_.disableFlowControl == 0) &&
           setReadMinimum(kCreate, port_, 1) && setBaud(kCreate, port_, config_.baud) &&
           setReceiveQueue(kCreate, port_, config_.rxQueueSize);
}

// Wakes the workers wherever they wait, and lets them go.
void TimedUart::tearDown() {
    stopping_ = true;
    for (const int wake : {readWake_, writeWake_})
        if (wake >= 0)
            serial_wake_post(wake);
    writeRequested_.notify_one();
    for (Worker* const worker : {&writeWorker_, &readWorker_}) {
        if (!worker->exists)
            continue;
        const WaitUnlock unlocked(mutex_);
        ::pthread_join(worker->thread, nullptr);
    }
    writeWorker_ = readWorker_ = {};
    storage_.reset();
    queue_ = {};
    roomAwaited_ = false;
    while (firstRequest_)
        complete(takeFirst(), false);
    closePort();
}

void TimedUart::closePort() {
    const int port = std::exchange(port_, -1);
    const std::array<int, 2> wakes{std::exchange(readWake_, -1), std::exchange(writeWake_, -1)};
    // A line that is slow to take its last bytes delays no caller.
    const WaitUnlock unlocked(mutex_);
    for (const int wake : wakes)
        if (wake >= 0)
            serial_wake_close(wake);
    // Deliberate: descriptor 0 is no port of ours.
    if (port >= 1 && serial_close(port) != 0)
        PelorinDebugPrint(kFree, "Failed to close, err = %s(%u)\n", errorText(errno),
                          static_cast<unsigned>(errno));
}

}  // namespace plr::io
