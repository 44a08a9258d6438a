#pragma once

#include <unistd.h>

#include <atomic>
#include <chrono>
#include <cstdint>
#include <string>

#include "platform/linux/kel/record.h"
#include "platform/linux/kel/socket_io.h"

// Where a client's messages go: the best log that is there.
//
// Threads: deliver() by one thread at a time; fd() and kind() by any, in signal
//          handlers too. The socket stays one and the same: another log
//          becomes its peer.
namespace kel {

struct places {
    std::string journal = "/run/systemd/journal/socket";
    std::string syslog = "/dev/log";
    int console = STDERR_FILENO;
};

enum class log_kind : std::uint8_t { journal, syslog, console };

class destination {
  public:
    // Connects. `sender` is kept by reference.
    destination(places where, const identity& sender);
    ~destination() { close(); }
    destination& operator=(const destination&) = delete;

    // One attempt. After `shortage`, `full` and `absent` the next attempt is
    // for the same message, of which a part may be written already.
    [[nodiscard]] outcome deliver(const record& message, std::chrono::milliseconds patience);

    [[nodiscard]] int fd() const noexcept { return fd_.load(std::memory_order_relaxed); }
    [[nodiscard]] log_kind kind() const noexcept { return kind_.load(std::memory_order_acquire); }
    [[nodiscard]] const places& where() const noexcept { return where_; }
    // Ends all use.
    void close() noexcept;

  private:
    void look_for_better();
    bool find_log(std::chrono::milliseconds patience);
    bool connect(log_kind to) noexcept;
    outcome attempt(const record& message);
    outcome send_line(const record& message);
    outcome write_line(const record& message);

    const places where_;
    const identity& sender_;
    std::atomic<int> fd_;
    std::atomic<log_kind> kind_{log_kind::console};
    std::int64_t absent_since_ = 0;  // monotonic ns; 0 while the log is there
    std::int64_t looked_ = 0;        // monotonic ns, the last look for a better log
    std::string line_;               // for the console, being written
    std::size_t written_ = 0;        // of line_
    bool broken_off_ = false;        // the console's last line has no end
};

}  // namespace kel
