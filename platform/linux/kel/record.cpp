#include "platform/linux/kel/record.h"

#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>

#include "platform/linux/kel/escape.h"
#include "platform/linux/kel/native.h"

namespace kel {
namespace {

constexpr std::array<std::string_view, 8> kLevels = {"Emergency", "Alert",  "Critical", "Error",
                                                     "Warning",   "Notice", "Info",     "Debug"};

// In the order of RFC 5424; those between "ftp" and "local0" have no names here.
constexpr std::array<std::string_view, 24> kFacilities = {
    "kern",   "user",   "mail",     "daemon", "auth",   "syslog", "lpr",    "news",
    "uucp",   "cron",   "authpriv", "ftp",    "",       "",       "",       "",
    "local0", "local1", "local2",   "local3", "local4", "local5", "local6", "local7"};

template <std::size_t N>
int index_of(const std::array<std::string_view, N>& names, std::string_view name) noexcept {
    const auto* const found = std::find(names.begin(), names.end(), name);
    return found == names.end() || name.empty() ? -1 : static_cast<int>(found - names.begin());
}

record::part append_part(record& made, std::string_view name, std::string_view value) {
    const std::size_t at = append_field(made.bytes, name, value);
    return {at, value.size()};
}

record begin(int priority, const identity& sender, std::size_t room) {
    record made;
    made.bytes.reserve(sender.fields.size() + room);
    made.bytes += sender.fields;
    append_field(made.bytes, "PRIORITY", {&"01234567"[priority], 1});
    made.priority = priority;
    made.when = std::time(nullptr);
    return made;
}

void append_text(std::string& line, const record& message) {
    if (message.domain.length > 0) {
        append_escaped(line, message.view(message.domain));
        line += ": ";
    }
    append_escaped(line, message.view(message.text));
}

std::string origin(const identity& sender) {
    std::string text;
    append_escaped(text, sender.name);
    return text + "[" + std::to_string(::getpid()) + "]: ";
}

}  // namespace

identity::identity(const char* ident, const char* facility_name)
    : name(ident ? ident : program_invocation_short_name),
      facility(index_of(kFacilities, facility_name ? facility_name : "")),
      domain(facility_name && facility < 0 ? facility_name : "") {
    append_field(fields, "SYSLOG_IDENTIFIER", name);
    if (facility >= 0)
        append_field(fields, "SYSLOG_FACILITY", std::to_string(facility));
}

int priority_of(const kel_message& message) noexcept {
    const std::string* const level = message.find("Level");
    const int known = level ? index_of(kLevels, *level) : -1;
    return known < 0 ? kInfo : known;
}

record encode(const kel_message& message, const identity& sender) {
    std::size_t room = 64;
    for (const field& each : message.fields)
        room += each.key.size() + each.value.size() + 16;
    record made = begin(priority_of(message), sender, room);
    for (const field& each : message.fields) {
        if (each.key == "Level" && index_of(kLevels, each.value) >= 0)
            continue;
        const record::part value = append_part(made, field_name(each.key), each.value);
        if (each.key == "Message")
            made.text = value;
        else if (each.key == "Facility")
            made.domain = value;
    }
    if (made.domain.length == 0 && !sender.domain.empty())
        made.domain = append_part(made, "FACILITY", sender.domain);
    return made;
}

record encode_gap(std::uint64_t count, const identity& sender) {
    const std::string number = std::to_string(count);
    record made = begin(kWarning, sender, 64);
    made.text = append_part(made, "MESSAGE", number + " messages dropped");
    append_field(made.bytes, "KEL_DROPPED", number);
    return made;
}

std::string syslog_line(const record& message, const identity& sender) {
    const int facility = sender.facility < 0 ? LOG_USER >> 3 : sender.facility;
    std::tm local{};
    ::localtime_r(&message.when, &local);
    // Not strftime(): the names of the months are English in every locale.
    static constexpr std::array<const char*, 12> kMonths = {
        "Jan", "Feb", "Mar", "Apr", "May", "Jun", "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
    char head[64];
    std::snprintf(head, sizeof head, "<%d>%s %2d %02d:%02d:%02d ", facility << 3 | message.priority,
                  kMonths[static_cast<std::size_t>(local.tm_mon)], local.tm_mday, local.tm_hour,
                  local.tm_min, local.tm_sec);
    std::string line = head + origin(sender);
    append_text(line, message);
    return line;
}

std::string console_line(const record& message, const identity& sender) {
    std::string line = "<" + std::to_string(message.priority) + ">" + origin(sender);
    append_text(line, message);
    line += '\n';
    return line;
}

}  // namespace kel
