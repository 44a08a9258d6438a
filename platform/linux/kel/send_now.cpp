// Messages of crash handlers: only stack and system calls.
#include <sched.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <syslog.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>

#include "platform/linux/kel/escape.h"
#include "platform/linux/kel/sender.h"

namespace kel {
namespace {

// A datagram put together from pieces that stay where they are.
class pieces {
  public:
    void add(std::string_view bytes) noexcept {
        all_[count_++] = {const_cast<char*>(bytes.data()), bytes.size()};
    }
    // "NAME\n" length bytes "\n"; `length` has room for the eight bytes.
    void add_field(std::string_view name, std::string_view bytes, char (&length)[8]) noexcept {
        for (unsigned i = 0; i < sizeof length; i++)
            length[i] = static_cast<char>(std::uint64_t{bytes.size()} >> (8 * i) & 0xff);
        add(name);
        add({length, sizeof length});
        add(bytes);
        add("\n");
    }
    [[nodiscard]] bool send(int fd) noexcept {
        msghdr header{};
        header.msg_iov = all_.data();
        header.msg_iovlen = count_;
        return ::sendmsg(fd, &header, MSG_DONTWAIT | MSG_NOSIGNAL) >= 0;
    }

  private:
    std::array<iovec, 11> all_{};  // three, and four for each of two fields
    std::size_t count_ = 0;
};

// A line on the stack; what does not fit is cut off.
class line {
  public:
    void add(std::string_view text) noexcept {
        const std::size_t taken = std::min(text.size(), sizeof text_ - size_);
        std::memcpy(text_ + size_, text.data(), taken);
        size_ += taken;
    }
    void add_number(int number) noexcept {
        if (number >= 10)
            add_number(number / 10);
        add({&"0123456789"[number % 10], 1});
    }
    void add_escaped(std::string_view text) noexcept {
        char previous = 0;
        for (const char byte : text) {
            char escaped[kEscapedBytes];
            add({escaped, escape(previous, byte, escaped)});
            previous = byte;
        }
    }
    void end() noexcept {
        size_ = std::min(size_, sizeof text_ - 1);
        add("\n");
    }
    [[nodiscard]] std::string_view view() const noexcept { return {text_, size_}; }

  private:
    char text_[KEL_SEND_NOW_LINE];
    std::size_t size_ = 0;
};

bool send_fields(int fd, const identity& who, int priority, std::string_view domain,
                 std::string_view text) noexcept {
    const char digit[] = {static_cast<char>('0' + priority), '\n'};
    char domain_length[8];
    char text_length[8];
    pieces datagram;
    datagram.add(who.fields);
    datagram.add("PRIORITY=");
    datagram.add({digit, sizeof digit});
    if (!domain.empty())
        datagram.add_field("FACILITY\n", domain, domain_length);
    datagram.add_field("MESSAGE\n", text, text_length);
    return datagram.send(fd);
}

void make_line(line& out, int priority, const identity& who, std::string_view domain,
               std::string_view text) noexcept {
    out.add("<");
    out.add_number(priority);
    out.add(">");
    out.add_escaped(who.name);
    out.add(": ");
    if (!domain.empty()) {
        out.add_escaped(domain);
        out.add(": ");
    }
    out.add_escaped(text);
}

// Another thread holds a lock for a moment only; this one may hold it for ever.
bool try_hard(mutex& lock) noexcept PLR_TRY_ACQUIRE(true, lock) {
    for (unsigned tries = 0; tries < 1000; tries++) {
        if (lock.try_lock())
            return true;
        ::sched_yield();
    }
    return false;
}

}  // namespace

bool sender::send_now(int priority, const char* domain, std::string_view text) const noexcept {
    const int kept = errno;
    const std::string_view place = domain ? std::string_view(domain) : who_.domain;
    const bool sent = destination_.kind() == log_kind::journal
                          ? send_fields(destination_.fd(), who_, priority, place,
                                        text.substr(0, KEL_SEND_NOW_BYTES))
                          : send_line_now(priority, place, text);
    errno = kept;
    return sent;
}

// For the logs that take lines.
bool sender::send_line_now(int priority, std::string_view domain,
                           std::string_view text) const noexcept {
    line out;
    if (destination_.kind() == log_kind::syslog) {
        const int facility = who_.facility < 0 ? LOG_USER >> 3 : who_.facility;
        make_line(out, facility << 3 | priority, who_, domain, text);
        return send_datagram(destination_.fd(), out.view()) == outcome::sent;
    }
    make_line(out, priority, who_, domain, text);
    out.end();
    std::string_view rest = out.view();
    return write_ready(destination_.where().console, rest) == outcome::sent;
}

bool sender::send_record_now(const record& message) const noexcept {
    if (destination_.kind() == log_kind::journal)
        return send_native(destination_.fd(), message.bytes) == outcome::sent;
    return send_line_now(message.priority, message.view(message.domain),
                         message.view(message.text));
}

bool sender::flush_now() noexcept {
    const int kept = errno;
    bool all_sent = try_hard(lock_);
    if (all_sent)
        for (const record& message : backlog_.all())
            all_sent = send_record_now(message) && all_sent;
    errno = kept;
    return all_sent;
}

}  // namespace kel
