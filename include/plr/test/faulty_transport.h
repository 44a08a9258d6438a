#pragma once

#include <atomic>
#include <cstdint>
#include <limits>

#include "Pelorin"

namespace plr::test {

// A transport in front of another one that fails on demand, for tests of what reads
// and writes through transports: it must work whatever sizes come, and survive a line
// that dies at any byte.
//
//   plr::test::FaultyTransport faulty(line);
//   faulty.setMostAtOnce(1);
//   modem.run(faulty.transport());
//
// Owner:   the test; the inner transport stays its owner's.
// Threads: as the inner transport; the settings on any thread.
class FaultyTransport {
  public:
    explicit FaultyTransport(PelorinTransport& inner) noexcept;
    FaultyTransport(const FaultyTransport&) = delete;
    FaultyTransport& operator=(const FaultyTransport&) = delete;

    // For whoever is tested. Lent; freeing it does nothing.
    [[nodiscard]] PelorinTransport& transport() noexcept { return transport_; }

    // Reads and writes that are not to completion move at most so many bytes.
    void setMostAtOnce(std::uint32_t bytes) noexcept { mostAtOnce_ = bytes; }
    // The next `count` reads give nothing, as after an unblock or a time-out.
    void interruptReads(std::uint32_t count) noexcept { interruptions_ = count; }
    // The line dies once so many more bytes have passed, both directions counted: what
    // is left of them is moved, then every operation fails, and isValid says so.
    void dieAfter(std::uint64_t bytes) noexcept { bytesToLive_ = bytes; }

  private:
    static FaultyTransport& of(PelorinTransport* transport) noexcept {
        return *static_cast<FaultyTransport*>(transport->state);
    }
    [[nodiscard]] bool isDead() const noexcept { return bytesToLive_ == 0; }
    // What `length` comes to by the faults; false when the line dies within it.
    bool limit(std::uint32_t& length, bool toCompletion) const noexcept;
    void moved(std::uint32_t bytes) noexcept;

    PelorinTransport& inner_;
    PelorinTransport transport_{};
    std::atomic<std::uint32_t> mostAtOnce_{std::numeric_limits<std::uint32_t>::max()};
    std::atomic<std::uint32_t> interruptions_{0};
    std::atomic<std::uint64_t> bytesToLive_{std::numeric_limits<std::uint64_t>::max()};
};

}  // namespace plr::test
