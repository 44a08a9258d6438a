#pragma once

#include <cstdint>
#include <span>

#include "plr/base/export.h"
#include "plr/text/text_transform.h"

namespace plr {

// The bottom stage: octets in memory, each of them a code.
//
// Owner:   the TextConverter; it borrows the octets.
// Threads: one at a time.
class PLR_EXPORT OctetSourceBuffer : public TextTransform {
  public:
    // From now on delivers these octets, which must outlive the reading. The mark stays.
    // A negative length is none.
    void setSource(const char* octets, int octetCount) noexcept;

    std::uint32_t nextCode() override;
    // To the first octet again, without the mark. Deliberate: the count is not set back,
    // so that after the end it still ends.
    void reset() override;
    std::size_t nextCodes(std::uint32_t* out, std::size_t most) override;
    std::size_t nextChars(char* out, std::size_t most) override;
    OctetSourceBuffer* asOctetSource() noexcept override;
    [[nodiscard]] bool deliversOctets() const noexcept override;

    // Octets delivered since setSource() or reset().
    [[nodiscard]] std::uint64_t getCount() const noexcept { return offset; }
    // Octets that are left, whatever the count lets through.
    [[nodiscard]] std::uint64_t getAvailable() const noexcept { return length - offset; }
    // All octets; null before setSource().
    [[nodiscard]] const char* getData() const noexcept { return data; }

    // For the stage above, in place of nextCode(): what may still be delivered, where it
    // lies, and that the first `octets` of it are taken.
    [[nodiscard]] std::span<const unsigned char> peek() const noexcept;
    void skip(std::size_t octets) noexcept;

  private:
    const char* data = nullptr;  // the caller's
    std::uint64_t offset = 0;    // of the next octet
    std::uint64_t length = 0;    // octets
};

}  // namespace plr
