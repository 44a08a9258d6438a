#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <iterator>
#include <memory>
#include <mutex>
#include <new>
#include <span>

#include "Pelorin"
#include "plr/base/assert.h"
#include "src/io/secret_mask.h"

// A tap shows an exchange after it was made, in pieces of one work area:
//
//   2026-11-22T00:52:07.123456Z > 7 bytes, ok
//   0000  41 54 2B 43 53 51 0D                                AT+CSQ.
//
// From the second piece on, the line ends with ", from byte 512".
namespace {

using plr::io::SecretMask;
using Bytes = std::span<const std::uint8_t>;

constexpr const char* kCreate = "PelorinTransportCreateTap";

constexpr std::size_t kPiece = SecretMask::kMostAtOnce;
// What is looked at behind a piece, so that its last digits are judged by what
// follows them.
constexpr std::size_t kAhead = 64;

constexpr std::size_t kBytesPerLine = 16;
constexpr std::size_t kHeading = 128;
constexpr std::size_t kDumpLine = 6 + 3 * (kBytesPerLine + 1) + kBytesPerLine + 1;
constexpr std::size_t kText = kHeading + kPiece / kBytesPerLine * kDumpLine + 1;

// One direction of the stream.
struct Direction {
    char sign;
    SecretMask mask;
};

class Tap {
  public:
    Tap(PelorinTransport& inner, const PelorinTransportTapConfig& config, const SecretMask& mask)
        : inner_(inner),
          sink_(config.sink),
          context_(config.context),
          written_{'>', mask},
          read_{'<', mask} {}

    [[nodiscard]] PelorinTransport& inner() { return inner_; }

    void showWrite(Bytes bytes, bool success);
    // `hasLost`: more came than the reader got.
    void showRead(Bytes bytes, bool success, bool hasLost);
    void showFlush(bool success);

  private:
    void show(Direction& direction, Bytes bytes, bool success);
    void showPiece(Direction& direction, Bytes bytes, std::size_t from, const char* result);
    std::size_t writeTime(char direction);

    PelorinTransport& inner_;
    const PelorinTransportTapSink sink_;
    void* const context_;
    std::mutex mutex_;  // of all that follows, and of the sink's turns
    Direction written_;
    Direction read_;
    std::array<std::uint8_t, kPiece> shown_{};
    std::array<char, kText> text_{};
};

const char* textOf(bool success) {
    return success ? "ok" : "failed";
}

void Tap::showWrite(Bytes bytes, bool success) {
    const std::lock_guard lock(mutex_);
    show(written_, bytes, success);
}

void Tap::showRead(Bytes bytes, bool success, bool hasLost) {
    const std::lock_guard lock(mutex_);
    show(read_, bytes, success);
    if (hasLost)
        read_.mask.skip();
}

void Tap::showFlush(bool success) {
    const std::lock_guard lock(mutex_);
    const std::size_t length = writeTime(read_.sign);
    std::snprintf(text_.data() + length, kText - length, "flush, %s\n", textOf(success));
    sink_(context_, text_.data());
    read_.mask.skip();
}

void Tap::show(Direction& direction, Bytes bytes, bool success) {
    std::size_t from = 0;
    do {
        showPiece(direction, bytes, from, textOf(success));
        from += kPiece;
    } while (from < bytes.size());
}

void Tap::showPiece(Direction& direction, Bytes bytes, std::size_t from, const char* result) {
    std::size_t length = writeTime(direction.sign);
    char* const to = text_.data() + length;
    length += static_cast<std::size_t>(
        from == 0 ? std::snprintf(to, kText - length, "%zu bytes, %s\n", bytes.size(), result)
                  : std::snprintf(to, kText - length, "%zu bytes, %s, from byte %zu\n",
                                  bytes.size(), result, from));
    const std::size_t count = std::min(bytes.size() - from, kPiece);
    const std::size_t known = std::min(bytes.size() - from, kPiece + kAhead);
    direction.mask.hide(bytes.subspan(from, known), count, shown_.data());
    PelorinLogBinaryToBufferWithLineLengthAndOperation(
        text_.data() + length, static_cast<std::uint32_t>(kText - length), shown_.data(),
        static_cast<std::int32_t>(count), kBytesPerLine, nullptr);
    sink_(context_, text_.data());
}

// Not by gmtime(), which may allocate. Returns the length.
std::size_t Tap::writeTime(char direction) {
    using namespace std::chrono;
    const auto now = floor<microseconds>(system_clock::now());
    const auto day = floor<days>(now);
    const year_month_day date(day);
    const hh_mm_ss time(now - day);
    return static_cast<std::size_t>(std::snprintf(
        text_.data(), kHeading, "%04d-%02u-%02uT%02d:%02d:%02d.%06dZ %c ", int{date.year()},
        unsigned{date.month()}, unsigned{date.day()}, static_cast<int>(time.hours().count()),
        static_cast<int>(time.minutes().count()), static_cast<int>(time.seconds().count()),
        static_cast<int>(time.subseconds().count()), direction));
}

// ---- The operations ---------------------------------------------------------------

Tap& tapOf(PelorinTransport* transport) {
    return *static_cast<Tap*>(transport->state);
}

// A caller may want to know why its operation failed.
class ErrnoKept {
  public:
    ErrnoKept() = default;
    ErrnoKept(const ErrnoKept&) = delete;
    ErrnoKept& operator=(const ErrnoKept&) = delete;
    ~ErrnoKept() { errno = saved_; }

  private:
    const int saved_ = errno;
};

bool writeTap(PelorinTransport* transport, const void* source, std::uint32_t length,
              std::uint32_t* count, bool toCompletion, std::uint32_t timeoutMs, void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    Tap& tap = tapOf(transport);
    *count = 0;
    const bool success =
        tap.inner().write(&tap.inner(), source, length, count, toCompletion, timeoutMs, mustBeNull);
    const ErrnoKept kept;
    tap.showWrite({static_cast<const std::uint8_t*>(source), *count}, success);
    return success;
}

bool readTap(PelorinTransport* transport, void* buffer, std::uint32_t length, std::uint32_t* count,
             bool toCompletion, std::uint32_t timeoutMs, void* mustBeNull) {
    PLR_ASSERT(!mustBeNull, "!dDtor");
    Tap& tap = tapOf(transport);
    *count = 0;
    const bool success =
        tap.inner().read(&tap.inner(), buffer, length, count, toCompletion, timeoutMs, mustBeNull);
    const ErrnoKept kept;
    // A read to completion may have failed with bytes that it took and does not give.
    const bool hasLost = toCompletion && !success;
    tap.showRead({static_cast<const std::uint8_t*>(buffer), *count}, success, hasLost);
    return success;
}

bool unblockReadTap(PelorinTransport* transport) {
    PelorinTransport& inner = tapOf(transport).inner();
    return inner.unblockRead(&inner);
}

bool flushReadTap(PelorinTransport* transport) {
    Tap& tap = tapOf(transport);
    const bool success = tap.inner().flushRead(&tap.inner());
    const ErrnoKept kept;
    tap.showFlush(success);
    return success;
}

bool isValidTap(PelorinTransport* transport) {
    PelorinTransport& inner = tapOf(transport).inner();
    return inner.isValid(&inner);
}

bool freeTap(PelorinTransport* transport) {
    delete &tapOf(transport);
    return true;
}

// ---- Creation ---------------------------------------------------------------------

constexpr std::array kSecrets = {"+CPIN*=*#", "+CPWD*=*#", "+CLCK*=*,*,*#", "##############"};

bool addSecrets(SecretMask& mask, const PelorinTransportTapConfig& config) {
    const char* const* secrets = config.secrets;
    std::uint32_t count = config.secretCount;
    if (!secrets)
        secrets = PelorinTransportTapSecrets(&count);
    for (const char* secret : std::span(secrets, count)) {
        if (mask.add(secret))
            continue;
        PelorinDebugPrint(kCreate,
                          "Pattern \"%s\" has no #, has a line's end or exceeds %zu characters\n",
                          secret, SecretMask::kLongestPattern);
        return false;
    }
    return true;
}

Tap* makeTap(PelorinTransport& inner, const PelorinTransportTapConfig& config) {
    try {
        SecretMask mask;
        return addSecrets(mask, config) ? new Tap(inner, config, mask) : nullptr;
    } catch (const std::bad_alloc&) {
        PelorinDebugPrint(kCreate, "Out of memory!\n");
        return nullptr;
    }
}

}  // namespace

extern "C" {

const char* const* PelorinTransportTapSecrets(std::uint32_t* count) {
    *count = std::size(kSecrets);
    return kSecrets.data();
}

bool PelorinTransportCreateTap(PelorinTransport* transport, PelorinTransport* inner,
                               const PelorinTransportTapConfig* config) {
    *transport = {};
    if (!config->sink) {
        PelorinDebugPrint(kCreate, "No sink\n");
        return false;
    }
    Tap* const tap = makeTap(*inner, *config);
    if (!tap)
        return false;
    transport->write = inner->write ? &writeTap : nullptr;
    transport->read = inner->read ? &readTap : nullptr;
    transport->unblockRead = inner->unblockRead ? &unblockReadTap : nullptr;
    transport->flushRead = inner->flushRead ? &flushReadTap : nullptr;
    transport->isValid = inner->isValid ? &isValidTap : nullptr;
    transport->free = &freeTap;
    transport->state = tap;
    return true;
}

}  // extern "C"
