#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>

// The pending timers of one clock, in the order of their deadlines.
//
// A radix tree over the nanoseconds of deadlines, six bits a level, relative to
// the time `base_` before which nothing is pending:
//
//   level   that of the highest bit in which deadline and base_ differ
//   slot    the deadline's six bits there
//
// so that all of a level comes before all of the next, and the slots of a level
// are in order. Level 0 is exact: what shares a slot there has one deadline.
// The first slot is opened when its time has come: base_ moves to its earliest
// deadline, relative to which its entries stand on lower levels.
//
// Opening a slot of very many entries would be one cache miss after the other, so
// each entry knows the address of one that was added some places before it, and
// a slot is run through against the order in which it was filled. What is due
// within microseconds has the two cache lines in front of it fetched as well: the
// objects that fire in great numbers end with their entry.
//
// Cost:    inserting and removing are a few instructions at any number of
//          entries, and allocate nothing; an entry moves at most once a level
//          until it is due. No order but that of deadlines is ever computed.
// Threads: one at a time.
namespace dispatch::detail {

// What stands in a wheel, part of the object that owns it; one cache line.
class alignas(64) wheel_entry {
  public:
    wheel_entry() noexcept = default;
    wheel_entry(const wheel_entry&) = delete;
    wheel_entry& operator=(const wheel_entry&) = delete;

    [[nodiscard]] bool is_pending() const noexcept { return place_ != kNowhere; }
    [[nodiscard]] std::int64_t deadline() const noexcept { return deadline_; }

  private:
    friend class timer_wheel;
    static constexpr std::uint16_t kNowhere = 0xFFFF;

    wheel_entry* next_ = nullptr;  // in the slot, in the order of insertion
    wheel_entry* previous_ = nullptr;
    const wheel_entry* ahead_ = nullptr;  // to prefetch only: may be gone
    std::int64_t deadline_ = 0;           // nanoseconds
    std::uint16_t place_ = kNowhere;      // level * kSlots + slot
};

class timer_wheel {
  public:
    static constexpr std::int64_t kNever = std::numeric_limits<std::int64_t>::max();

    // `entry` is not pending. `deadline` in nanoseconds from 0 on; one before
    // the times already taken counts as due.
    void insert(wheel_entry& entry, std::int64_t deadline) noexcept;
    // `entry` is pending.
    void remove(wheel_entry& entry) noexcept;

    // Takes the entry with the earliest deadline not after `now`; null when
    // there is none. Equal deadlines come in the order of their insertion.
    [[nodiscard]] wheel_entry* take_due(std::int64_t now) noexcept;

    // No pending deadline is before this one: exact, unless its entry was
    // removed. kNever when nothing is pending.
    [[nodiscard]] std::int64_t earliest() const noexcept;

    // Nothing is pending any more. Takes time for each entry.
    void clear() noexcept;

    // The clock was set back to `now`: later deadlines are no longer due. Takes
    // time for each entry. Does nothing when the clock was not set back.
    void set_back(std::int64_t now) noexcept;

  private:
    static constexpr unsigned kBits = 6;
    static constexpr unsigned kSlots = 1 << kBits;
    static constexpr unsigned kLevels = 11;  // for the 62 bits of deadlines
    static constexpr std::size_t kPlaces = std::size_t{kLevels} * kSlots;

    static constexpr unsigned kAhead = 8;
    static constexpr std::size_t kSoon = std::size_t{3} * kSlots;  // places of levels 0 to 2

    // Meaningless while its bit in occupied_ is clear.
    struct slot {
        wheel_entry* first;
        wheel_entry* last;
        std::int64_t earliest;                          // no entry's deadline is before it
        unsigned added;                                 // since it was empty
        bool from_front;                                // filled from the last entry to the first
        std::array<const wheel_entry*, kAhead> recent;  // the last that were added
    };
    enum class end : bool { back, front };

    void place(wheel_entry& entry, end where) noexcept;
    static void link(slot& into, wheel_entry& entry, end where) noexcept;
    [[nodiscard]] slot& detach(unsigned place) noexcept;
    void open(unsigned place) noexcept;
    [[nodiscard]] unsigned first_place() const noexcept;

    std::int64_t base_ = 0;
    unsigned levels_ = 0;                            // bit: something on that level
    std::array<std::uint64_t, kLevels> occupied_{};  // bit: something in that slot
    std::array<slot, kPlaces> slots_;
};

}  // namespace dispatch::detail
