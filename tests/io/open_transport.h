#pragma once

#include <gtest/gtest.h>

#include <string>
#include <string_view>
#include <utility>

#include "Pelorin"

namespace plr::test {

// A transport that ends with its scope.
struct OpenTransport : PelorinTransport {
    OpenTransport() : PelorinTransport{} {}
    OpenTransport(const OpenTransport&) = delete;
    OpenTransport& operator=(const OpenTransport&) = delete;
    ~OpenTransport() { PelorinTransportFree(this); }

    bool put(std::string_view bytes, bool toCompletion = true) {
        std::uint32_t count = 0xEEEE;
        const bool written = write(this, bytes.data(), static_cast<std::uint32_t>(bytes.size()),
                                   &count, toCompletion, 0, nullptr);
        EXPECT_LE(count, bytes.size());
        EXPECT_EQ(written, count == bytes.size());
        return written;
    }
    // Whether a read succeeded, and what it got.
    using Got = std::pair<bool, std::string>;
    Got get(std::uint32_t length, bool toCompletion = false,
            std::uint32_t timeoutMs = PELORIN_FOREVER) {
        Got got{false, std::string(length, '\0')};
        std::uint32_t count = 0xEEEE;
        got.first = read(this, got.second.data(), length, &count, toCompletion, timeoutMs, nullptr);
        EXPECT_LE(count, length);
        got.second.resize(count);
        return got;
    }
};

}  // namespace plr::test
