#pragma once

#include <chrono>
#include <cstdint>
#include <string_view>

#include "src/log/record_output.h"

namespace plr {

// A terminal, pipe, socket or file that somebody lends, written without waiting
// for whoever reads it, but for a patience that a stalled reader uses up once.
//
// Threads: one at a time; RecordOutput's lock.
class ConsoleDevice final : public RecordDevice {
  public:
    explicit ConsoleDevice(int lent) noexcept;
    ~ConsoleDevice() override { close(); }
    ConsoleDevice(const ConsoleDevice&) = delete;
    ConsoleDevice& operator=(const ConsoleDevice&) = delete;

    [[nodiscard]] bool send(RecordBuffer& records) noexcept override;
    [[nodiscard]] bool isDead() const noexcept override { return isDead_; }
    [[nodiscard]] int error() const noexcept override { return error_; }
    void close() noexcept override;
    void sendInCrash(std::string_view bytes) noexcept override;

  private:
    // How to write without being held up.
    enum class Kind : std::uint8_t {
        Never,   // regular files and the like hold nobody up
        Own,     // a descriptor of our own, which does not block
        Socket,  // each call says that it is not to wait
        Lent     // only after poll(2), and little at once
    };

    [[nodiscard]] Kind openOwn() noexcept;
    [[nodiscard]] long write(std::string_view bytes) const noexcept;
    [[nodiscard]] bool waitForRoom() noexcept;
    void refuse(int error) noexcept;

    int fd_;
    Kind kind_;
    bool isDead_ = false;
    int error_ = 0;
    std::chrono::nanoseconds patience_;
};

}  // namespace plr
