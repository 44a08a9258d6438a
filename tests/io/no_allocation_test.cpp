#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <utility>

#include "Pelorin"
#include "support/descriptors.h"
#include "support/failing_allocations.h"
#include "support/sanitized.h"

// The C library's functions count here too, but where a sanitizer needs them.
#if !PLR_SANITIZED
extern "C" {
void* __libc_malloc(std::size_t size);
void* __libc_calloc(std::size_t count, std::size_t size);
void* __libc_realloc(void* memory, std::size_t size);

void* malloc(std::size_t size) {
    plr::test::allocations++;
    return __libc_malloc(size);
}
void* calloc(std::size_t count, std::size_t size) {
    plr::test::allocations++;
    return __libc_calloc(count, size);
}
void* realloc(void* memory, std::size_t size) {
    plr::test::allocations++;
    return __libc_realloc(memory, size);
}
}
#endif

namespace {

struct NoAllocation : testing::Test {
    NoAllocation() { EXPECT_TRUE(PelorinRingBufferInitialize(&ring, storage.data(), 8)); }
    // Five bytes at positions 5 to 7 and 0 to 1.
    void wrap() {
        PelorinRingBufferReset(&ring);
        PelorinRingBufferInsertRaw(&ring, "-----ABC", 8);
        PelorinRingBufferSkip(&ring, 5);
        PelorinRingBufferInsertRaw(&ring, "DE", 2);
    }

    plr::test::Ends pipe;
    std::array<std::uint8_t, 8> storage{};
    PelorinRingBuffer ring{};
    std::array<char, 4096> text{};
    std::array<std::uint8_t, 700> data{};
    std::uint32_t count = 0;
    char high = 0;
    char low = 0;
};

TEST_F(NoAllocation, OfFormattingRingBufferAndDescriptors) {
    PelorinLogLineOperation operation{nullptr, nullptr, [](auto*, const char*) {}};
    const auto consumer = [](void*, const void*, std::uint32_t length) {
        return static_cast<std::int32_t>(length);
    };
    PelorinDebugSetDelegate([](void*, const char*, const char*) {}, nullptr);
    const auto size = static_cast<std::uint32_t>(text.size());
    const std::pair<const char*, std::function<void()>> rows[] = {
        {"debug print", [&] { PelorinDebugPrint("f", "%s %u %f", "text", 7u, 0.5); }},
        {"hex digits",
         [&] {
             PelorinEncodeHex(0xAB, &high, &low);
             PelorinEncodeHexWithLowerCase(0xAB, &high, &low, true);
             PelorinDecodeHexWithDefault('A', 0);
         }},
        {"to hex",
         [&] {
             PelorinBinToHexGetBufferSize(700);
             PelorinBinToHex(text.data(), size, data.data(), 700);
             PelorinBinToHexWithLowerCase(text.data(), size, data.data(), 700, true);
         }},
        {"from hex", [&] { PelorinHexToBin(data.data(), 700, text.data()); }},
        {"dump",
         [&] {
             PelorinLogGetBufferSize(700);
             PelorinLogBinaryToBuffer(text.data(), size, data.data(), 700);
             PelorinLogBinaryToBufferWithLineLengthAndOperation(text.data(), size, data.data(), 700,
                                                                62, &operation);
         }},
        {"refused initialization",
         [&] {
             PelorinRingBuffer other;
             PelorinRingBufferInitialize(&other, storage.data(), 6);
         }},
        {"insert and extract",
         [&] {
             wrap();
             PelorinRingBufferExtractRaw(&ring, text.data(), 8);
             wrap();
             PelorinRingBufferExtractPrivate(&ring, consumer, nullptr, 8);
         }},
        {"descriptors",
         [&] {
             wrap();
             PelorinRingBufferExtractFD(&ring, pipe.in(), 8);
             PelorinRingBufferInsertFDUnblockable(&ring, pipe.out(), -1, 2, 0);
             PelorinUnblockableReadWithTimeout(pipe.out(), -1, text.data(), 1, 1);
             PelorinUnblockableReadToCompletionWithTimeout(pipe.out(), -1, text.data(), 2, 1);
             PelorinUnblockableReadWithTimeout(pipe.out(), -1, text.data(), 1, 1);
             PelorinWriteToCompletion(-1, text.data(), 1, &count);
         }},
    };
    for (const auto& [name, call] : rows) {
        const std::size_t before = plr::test::allocations;
        call();
        EXPECT_EQ(plr::test::allocations, before) << name;
    }
    PelorinDebugSetDelegate(nullptr, nullptr);
}

TEST_F(NoAllocation, LinearizeDoesNothingWithoutMemory) {
    wrap();
    const auto storageBefore = storage;
    const std::size_t before = plr::test::allocations;
    plr::test::succeedingAllocations = 0;
    EXPECT_FALSE(PelorinRingBufferLinearize(&ring));
    EXPECT_GT(plr::test::allocations, before);
    EXPECT_EQ(storage, storageBefore);
    EXPECT_EQ(ring.writeCount, 10u);
    EXPECT_EQ(ring.readCount, 5u);
    EXPECT_TRUE(PelorinRingBufferLinearize(&ring));
    EXPECT_EQ(std::string(storage.begin(), storage.begin() + 5), "ABCDE");
    EXPECT_EQ(ring.writeCount, 5u);
    EXPECT_EQ(ring.readCount, 0u);
}

}  // namespace
