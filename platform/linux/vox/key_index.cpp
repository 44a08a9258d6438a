#include "platform/linux/vox/key_index.h"

#include <sys/random.h>

#include <algorithm>
#include <bit>
#include <cstring>

#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

namespace vox_values {
namespace {

// ---- SipHash-1-3 (Aumasson, Bernstein: "SipHash: a fast short-input PRF") --------

struct hash_seed {
    std::uint64_t words[2];
    hash_seed() noexcept {
        const ssize_t got = getrandom(words, sizeof words, 0);
        PLR_ASSERT(got == sizeof words, "getrandom failed");
    }
};

const hash_seed& seed() noexcept {
    static const hash_seed drawn;
    return drawn;
}

struct sip_state {
    std::uint64_t a, b, c, d;

    void round() noexcept {
        a += b;
        b = std::rotl(b, 13) ^ a;
        a = std::rotl(a, 32);
        c += d;
        d = std::rotl(d, 16) ^ c;
        a += d;
        d = std::rotl(d, 21) ^ a;
        c += b;
        b = std::rotl(b, 17) ^ c;
        c = std::rotl(c, 32);
    }
    void mix(std::uint64_t word) noexcept {
        d ^= word;
        round();
        a ^= word;
    }
};

std::uint64_t load_word(const char* bytes, std::size_t count) noexcept {
    std::uint64_t word = 0;
    std::memcpy(&word, bytes, count);
    return word;
}

// ---- The table: its mask, then mask + 1 slots ------------------------------------

std::uint32_t mask_of(const std::uint32_t* index) noexcept {
    return index[0];
}
std::uint32_t* slots_of(std::uint32_t* index) noexcept {
    return index + 1;
}

}  // namespace

std::uint32_t hash_key(std::string_view key) noexcept {
    const std::uint64_t* words = seed().words;
    sip_state state{words[0] ^ 0x736f6d6570736575, words[1] ^ 0x646f72616e646f6d,
                    words[0] ^ 0x6c7967656e657261, words[1] ^ 0x7465646279746573};
    const char* bytes = key.data();
    std::size_t left = key.size();
    for (; left >= 8; bytes += 8, left -= 8)
        state.mix(load_word(bytes, 8));
    state.mix(std::uint64_t{key.size()} << 56 | load_word(bytes, left));
    state.c ^= 0xff;
    for (int i = 0; i < 3; i++)
        state.round();
    return static_cast<std::uint32_t>(state.a ^ state.b ^ state.c ^ state.d);
}

void rebuild_index(vox_dictionary_object& dictionary) noexcept {
    const std::uint64_t size = std::bit_ceil(std::uint64_t{2} * dictionary.capacity);
    PLR_ASSERT(size <= UINT32_MAX, "a dictionary has too many entries");
    deallocate(dictionary.index);
    dictionary.index = static_cast<std::uint32_t*>(allocate((size + 1) * sizeof(std::uint32_t)));
    dictionary.index[0] = static_cast<std::uint32_t>(size - 1);
    std::fill_n(slots_of(dictionary.index), size, 0u);
    for (std::uint32_t position = 0; position < dictionary.count; position++)
        add_to_index(dictionary, position);
}

void add_to_index(vox_dictionary_object& dictionary, std::uint32_t position) noexcept {
    const std::uint32_t mask = mask_of(dictionary.index);
    std::uint32_t* slots = slots_of(dictionary.index);
    std::uint32_t slot = dictionary.entries[position].hash & mask;
    while (slots[slot] != 0)
        slot = (slot + 1) & mask;
    slots[slot] = position + 1;
}

vox_dictionary_entry* find_in_index(const vox_dictionary_object& dictionary,
                                    std::string_view key) noexcept {
    const std::uint32_t hash = hash_key(key);
    const std::uint32_t mask = mask_of(dictionary.index);
    const std::uint32_t* slots = slots_of(dictionary.index);
    for (std::uint32_t slot = hash & mask; slots[slot] != 0; slot = (slot + 1) & mask) {
        vox_dictionary_entry& entry = dictionary.entries[slots[slot] - 1];
        if (entry.hash == hash && entry.key_view() == key)
            return &entry;
    }
    return nullptr;
}

}  // namespace vox_values
