#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <deque>
#include <numeric>
#include <queue>
#include <set>
#include <string>
#include <utility>

#include "Pelorin"
#include "support/debug_records.h"
#include "support/descriptors.h"

namespace {

constexpr std::uint32_t kCapacity = 8;
constexpr std::uint32_t kFailed = 0xFFFFFFFF;
constexpr int kSockets = SOCK_STREAM | SOCK_NONBLOCK;
using Bytes = std::deque<std::uint8_t>;
using plr::test::Ends;

Bytes sequence(std::size_t count) {
    Bytes bytes(count);
    static std::uint8_t next = 0;
    std::generate(bytes.begin(), bytes.end(), [] { return next++; });
    return bytes;
}

// What the buffer is to hold, and in which cell of the storage that begins.
struct Model {
    Bytes bytes;
    std::size_t first = 0;

    [[nodiscard]] std::size_t cell(std::size_t index) const { return (first + index) % kCapacity; }
    [[nodiscard]] bool taken(std::size_t at) const {
        return (at + kCapacity - first) % kCapacity < bytes.size();
    }
    [[nodiscard]] std::uint32_t linear(std::size_t from, bool isTaken) const {
        std::uint32_t count = 0;
        while (from + count < kCapacity && taken(from + count) == isTaken)
            count++;
        return count;
    }
    [[nodiscard]] std::uint32_t room() const { return linear(cell(bytes.size()), false); }
    [[nodiscard]] std::uint32_t readable() const { return linear(first, true); }
    std::uint32_t insert(const Bytes& more) {
        const std::size_t count = std::min<std::size_t>(room(), more.size());
        bytes.insert(bytes.end(), more.begin(), more.begin() + static_cast<std::ptrdiff_t>(count));
        return static_cast<std::uint32_t>(count);
    }
    Bytes extract(std::size_t most) {
        Bytes out;
        for (; most > 0 && !bytes.empty(); most--) {
            out.push_back(bytes.front());
            bytes.pop_front();
            first = cell(1);
        }
        if (bytes.empty())
            first = 0;
        return out;
    }
};

// A ring buffer beside its model.
struct State {
    std::array<std::uint8_t, kCapacity> storage{};
    PelorinRingBuffer ring{};
    Model model;

    [[nodiscard]] PelorinRingBuffer* operator*() {
        ring.buffer = storage.data();
        return &ring;
    }
    void expectAgreement() {
        std::uint8_t endsAtReader = 9;
        std::uint8_t endsAtStorage = 9;
        const std::uint32_t room = model.room();
        EXPECT_EQ(PelorinRingBufferGetSize(**this), model.bytes.size());
        EXPECT_EQ(PelorinRingBufferGetLinearWriteRemaining(**this), room);
        EXPECT_EQ(PelorinRingBufferGetLinearWriteRemainingPrivate(**this, &endsAtReader), room);
        const bool atReader =
            !model.bytes.empty() && model.cell(model.bytes.size()) + room == model.first;
        EXPECT_EQ(endsAtReader, atReader ? 1 : 0);
        EXPECT_EQ(PelorinRingBufferGetLinearReadRemaining(**this), model.readable());
        EXPECT_EQ(PelorinRingBufferGetLinearReadRemainingPrivate(**this, &endsAtStorage),
                  model.readable());
        EXPECT_EQ(endsAtStorage, model.first + model.readable() == kCapacity ? 1 : 0);
        for (std::size_t i = 0; i < model.bytes.size(); i++)
            EXPECT_EQ(storage.at(model.cell(i)), model.bytes[i]) << "byte " << i;
        EXPECT_TRUE(!model.bytes.empty() || (ring.writeCount == 0 && ring.readCount == 0));
    }
};

// Whatever can be read from `ends` now.
Bytes takeAll(const Ends& ends) {
    std::array<std::uint8_t, 64> bytes;
    const ssize_t count = std::max<ssize_t>(0, ::read(ends.out(), bytes.data(), bytes.size()));
    return {bytes.begin(), bytes.begin() + count};
}

// A consumer that refuses from the piece number `refuseFrom` on.
struct Consumer {
    int refuseFrom;
    int pieces = 0;
    Bytes bytes{};

    static std::int32_t consume(void* context, const void* piece, std::uint32_t length) {
        auto& self = *static_cast<Consumer*>(context);
        if (self.pieces++ >= self.refuseFrom)
            return -7;
        const auto* const from = static_cast<const std::uint8_t*>(piece);
        self.bytes.insert(self.bytes.end(), from, from + length);
        return static_cast<std::int32_t>(length);
    }
};

bool readFromPipe(PelorinTransport* transport, void* buffer, std::uint32_t length,
                  std::uint32_t* count, bool toCompletion, std::uint32_t timeoutMs, void* null) {
    EXPECT_TRUE(!toCompletion && timeoutMs == 12 && null == nullptr);
    const ssize_t got = ::read(static_cast<Ends*>(transport->state)->out(), buffer, length);
    *count = static_cast<std::uint32_t>(std::max<ssize_t>(got, 0));
    return got >= 0;
}

void insertRaw(State& state, std::uint32_t count) {
    const Bytes more = sequence(count);
    const std::string text(more.begin(), more.end());
    EXPECT_EQ(PelorinRingBufferInsertRaw(*state, text.data(), count), state.model.insert(more));
}

void insertFd(State& state, std::uint32_t count) {
    const Ends pipe(kSockets);
    const Bytes more = sequence(count);
    pipe.put({more.begin(), more.end()});
    EXPECT_EQ(PelorinRingBufferInsertFDUnblockable(*state, pipe.out(), -1, count, 0),
              static_cast<std::int32_t>(state.model.insert(more)));
    EXPECT_EQ(PelorinRingBufferInsertFDUnblockable(*state, -1, -1, count, 0), -9);
}

void insertTransport(State& state, std::uint32_t count) {
    Ends pipe(kSockets);
    PelorinTransport transport{};
    EXPECT_EQ(PelorinRingBufferInsertTransport(*state, &transport, count, 12), kFailed);
    transport.read = &readFromPipe;
    transport.state = &pipe;
    const Bytes more = sequence(count);
    pipe.put({more.begin(), more.end()});
    const std::uint32_t expected = state.model.insert(more);
    EXPECT_EQ(PelorinRingBufferInsertTransport(*state, &transport, count, 12), expected);
    static_cast<void>(takeAll(pipe));
    if (state.model.room() > 0 && count > 0) {  // an empty pipe fails
        EXPECT_EQ(PelorinRingBufferInsertTransport(*state, &transport, count, 12), kFailed);
    }
}

void extractRaw(State& state, std::uint32_t most) {
    std::array<std::uint8_t, 16> out;
    out.fill(0xEE);
    const Bytes expected = state.model.extract(most);
    ASSERT_EQ(PelorinRingBufferExtractRaw(*state, out.data(), most), expected.size());
    EXPECT_TRUE(std::equal(expected.begin(), expected.end(), out.begin()));
    EXPECT_EQ(out.at(expected.size()), 0xEE);
}

void extractFd(State& state, std::uint32_t most) {
    const Ends pipe(kSockets);
    const Bytes expected = state.model.extract(most);
    EXPECT_EQ(PelorinRingBufferExtractFD(*state, pipe.in(), most),
              static_cast<std::int32_t>(expected.size()));
    EXPECT_EQ(takeAll(pipe), expected);
}

// What cannot be written is removed, and its error number stands for its bytes.
void extractToClosedFd(State& state, std::uint32_t most) {
    const std::size_t readable = state.model.readable();
    const std::size_t count = state.model.extract(most).size();
    EXPECT_EQ(PelorinRingBufferExtractFD(*state, -1, most),
              count == 0 ? 0 : (count > readable ? 2 : 1) * EBADF);
}

void extractPrivate(State& state, std::uint32_t most) {
    Consumer consumer{.refuseFrom = 2};
    const Bytes expected = state.model.extract(most);
    EXPECT_EQ(PelorinRingBufferExtractPrivate(*state, &Consumer::consume, &consumer, most),
              static_cast<std::int32_t>(expected.size()));
    EXPECT_EQ(consumer.bytes, expected);
}

void extractRefused(State& state, std::uint32_t most) {
    Consumer consumer{.refuseFrom = 0};
    EXPECT_EQ(PelorinRingBufferExtractPrivate(*state, &Consumer::consume, &consumer, most), -7);
    EXPECT_EQ(consumer.pieces, 1);
    if (std::min<std::size_t>(most, state.model.bytes.size()) > state.model.readable()) {
        Consumer second{.refuseFrom = 1};
        EXPECT_EQ(PelorinRingBufferExtractPrivate(*state, &Consumer::consume, &second, most), -7);
    }
}

void skip(State& state, std::uint32_t count) {
    EXPECT_EQ(PelorinRingBufferSkip(*state, count), state.model.extract(count).size());
}

void linearize(State& state, std::uint32_t) {
    state.model.first = 0;
    EXPECT_TRUE(PelorinRingBufferLinearize(*state));
    EXPECT_EQ(state.ring.readCount, 0u);
}

void reset(State& state, std::uint32_t) {
    state.model = {};
    PelorinRingBufferReset(*state);
}

struct Operation {
    const char* name;
    void (*run)(State& state, std::uint32_t count);
};
constexpr Operation kOperations[] = {
    {"InsertRaw", insertRaw},
    {"InsertFDUnblockable", insertFd},
    {"InsertTransport", insertTransport},
    {"ExtractRaw", extractRaw},
    {"ExtractFD", extractFd},
    {"ExtractFD, closed", extractToClosedFd},
    {"ExtractPrivate", extractPrivate},
    {"ExtractPrivate, refused", extractRefused},
    {"Skip", skip},
    {"Linearize", linearize},
    {"Reset", reset},
};

// Walks over all states that are reached from `start`, by every operation with every
// size, until the counts leave their neighbourhood: every position is met long before.
std::size_t walk(const State& start) {
    std::set<std::pair<std::uint32_t, std::uint32_t>> seen;
    std::queue<State> open({start});
    while (!open.empty() && !testing::Test::HasFailure()) {
        const State from = open.front();
        open.pop();
        for (const Operation& operation : kOperations)
            for (std::uint32_t count = 0; count <= kCapacity + 2; count++) {
                SCOPED_TRACE(testing::Message()
                             << operation.name << " " << count << " with " << from.ring.writeCount
                             << " written, " << from.ring.readCount << " read");
                State next = from;
                operation.run(next, count);
                next.expectAgreement();
                if (next.ring.readCount - start.ring.readCount <= 2 * kCapacity &&
                    seen.emplace(next.ring.writeCount, next.ring.readCount).second)
                    open.push(next);
            }
    }
    return seen.size();
}

// Empty at 0, and 1 to 8 bytes from each of 17 read counts on.
TEST(RingBuffer, AgreesWithAModelInEveryState) {
    State start;
    ASSERT_TRUE(PelorinRingBufferInitialize(&start.ring, start.storage.data(), kCapacity));
    EXPECT_EQ(walk(start), 1 + 17 * kCapacity);
}

TEST(RingBuffer, AgreesWithAModelWhereTheCountsWrap) {
    State start;
    ASSERT_TRUE(PelorinRingBufferInitialize(&start.ring, start.storage.data(), kCapacity));
    start.ring.writeCount = start.ring.readCount = 0u - kCapacity;
    insertRaw(start, 1);
    EXPECT_EQ(walk(start), 1 + 17 * kCapacity);
}

TEST(RingBuffer, TakesPowersOfTwoOnly) {
    plr::test::DebugRecords records;
    std::array<std::uint8_t, 8> storage;
    const std::pair<std::uint32_t, bool> rows[] = {
        {0, true}, {1, true}, {8, true}, {0x80000000, true}, {3, false}, {0xFFFFFFFF, false}};
    for (const auto& [capacity, good] : rows) {
        PelorinRingBuffer ring{storage.data(), 1, 2, 3};
        const bool taken = PelorinRingBufferInitialize(&ring, storage.data(), capacity);
        EXPECT_EQ(taken, good) << capacity;
        EXPECT_EQ(ring.buffer, taken ? storage.data() : nullptr);
        EXPECT_EQ(ring.capacity, taken ? capacity : 0);
        EXPECT_TRUE(ring.writeCount == 0 && ring.readCount == 0);
        EXPECT_EQ(records.take().size(), taken ? 0u : 1u);
    }
    PelorinRingBuffer none;
    EXPECT_FALSE(PelorinRingBufferInitialize(&none, storage.data(), 6));
    EXPECT_EQ(records.take().back(),
              "PelorinRingBufferInitialize: Capacity 6 is not a power of two\n");
    ASSERT_TRUE(PelorinRingBufferInitialize(&none, nullptr, 0));
    EXPECT_EQ(PelorinRingBufferInsertRaw(&none, "abc", 3), 0u);
    EXPECT_TRUE(PelorinRingBufferLinearize(&none));
}

// Copies of up to 128 bytes go by words.
TEST(RingBuffer, CopiesEveryLength) {
    std::array<std::uint8_t, 256> storage;
    std::array<std::uint8_t, 150> in;
    std::iota(in.begin(), in.end(), std::uint8_t{1});
    PelorinRingBuffer ring;
    PelorinRingBufferInitialize(&ring, storage.data(), storage.size());
    for (std::uint32_t length = 0; length < in.size(); length++) {
        std::array<std::uint8_t, 151> out{};
        storage.fill(0);
        ASSERT_EQ(PelorinRingBufferInsertRaw(&ring, in.data(), length), length);
        EXPECT_EQ(storage[length], 0) << length;
        ASSERT_EQ(PelorinRingBufferExtractRaw(&ring, out.data(), length), length);
        EXPECT_TRUE(std::equal(in.begin(), in.begin() + length, out.begin())) << length;
        EXPECT_EQ(out.at(length), 0) << length;
    }
}

// More than write(2) takes at once, and more than a signed result can hold.
TEST(RingBuffer, WritesMoreThanASignedResultCanHold) {
    constexpr std::size_t kSpace = std::size_t{1} << 32;
    void* const space =
        ::mmap(nullptr, kSpace, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
    ASSERT_NE(space, MAP_FAILED);
    const int sink = ::open("/dev/null", O_WRONLY | O_CLOEXEC);
    std::uint32_t written = 0;
    EXPECT_EQ(PelorinWriteToCompletion(sink, space, 0xFFFFFFFF, &written), 0);
    EXPECT_EQ(written, 0xFFFFFFFF);
    PelorinRingBuffer ring;
    ASSERT_TRUE(PelorinRingBufferInitialize(&ring, space, 0x80000000));
    ring.writeCount = 0x80000000;
    EXPECT_EQ(PelorinRingBufferExtractFD(&ring, sink, 0xFFFFFFFF), 0x7FFFFFFF);
    EXPECT_EQ(PelorinRingBufferGetSize(&ring), 1u);
    ::close(sink);
    ::munmap(space, kSpace);
}

}  // namespace
