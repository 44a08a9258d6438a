#include "platform/linux/common/key_index.h"

#include <sys/random.h>

#include <bit>
#include <cstring>

#include "plr/base/assert.h"

namespace key_index {
namespace {

// SipHash-1-3 (Aumasson, Bernstein: "SipHash: a fast short-input PRF").

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

}  // namespace

std::uint32_t hash_of(std::string_view key) noexcept {
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

std::uint32_t* create(std::uint32_t capacity) noexcept {
    const std::uint64_t size = std::bit_ceil(std::uint64_t{2} * capacity);
    PLR_ASSERT(size <= UINT32_MAX, "a dictionary has too many entries");
    auto* const index = static_cast<std::uint32_t*>(std::calloc(size + 1, sizeof(std::uint32_t)));
    PLR_ASSERT(index, "out of memory");
    index[0] = static_cast<std::uint32_t>(size - 1);
    return index;
}

}  // namespace key_index
