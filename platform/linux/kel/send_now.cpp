// Messages of crash handlers: only stack and system calls.
#include <sys/socket.h>
#include <sys/uio.h>

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

}  // namespace

bool sender::send_now(int priority, const char* domain, std::string_view text) const noexcept {
    const int kept = errno;
    const std::string_view place = domain ? domain : who_.domain;
    const log_kind kind = destination_.kind();
    bool sent;
    if (kind == log_kind::journal) {
        sent = send_fields(destination_.fd(), who_, priority, place,
                           text.substr(0, KEL_SEND_NOW_BYTES));
    } else {
        const int facility = kind == log_kind::syslog ? std::max(who_.facility, 1) : 0;
        line out;
        make_line(out, facility << 3 | priority, who_, place, text);
        if (kind == log_kind::syslog) {
            sent = send_datagram(destination_.fd(), out.view()) == outcome::sent;
        } else {
            out.end();
            std::string_view rest = out.view();
            sent = write_ready(destination_.where().console, rest) == outcome::sent;
        }
    }
    errno = kept;
    return sent;
}

}  // namespace kel
