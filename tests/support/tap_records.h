#pragma once

#include <cerrno>
#include <cstddef>
#include <cstdlib>
#include <string>
#include <string_view>
#include <vector>

// What a transport tap showed, taken apart again. Used by one thread at a time.
namespace plr::test {

struct TapRecord {
    std::string time;
    std::string heading;       // behind the time
    std::string bytes;         // as the digits of the dump have them
    bool columnsAgree = true;  // its characters say the same
};

inline TapRecord tapRecord(std::string_view text) {
    constexpr std::size_t kTime = 27;
    constexpr std::size_t kCharacters = 16 * 3 + 3;  // behind the offset
    std::size_t end = text.find('\n');
    TapRecord record{std::string(text.substr(0, kTime)),
                     std::string(text.substr(kTime + 1, end - kTime - 1)),
                     {}};
    for (text.remove_prefix(end + 1); !text.empty(); text.remove_prefix(end + 1)) {
        end = text.find('\n');
        std::string_view line = text.substr(0, end);
        line.remove_prefix(line.find("  ") + 2);
        for (std::size_t i = 0; i + kCharacters < line.size(); ++i) {
            const std::string digits(line.substr(3 * i, 2));
            const auto byte = static_cast<unsigned char>(std::strtoul(digits.c_str(), nullptr, 16));
            record.bytes += static_cast<char>(byte);
            const bool isPrintable = byte >= 0x20 && byte <= 0x7E;
            record.columnsAgree &=
                line[kCharacters + i] == (isPrintable ? static_cast<char>(byte) : '.');
        }
    }
    return record;
}

// A sink, with a TapRecords as its context.
struct TapRecords {
    std::vector<TapRecord> all;

    static void sink(void* context, const char* text) {
        static_cast<TapRecords*>(context)->all.push_back(tapRecord(text));
        errno = 0;  // a sink may spoil it
    }
    // All bytes that records of direction `sign` show.
    [[nodiscard]] std::string bytes(char sign) const {
        std::string bytes;
        for (const TapRecord& record : all)
            bytes += record.heading.starts_with(sign) ? record.bytes : "";
        return bytes;
    }
};

}  // namespace plr::test
