#pragma once

#include <bit>
#include <cstdint>
#include <cstdlib>
#include <string_view>

// The hash table beside the entries of a large dictionary: open addressing, at
// most half full; slots hold positions plus one, 0 is free.
//
// The hash is SipHash-1-3 under a key drawn at random once a process, so that
// nobody outside can choose keys that collide.
namespace key_index {

inline constexpr std::uint32_t kUnindexedEntries = 16;  // up to here a walk is faster
inline constexpr std::uint32_t kNowhere = UINT32_MAX;

[[nodiscard]] std::uint32_t hash_of(std::string_view key) noexcept;

// The table: its mask, then mask + 1 slots. Freed by free().
// A free one for `capacity` entries; ends the process without memory.
[[nodiscard]] std::uint32_t* create(std::uint32_t capacity) noexcept;

inline void add(std::uint32_t* index, std::uint32_t hash, std::uint32_t position) noexcept {
    const std::uint32_t mask = index[0];
    std::uint32_t* const slots = index + 1;
    std::uint32_t slot = hash & mask;
    while (slots[slot] != 0)
        slot = (slot + 1) & mask;
    slots[slot] = position + 1;
}

// Puts a new table of all entries, which have a `hash`, in the place of `index`.
template <class Entry>
void rebuild(std::uint32_t*& index, const Entry* entries, std::uint32_t count,
             std::uint32_t capacity) noexcept {
    std::free(index);
    index = create(capacity);
    for (std::uint32_t position = 0; position < count; position++)
        add(index, entries[position].hash, position);
}

// The position of the entry of `hash` that `matches`, or kNowhere.
template <class Entry, class Matches>
std::uint32_t find(const std::uint32_t* index, const Entry* entries, std::uint32_t hash,
                   Matches matches) noexcept {
    const std::uint32_t mask = index[0];
    const std::uint32_t* const slots = index + 1;
    for (std::uint32_t slot = hash & mask; slots[slot] != 0; slot = (slot + 1) & mask) {
        const std::uint32_t position = slots[slot] - 1;
        if (entries[position].hash == hash && matches(entries[position]))
            return position;
    }
    return kNowhere;
}

}  // namespace key_index
