#include <algorithm>
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

void reset(PelorinRingBuffer& ring) {
    ring.writeCount = 0;
    ring.readCount = 0;
}

void remove(PelorinRingBuffer& ring, std::uint32_t count) {
    ring.readCount += count;
    if (ring.readCount == ring.writeCount)
        reset(ring);
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
    if (tail == 0)  // an empty storage, which may be null
        return true;
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

// The inline functions of the header, for callers that call them.
[[gnu::used]] constexpr auto kInsertRaw = &PelorinRingBufferInsertRaw;
[[gnu::used]] constexpr auto kExtractRaw = &PelorinRingBufferExtractRaw;

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
