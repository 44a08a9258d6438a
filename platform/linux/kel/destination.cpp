#include "platform/linux/kel/destination.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "dispatch/time.h"

namespace kel {
namespace {

constexpr std::int64_t kLookInterval = 1'000'000'000;  // ns, for a better log
// More than the usual receivers of RFC 3164 take.
constexpr std::size_t kSyslogBytes = 8192;

std::int64_t now() noexcept {
    return dispatch::time::now().nanoseconds();
}

}  // namespace

destination::destination(places where, const identity& sender)
    : where_(std::move(where)), sender_(sender), fd_(make_socket()) {
    find_log({});
}

void destination::close() noexcept {
    if (const int socket = fd_.exchange(-1); socket >= 0)
        ::close(socket);
}

// A line that the console has in part is whole in the log that is there again.
bool destination::connect(log_kind to) noexcept {
    if (fd() < 0)
        fd_.store(make_socket());
    if (!connect_socket(fd(), to == log_kind::journal ? where_.journal : where_.syslog))
        return false;
    kind_.store(to, std::memory_order_release);
    absent_since_ = 0;
    broken_off_ = broken_off_ || written_ > 0;
    line_.clear();
    written_ = 0;
    return true;
}

// Somebody listens again, or patience with the log that is gone has ended.
bool destination::find_log(std::chrono::milliseconds patience) {
    looked_ = now();
    if (absent_since_ == 0)
        absent_since_ = looked_;
    const bool wait = looked_ - absent_since_ < std::chrono::nanoseconds(patience).count();
    if (connect(log_kind::journal))
        return true;
    if (kind() == log_kind::journal && wait)
        return false;
    if (connect(log_kind::syslog))
        return true;
    if (kind() == log_kind::syslog && wait)
        return false;
    kind_.store(log_kind::console, std::memory_order_release);
    absent_since_ = 0;
    return true;
}

void destination::look_for_better() {
    const std::int64_t time = now();
    if (time - looked_ < kLookInterval)
        return;
    looked_ = time;
    if (!connect(log_kind::journal) && kind() == log_kind::console)
        connect(log_kind::syslog);
}

outcome destination::deliver(const record& message, std::chrono::milliseconds patience) {
    if (kind() != log_kind::journal && absent_since_ == 0)
        look_for_better();
    const outcome result = attempt(message);
    if (result != outcome::absent || !find_log(patience))
        return result;
    return attempt(message);
}

outcome destination::attempt(const record& message) {
    switch (kind()) {
        case log_kind::journal:
            return send_native(fd(), message.bytes);
        case log_kind::syslog:
            return send_line(message);
        case log_kind::console:
            return write_line(message);
    }
    return outcome::refused;
}

outcome destination::send_line(const record& message) {
    std::string line = syslog_line(message, sender_);
    const outcome result = send_datagram(fd(), line);
    if (result != outcome::refused || errno != EMSGSIZE)
        return result;
    line.resize(std::min(line.size(), kSyslogBytes));
    return send_datagram(fd(), line);
}

outcome destination::write_line(const record& message) {
    if (line_.empty())
        line_ = (std::exchange(broken_off_, false) ? "\n" : "") + console_line(message, sender_);
    std::string_view rest = std::string_view(line_).substr(written_);
    const outcome result = write_ready(where_.console, rest);
    written_ = line_.size() - rest.size();
    if (result == outcome::sent || result == outcome::refused) {
        line_.clear();
        written_ = 0;
    }
    return result;
}

}  // namespace kel
