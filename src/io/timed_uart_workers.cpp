#include <limits.h>
#include <pthread.h>
#include <signal.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <initializer_list>

#include "serial/serial.h"
#include "src/io/descriptor_transport.h"
#include "src/io/timed_uart.h"
#include "src/io/uart_settings.h"

namespace plr::io {
namespace {

constexpr std::uint32_t kChunk = 4096;
constexpr std::uint32_t kStreamed = 4 * kChunk;
// For our own frames, and a debug delegate that runs on them.
constexpr std::size_t kStackBytes = std::size_t{256} * 1024;

// With signals blocked: they are for the program's own threads. What a thread
// brings on itself by a fault stays open. Returns 0 or an error number.
int start(pthread_t& thread, void* (*function)(void*), void* context) {
    sigset_t all;
    sigset_t before;
    sigfillset(&all);
    for (const int fault : {SIGABRT, SIGBUS, SIGFPE, SIGILL, SIGSEGV, SIGSYS, SIGTRAP})
        sigdelset(&all, fault);
    pthread_attr_t attributes;
    ::pthread_attr_init(&attributes);
    ::pthread_attr_setstacksize(&attributes, kStackBytes);
    ::pthread_sigmask(SIG_SETMASK, &all, &before);
    const int error = ::pthread_create(&thread, &attributes, function, context);
    ::pthread_sigmask(SIG_SETMASK, &before, nullptr);
    ::pthread_attr_destroy(&attributes);
    return error;
}

}  // namespace

bool TimedUart::startWorkers() {
    struct Start {
        Worker& worker;
        void* (*main)(void*);
        const char* name;
    };
    const Start starts[] = {{readWorker_, &workerMain<&TimedUart::runReadWorker>, "read"},
                            {writeWorker_, &workerMain<&TimedUart::runWriteWorker>, "write"}};
    for (const Start& next : starts) {
        const int error = start(next.worker.thread, next.main, this);
        next.worker.exists = error == 0;
        if (error != 0) {
            PelorinDebugPrint("PelorinTransportCreateWithUARTTimeout",
                              "Failed to launch %s worker, ret = %s(%u)\n", next.name,
                              errorText(error), static_cast<unsigned>(error));
            return false;
        }
    }
    return true;
}

template <void (TimedUart::*Run)()>
void* TimedUart::workerMain(void* self) noexcept {
    (static_cast<TimedUart*>(self)->*Run)();
    return nullptr;
}

// Hot path: bench/bytes_pelorin.cpp. While bytes come in a stream, readers are told
// after several chunks: waking one costs more than reading a chunk.
void TimedUart::runReadWorker() {
    ::pthread_setname_np(::pthread_self(), "plr-uart-read");
    std::array<std::uint8_t, kChunk> chunk;
    const WaitLock lock(mutex_);
    const int port = port_;
    const int wake = readWake_;
    const std::uint32_t enough = std::min(queue_.capacity / 2, kStreamed);
    int error = 0;
    while (!stopping_ && error == 0) {
        const std::uint32_t room =
            std::min(queue_.capacity - PelorinRingBufferGetSize(&queue_), kChunk);
        roomAwaited_ = room == 0;
        ssize_t got = 0;
        {
            const WaitUnlock unlocked(mutex_);
            got = serial_read_now(port, chunk.data(), room);
            error = got < 0 ? errno : 0;
        }
        // Deliberate: what does not fit in front of the end of the storage is dropped.
        if (got > 0)
            PelorinRingBufferInsertRaw(&queue_, chunk.data(), static_cast<std::uint32_t>(got));
        if (got <= 0 || PelorinRingBufferGetSize(&queue_) >= enough)
            announce();
        if (got == 0) {
            const WaitUnlock unlocked(mutex_);
            if (serial_wait(port, wake, room == 0 ? SERIAL_HUNG_UP : SERIAL_READABLE) < 0)
                error = errno;
        }
    }
    if (!stopping_) {
        lose();
        const WaitUnlock unlocked(mutex_);
        failed("PelorinTransportReadUARTTimeout", "read returned", error);
    }
}

void TimedUart::announce() {
    if (waitingReaders_ > 0 && PelorinRingBufferGetSize(&queue_) > 0)
        dataAvailable_.notify_all();
}

void TimedUart::runWriteWorker() {
    ::pthread_setname_np(::pthread_self(), "plr-uart-write");
    const WaitLock lock(mutex_);
    while (!stopping_) {
        if (!firstRequest_) {
            mutex_.wait(writeRequested_);
            continue;
        }
        WriteRequest& request = takeFirst();
        complete(request, send(request));
    }
}

// All of it; fails when the line is lost and when the workers shall end.
bool TimedUart::send(const WriteRequest& request) {
    const auto* const source = static_cast<const std::uint8_t*>(request.source);
    while (*request.count < request.length && !stopping_) {
        const std::uint32_t rest = request.length - *request.count;
        const ssize_t written =
            lost_ ? -1 : serial_write_now(port_, source + *request.count, std::min(rest, kChunk));
        if (written > 0)
            *request.count += static_cast<std::uint32_t>(written);
        else if (written < 0 || !awaitRoomOnLine()) {
            const int error = lost_ ? EIO : errno;
            const WaitUnlock unlocked(mutex_);
            return failed("PelorinTransportWriteUARTTimeout", "write to completion returned",
                          error);
        }
    }
    return *request.count == request.length;
}

bool TimedUart::awaitRoomOnLine() {
    const int port = port_;
    const int wake = writeWake_;
    const WaitUnlock unlocked(mutex_);
    return serial_wait(port, wake, SERIAL_WRITABLE) >= 0;
}

}  // namespace plr::io
