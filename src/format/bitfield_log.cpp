#include "plr/format/bitfield_log.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "plr/format/byte_dump.h"
#include "plr/log/log_message_buffer.h"
#include "plr/log/static_logger.h"

namespace plr {
namespace {

constexpr int kBitsInByte = 8;

void logLine(const StaticLogger& logger, const std::string& line) {
    LogMessageBuffer text;
    text << line;
    logger.forceLog(LogLevel::Debug, std::move(text));
}

void logField(const StaticLogger& logger, unsigned char byte, const BitRange& range,
              const std::string& description) {
    logLine(logger,
            kSpacesForBitField + bitfieldPrettyPrint(byte, range, '-') + "    " + description);
}

// The bits of one byte that are `width` long and have `high` as the most significant.
BitRange rangeBelow(int high, std::int64_t width) {
    // A width below 1 ends up above `high`, which is not valid.
    const auto low = std::min<std::int64_t>(high - width + 1, 255);
    return {static_cast<unsigned char>(low), static_cast<unsigned char>(high)};
}

// What is left of a field while its bytes are walked.
struct Straddling {
    const StaticLogger& logger;
    const std::vector<unsigned char>& bytes;
    unsigned long offset;
    std::int64_t start;      // its first bit
    std::int64_t remaining;  // bits

    // Of the current byte. Division rounds toward zero: a start before the first byte
    // is in it, with a negative bit.
    [[nodiscard]] std::int64_t index() const { return start / kBitsInByte; }
    [[nodiscard]] int startInByte() const { return static_cast<int>(start % kBitsInByte); }
    [[nodiscard]] int available() const { return kBitsInByte - startInByte(); }
    [[nodiscard]] int high() const { return available() - 1; }
    [[nodiscard]] unsigned char byte() const { return bytes[static_cast<std::size_t>(index())]; }

    [[nodiscard]] bool isInside() const {
        return start > -kBitsInByte && index() < static_cast<std::int64_t>(bytes.size());
    }
    void logByte(const std::string& description) const {
        logLine(logger, getBytePrettyPrint(static_cast<unsigned long>(index()) + offset, byte(),
                                           description));
    }
    void logLastPart(const std::string& description) const {
        // Deliberate: also where the 8 bits begin before the first byte.
        if (remaining == kBitsInByte)
            return logByte(description);
        if (startInByte() == 0)
            logByte({});
        logField(logger, byte(), rangeBelow(high(), remaining), description);
    }
    void logPart() const {
        if (startInByte() == 0)
            logByte({});
        else
            logField(logger, byte(), rangeBelow(high(), available()), {});
    }
    void advance() {
        const int passed = available();
        start += passed;
        remaining -= passed;
    }
};

}  // namespace

void logBitFieldWithDesc(const StaticLogger& logger, unsigned char byte, const BitRange& range,
                         const std::string& description) {
    if (logger.enabled(LogLevel::Debug))
        logField(logger, byte, range, description);
}

void logBitFieldWithDesc(const StaticLogger& logger, unsigned char byte, const BitRange& range,
                         const std::function<std::string(unsigned char)>& describe) {
    if (logger.enabled(LogLevel::Debug))
        logField(logger, byte, range, describe ? describe(bitfield(byte, range)) : std::string());
}

void logStraddlingBitField(const StaticLogger& logger, int bitPosition, int width,
                           const std::vector<unsigned char>& bytes, unsigned long offset,
                           const std::string& description) {
    if (!logger.enabled(LogLevel::Debug))
        return;
    Straddling field{logger, bytes, offset, std::int64_t{bitPosition} - width, width};
    for (; field.isInside(); field.advance()) {
        if (field.remaining <= field.available())
            return field.logLastPart(description);
        field.logPart();
    }
    logLine(logger, "Invalid current byte position");
}

}  // namespace plr
