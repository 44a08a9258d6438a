#pragma once

#include <cstdint>
#include <cstring>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

// The receiving end of the journal's native protocol, written from its
// description: https://systemd.io/JOURNAL_NATIVE_PROTOCOL.
namespace plr::test {

using JournalFields = std::vector<std::pair<std::string, std::string>>;

// The value that `input` begins with, without the line feed that ends it.
inline std::optional<std::string> takeJournalValue(std::string_view& input, bool hasLength) {
    std::uint64_t length = 0;
    if (hasLength) {
        if (input.size() < sizeof length)
            return std::nullopt;
        std::memcpy(&length, input.data(), sizeof length);  // little-endian machines only
        input.remove_prefix(sizeof length);
    } else {
        length = input.find('\n');
    }
    if (length >= input.size() || input[length] != '\n')
        return std::nullopt;
    std::string value(input.substr(0, length));
    input.remove_prefix(length + 1);
    return value;
}

// The fields of one message in their order; nothing when it is malformed.
inline std::optional<JournalFields> decodeJournalFields(std::string_view input) {
    JournalFields fields;
    while (!input.empty()) {
        const std::size_t end = input.find_first_of("=\n");
        if (end == std::string_view::npos || end == 0)
            return std::nullopt;
        const std::string name(input.substr(0, end));
        const bool hasLength = input[end] == '\n';
        input.remove_prefix(end + 1);
        auto value = takeJournalValue(input, hasLength);
        if (!value)
            return std::nullopt;
        fields.emplace_back(name, std::move(*value));
    }
    return fields;
}

}  // namespace plr::test
