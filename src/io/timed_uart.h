#pragma once

#include <pthread.h>
#include <sys/types.h>

#include <condition_variable>
#include <cstdint>
#include <memory>

#include "Pelorin"
#include "plr/base/thread_annotations.h"
#include "src/io/wait_mutex.h"

namespace plr::io {

// A serial port with a thread that moves what it receives into a local queue, and
// one that writes what callers request: the state of the timed serial transport.
//
// Owner:   the transport.
// Threads: every member on any thread, except end(), once, as the last one. It waits
//          until the calls that it met are over.
// Locking: one mutex holds everything. The device is written under it, and
//          waited for and read without it, so that a line that takes or sends
//          nothing delays nobody. Debug prints of the workers are made without it.
// States:  connected; lost (the line failed or was never there: what the queue
//          holds can be read, everything else fails) until reconnect() succeeds.
//
// timed_uart.cpp has what callers do, timed_uart_connection.cpp how the port
// comes and goes, timed_uart_workers.cpp the two threads.
class TimedUart {
  public:
    explicit TimedUart(const PelorinUARTTimeoutConfig& config);
    TimedUart(const TimedUart&) = delete;
    TimedUart& operator=(const TimedUart&) = delete;
    ~TimedUart() = default;

    // Opens the port and starts the workers. False after a debug print; end() is due
    // in any case.
    bool connect();
    // Closes the port and opens it anew; what was received is gone, requests that wait
    // have failed.
    bool reconnect();
    // Requests fail, reads return false, the workers are gone.
    void end();

    bool write(const void* source, std::uint32_t length, std::uint32_t* count);
    bool read(void* buffer, std::uint32_t length, std::uint32_t* count, bool toCompletion,
              std::uint32_t timeoutMs);
    void unblockRead();
    bool isValid();

  private:
    // On the stack of the caller, who waits until it is done.
    struct WriteRequest {
        const void* source;
        std::uint32_t length;
        std::uint32_t* count;
        std::condition_variable completed{};
        bool done = false;
        bool result = false;
        WriteRequest* next = nullptr;
    };
    struct Worker {
        pthread_t thread{};
        bool exists = false;
    };
    class Visit;  // of a caller: locks, and is counted

    bool mayWrite() const PLR_REQUIRES(mutex_) {
        return writeWorker_.exists && !stopping_ && !lost_;
    }
    void append(WriteRequest& request) PLR_REQUIRES(mutex_);
    WriteRequest& takeFirst() PLR_REQUIRES(mutex_);
    static void complete(WriteRequest& request, bool result);
    bool awaitData(std::uint32_t timeoutMs) PLR_REQUIRES(mutex_);
    std::uint32_t take(void* buffer, std::uint32_t most) PLR_REQUIRES(mutex_);
    void lose() PLR_REQUIRES(mutex_);

    bool open() PLR_REQUIRES(mutex_);
    bool makeQueue() PLR_REQUIRES(mutex_);
    bool openPort() PLR_REQUIRES(mutex_);
    bool configurePort() PLR_REQUIRES(mutex_);
    bool startWorkers() PLR_REQUIRES(mutex_);
    void tearDown() PLR_REQUIRES(mutex_);
    void closePort() PLR_REQUIRES(mutex_);

    template <void (TimedUart::*Run)()>
    static void* workerMain(void* self) noexcept;
    void runReadWorker();
    void runWriteWorker();
    void announce() PLR_REQUIRES(mutex_);
    bool send(const WriteRequest& request) PLR_REQUIRES(mutex_);
    bool awaitRoomOnLine() PLR_REQUIRES(mutex_);

    const PelorinUARTTimeoutConfig config_;
    WaitMutex mutex_;
    std::condition_variable dataAvailable_;
    std::condition_variable writeRequested_;
    std::condition_variable quieter_;  // a reconnection or a caller inside has ended

    int port_ PLR_GUARDED_BY(mutex_) = -1;
    int readWake_ PLR_GUARDED_BY(mutex_) = -1;   // posted for the end and for room in the queue
    int writeWake_ PLR_GUARDED_BY(mutex_) = -1;  // posted for the end and a lost line
    Worker readWorker_ PLR_GUARDED_BY(mutex_);
    Worker writeWorker_ PLR_GUARDED_BY(mutex_);

    std::unique_ptr<std::uint8_t[]> storage_ PLR_GUARDED_BY(mutex_);
    PelorinRingBuffer queue_ PLR_GUARDED_BY(mutex_){};
    WriteRequest* firstRequest_ PLR_GUARDED_BY(mutex_) = nullptr;
    WriteRequest* lastRequest_ PLR_GUARDED_BY(mutex_) = nullptr;

    std::uint32_t waitingReaders_ PLR_GUARDED_BY(mutex_) = 0;
    std::uint32_t visitors_ PLR_GUARDED_BY(mutex_) = 0;
    bool stopping_ PLR_GUARDED_BY(mutex_) = false;  // the workers shall end
    bool lost_ PLR_GUARDED_BY(mutex_) = true;
    bool readsUnblocked_ PLR_GUARDED_BY(mutex_) = false;
    bool roomAwaited_ PLR_GUARDED_BY(mutex_) = false;  // by the read worker
    bool reconnecting_ PLR_GUARDED_BY(mutex_) = false;
    bool ending_ PLR_GUARDED_BY(mutex_) = false;
};

}  // namespace plr::io
