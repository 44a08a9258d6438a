#include "platform/linux/kel/native.h"

#include <algorithm>
#include <array>
#include <cstdint>

namespace kel {
namespace {

// What Kel writes itself; "Message" is the one key that means its field.
constexpr std::array<std::string_view, 4> kOwnNames = {"PRIORITY", "SYSLOG_IDENTIFIER",
                                                       "SYSLOG_FACILITY", "KEL_DROPPED"};

// Without the locale.
char in_field_name(char byte) noexcept {
    if (byte >= 'a' && byte <= 'z')
        return static_cast<char>(byte - 'a' + 'A');
    const bool allowed = (byte >= 'A' && byte <= 'Z') || (byte >= '0' && byte <= '9');
    return allowed ? byte : '_';
}

bool may_stand_alone(std::string_view name) noexcept {
    return !name.empty() && name[0] >= 'A' && name[0] <= 'Z' &&
           std::find(kOwnNames.begin(), kOwnNames.end(), name) == kOwnNames.end();
}

// Whether a value needs its length in front; a line feed would end it.
bool is_binary(std::string_view value) noexcept {
    return std::any_of(value.begin(), value.end(), [](char byte) {
        return static_cast<unsigned char>(byte) < ' ' && byte != '\t';
    });
}

void append_length(std::string& out, std::uint64_t length) {
    for (int i = 0; i < 8; i++)
        out += static_cast<char>(length >> (8 * i) & 0xff);
}

}  // namespace

std::string field_name(std::string_view key) {
    std::string name(key.substr(0, kFieldNameBytes));
    std::transform(name.begin(), name.end(), name.begin(), in_field_name);
    if (!may_stand_alone(name) || (name == "MESSAGE" && key != "Message"))
        name.insert(0, "KEY_");
    name.resize(std::min(name.size(), kFieldNameBytes));
    return name;
}

std::size_t append_field(std::string& out, std::string_view name, std::string_view value) {
    out += name;
    if (is_binary(value)) {
        out += '\n';
        append_length(out, value.size());
    } else {
        out += '=';
    }
    const std::size_t begin = out.size();
    out += value;
    out += '\n';
    return begin;
}

}  // namespace kel
