#include <sys/types.h>

#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <limits>
#include <new>

#include "Pelorin"

namespace {

// The largest result of functions that also have negative ones.
constexpr std::uint32_t kMostSigned = std::numeric_limits<std::int32_t>::max();

// One look at a record.
struct Positions {
    explicit Positions(const PelorinRingBuffer& ring)
        : write(ring.writeCount & (ring.capacity - 1)),
          read(ring.readCount & (ring.capacity - 1)),
          size(ring.writeCount - ring.readCount),
          toStorageEnd(ring.capacity - read) {}

    // Data stands behind the write position, which the next bytes must not reach.
    [[nodiscard]] bool readerIsAhead() const { return write <= read && size != 0; }
    [[nodiscard]] std::uint32_t room(std::uint32_t capacity) const {
        return readerIsAhead() ? read - write : capacity - write;
    }
    [[nodiscard]] std::uint32_t firstPiece() const { return std::min(size, toStorageEnd); }

    std::uint32_t write;
    std::uint32_t read;
    std::uint32_t size;
    std::uint32_t toStorageEnd;  // bytes from the read position
};

using Sixteen [[gnu::vector_size(16)]] = std::uint64_t;

// For lengths from one word to two.
template <class Word>
[[gnu::always_inline]] inline void copyTwoWords(std::uint8_t* to, const std::uint8_t* from,
                                                std::uint32_t length) {
    Word head;
    Word tail;
    std::memcpy(&head, from, sizeof head);
    std::memcpy(&tail, from + length - sizeof tail, sizeof tail);
    std::memcpy(to, &head, sizeof head);
    std::memcpy(to + length - sizeof tail, &tail, sizeof tail);
}

[[gnu::noinline]] std::uint32_t copyMany(std::uint8_t* to, const std::uint8_t* from,
                                         std::uint32_t length) {
    std::memcpy(to, from, length);
    return length;
}

// Returns `length`, so that callers end with it.
// Hot path: bench/bytes_pelorin.cpp. The few bytes of a command are copied here: with a
// call of memcpy, saved registers and all, they would take twice as long.
[[gnu::always_inline]] inline std::uint32_t copyBytes(std::uint8_t* to, const std::uint8_t* from,
                                                      std::uint32_t length) {
    if (length > 128)
        return copyMany(to, from, length);
    if (length > 64) {
        copyTwoWords<Sixteen>(to, from, 32);
        copyTwoWords<Sixteen>(to + 32, from + 32, 32);
        copyTwoWords<Sixteen>(to + length - 64, from + length - 64, 32);
        copyTwoWords<Sixteen>(to + length - 32, from + length - 32, 32);
    } else if (length >= 32) {
        copyTwoWords<Sixteen>(to, from, 32);
        copyTwoWords<Sixteen>(to + length - 32, from + length - 32, 32);
    } else if (length >= 16) {
        copyTwoWords<Sixteen>(to, from, length);
    } else if (length >= 8) {
        copyTwoWords<std::uint64_t>(to, from, length);
    } else if (length >= 4) {
        copyTwoWords<std::uint32_t>(to, from, length);
    } else if (length >= 2) {
        copyTwoWords<std::uint16_t>(to, from, length);
    } else if (length == 1) {
        *to = *from;
    }
    return length;
}

// Hot path: bench/bytes_pelorin.cpp. Each call knows its count by a jump, not by a
// conditional move: the next insert then need not wait for this one's arithmetic.
[[gnu::always_inline]] inline std::uint32_t insertPiece(PelorinRingBuffer& ring,
                                                        const Positions& at,
                                                        const std::uint8_t* from,
                                                        std::uint32_t count) {
    ring.writeCount += count;
    return copyBytes(ring.buffer + at.write, from, count);
}

void reset(PelorinRingBuffer& ring) {
    ring.writeCount = 0;
    ring.readCount = 0;
}

void remove(PelorinRingBuffer& ring, std::uint32_t count) {
    ring.readCount += count;
    if (ring.readCount == ring.writeCount)
        reset(ring);
}

[[gnu::noinline]] std::uint32_t copyWrapped(const PelorinRingBuffer& ring, std::uint8_t* to,
                                            std::uint32_t tail, std::uint32_t count) {
    std::memcpy(to, ring.buffer + (ring.capacity - tail), tail);
    std::memcpy(to + tail, ring.buffer, count - tail);
    return count;
}

// Hot path: as insertPiece.
[[gnu::always_inline]] inline std::uint32_t extractPieces(PelorinRingBuffer& ring,
                                                          const Positions& at, std::uint8_t* to,
                                                          std::uint32_t count) {
    remove(ring, count);
    if (count <= at.toStorageEnd) [[likely]]
        return copyBytes(to, ring.buffer + at.read, count);
    return copyWrapped(ring, to, at.toStorageEnd, count);
}

// As a result that negative ones stay different from.
std::int32_t bounded(std::int64_t sum) {
    return static_cast<std::int32_t>(std::min<std::int64_t>(sum, kMostSigned));
}

// Deliberate: the number of an error counts as if it were bytes, so that what could
// not be written is removed as well.
std::int32_t writePiece(void* context, const void* piece, std::uint32_t length) {
    std::uint32_t written = 0;
    const std::int32_t error =
        PelorinWriteToCompletion(*static_cast<const int*>(context), piece, length, &written);
    return error != 0 ? error : static_cast<std::int32_t>(written);
}

// The stored bytes run past the end of the storage, or may.
bool linearizeWrapped(PelorinRingBuffer& ring, const Positions& at) {
    const std::uint32_t tail = at.toStorageEnd;
    // Deliberate: also of a full and of an empty buffer, whose bytes need not move.
    void* const block = ::operator new(tail, std::nothrow);
    if (!block)
        return false;
    std::memcpy(block, ring.buffer + at.read, tail);
    std::memmove(ring.buffer + tail, ring.buffer, at.write);
    std::memcpy(ring.buffer, block, tail);
    ::operator delete(block);
    return true;
}

}  // namespace

extern "C" {

bool PelorinRingBufferInitialize(PelorinRingBuffer* ring, void* storage, std::uint32_t capacity) {
    *ring = {};
    // Deliberate: 0 is let pass.
    if ((capacity & (capacity - 1)) != 0) {
        PelorinDebugPrint("PelorinRingBufferInitialize", "Capacity %u is not a power of two\n",
                          capacity);
        return false;
    }
    ring->buffer = static_cast<std::uint8_t*>(storage);
    ring->capacity = capacity;
    return true;
}

void PelorinRingBufferReset(PelorinRingBuffer* ring) {
    reset(*ring);
}

std::uint32_t PelorinRingBufferGetSize(const PelorinRingBuffer* ring) {
    return ring->writeCount - ring->readCount;
}

std::uint32_t PelorinRingBufferGetLinearWriteRemaining(const PelorinRingBuffer* ring) {
    return Positions(*ring).room(ring->capacity);
}

std::uint32_t PelorinRingBufferGetLinearWriteRemainingPrivate(const PelorinRingBuffer* ring,
                                                              std::uint8_t* endsAtReader) {
    const Positions at(*ring);
    *endsAtReader = at.readerIsAhead() ? 1 : 0;
    return at.room(ring->capacity);
}

std::uint32_t PelorinRingBufferGetLinearReadRemaining(const PelorinRingBuffer* ring) {
    return Positions(*ring).firstPiece();
}

std::uint32_t PelorinRingBufferGetLinearReadRemainingPrivate(const PelorinRingBuffer* ring,
                                                             std::uint8_t* endsAtStorage) {
    const Positions at(*ring);
    *endsAtStorage = at.toStorageEnd <= at.size ? 1 : 0;
    return at.firstPiece();
}

std::uint32_t PelorinRingBufferInsertRaw(PelorinRingBuffer* ring, const void* source,
                                         std::uint32_t length) {
    // Deliberate: one piece only, although there may be room at the front.
    const Positions at(*ring);
    const std::uint32_t room = at.room(ring->capacity);
    const auto* const from = static_cast<const std::uint8_t*>(source);
    if (length > room) [[unlikely]]
        return insertPiece(*ring, at, from, room);
    return insertPiece(*ring, at, from, length);
}

std::int32_t PelorinRingBufferInsertFDUnblockable(PelorinRingBuffer* ring, int fd, int unblockFd,
                                                  std::uint32_t most, std::uint32_t timeoutMs) {
    const Positions at(*ring);
    const std::int32_t result = PelorinUnblockableReadWithTimeout(
        fd, unblockFd, ring->buffer + at.write, std::min(at.room(ring->capacity), most), timeoutMs);
    if (result > 0)
        ring->writeCount += static_cast<std::uint32_t>(result);
    return result;
}

std::uint32_t PelorinRingBufferInsertTransport(PelorinRingBuffer* ring, PelorinTransport* transport,
                                               std::uint32_t most, std::uint32_t timeoutMs) {
    constexpr std::uint32_t kFailed = 0xFFFFFFFF;
    if (!transport->read)
        return kFailed;
    const Positions at(*ring);
    std::uint32_t count = 0;
    if (!transport->read(transport, ring->buffer + at.write,
                         std::min(at.room(ring->capacity), most), &count, false, timeoutMs,
                         nullptr))
        return kFailed;
    ring->writeCount += count;
    return count;
}

std::uint32_t PelorinRingBufferExtractRaw(PelorinRingBuffer* ring, void* destination,
                                          std::uint32_t most) {
    const Positions at(*ring);
    auto* const to = static_cast<std::uint8_t*>(destination);
    if (most > at.size) [[unlikely]]
        return extractPieces(*ring, at, to, at.size);
    return extractPieces(*ring, at, to, most);
}

std::int32_t PelorinRingBufferExtractFD(PelorinRingBuffer* ring, int fd, std::uint32_t most) {
    return PelorinRingBufferExtractPrivate(ring, &writePiece, &fd, std::min(most, kMostSigned));
}

std::int32_t PelorinRingBufferExtractPrivate(PelorinRingBuffer* ring,
                                             PelorinRingBufferConsumer consumer, void* context,
                                             std::uint32_t most) {
    const Positions at(*ring);
    const std::uint32_t count = std::min(most, at.size);
    const std::uint32_t first = std::min(count, at.toStorageEnd);
    std::int32_t total = consumer(context, ring->buffer + at.read, first);
    if (total < 0)
        return total;
    if (count != first) {
        const std::int32_t second = consumer(context, ring->buffer, count - first);
        if (second < 0)
            return second;
        total = bounded(std::int64_t{total} + second);
    }
    // Deliberate: what was given is removed, whatever the consumer says it took.
    remove(*ring, count);
    return total;
}

std::uint32_t PelorinRingBufferSkip(PelorinRingBuffer* ring, std::uint32_t count) {
    const std::uint32_t skipped = std::min(count, PelorinRingBufferGetSize(ring));
    remove(*ring, skipped);
    return skipped;
}

bool PelorinRingBufferLinearize(PelorinRingBuffer* ring) {
    const Positions at(*ring);
    if (at.write > at.read)
        std::memmove(ring->buffer, ring->buffer + at.read, at.size);
    else if (!linearizeWrapped(*ring, at))
        return false;
    ring->writeCount = at.size;
    ring->readCount = 0;
    return true;
}

}  // extern "C"
