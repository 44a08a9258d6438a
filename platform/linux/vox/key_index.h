#pragma once

#include <cstdint>
#include <string_view>

struct vox_dictionary_object;
struct vox_dictionary_entry;

// The hash table beside the entries of a large dictionary: open addressing, at
// most half full; slots hold positions plus one, 0 is free.
//
// The hash is SipHash-1-3 under a key drawn at random once a process, so that
// a peer cannot choose keys that collide.
namespace vox_values {

inline constexpr std::uint32_t kUnindexedEntries = 16;  // up to here a walk is faster

[[nodiscard]] std::uint32_t hash_key(std::string_view key) noexcept;

// Builds the index anew with room for the dictionary's capacity.
void rebuild_index(vox_dictionary_object& dictionary) noexcept;
// Enters the entry at `position`, whose hash is set.
void add_to_index(vox_dictionary_object& dictionary, std::uint32_t position) noexcept;
[[nodiscard]] vox_dictionary_entry* find_in_index(const vox_dictionary_object& dictionary,
                                                  std::string_view key) noexcept;

}  // namespace vox_values
