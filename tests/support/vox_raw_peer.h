#pragma once

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <initializer_list>
#include <span>
#include <string>
#include <utility>
#include <vector>

#include "platform/linux/vox/frame.h"
#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/socket_io.h"
#include "support/vox_test.h"

// The wire protocol by hand, for peers that misbehave.
namespace plr::test {

// The other end of a connection, spoken by hand.
class RawPeer {
  public:
    using Bytes = std::vector<std::uint8_t>;

    explicit RawPeer(int fd) : fd_(fd) {}
    RawPeer(RawPeer&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    RawPeer& operator=(RawPeer&&) = delete;
    ~RawPeer() { close(); }
    void close() {
        if (fd_ >= 0)
            ::close(std::exchange(fd_, -1));
    }
    [[nodiscard]] int fd() const { return fd_; }

    // A frame as our own writer makes it.
    static Bytes frame(vox_link::frame_type type, std::uint64_t id, vox_object_t body,
                       std::uint16_t descriptors = 0, std::uint8_t flags = 0) {
        vox_wire::encoded made;
        vox_link::skip_header(made);
        EXPECT_EQ(vox_wire::encode(body, {}, made), 0);
        const auto length = static_cast<std::uint32_t>(made.bytes.size() - vox_link::kHeaderBytes);
        for (const int duplicate : made.descriptors)
            ::close(duplicate);
        vox_link::write_header({type, flags, descriptors, length, id}, made.bytes.data());
        return {made.bytes.data(), made.bytes.data() + made.bytes.size()};
    }
    static Bytes hello() {
        vox_wire::encoded made;
        vox_link::build_hello({}, made);
        return {made.bytes.data(), made.bytes.data() + made.bytes.size()};
    }
    static Bytes join(std::initializer_list<Bytes> parts) {
        Bytes all;
        for (const Bytes& part : parts)
            all.insert(all.end(), part.begin(), part.end());
        return all;
    }

    // As send(), with as many descriptors as the kernel takes.
    void sendWith(std::span<const std::uint8_t> bytes, std::span<const int> descriptors) {
        std::vector<std::byte> control(CMSG_SPACE(descriptors.size_bytes()));
        Bytes first(bytes.begin(), bytes.begin() + 1);
        iovec piece = {first.data(), 1};
        msghdr header = {};
        header.msg_iov = &piece;
        header.msg_iovlen = 1;
        if (!descriptors.empty()) {
            header.msg_control = control.data();
            header.msg_controllen = control.size();
            cmsghdr* rights = CMSG_FIRSTHDR(&header);
            rights->cmsg_level = SOL_SOCKET;
            rights->cmsg_type = SCM_RIGHTS;
            rights->cmsg_len = CMSG_LEN(descriptors.size_bytes());
            std::memcpy(CMSG_DATA(rights), descriptors.data(), descriptors.size_bytes());
        }
        EXPECT_EQ(::sendmsg(fd_, &header, MSG_NOSIGNAL), 1);
        send(bytes.subspan(1));
    }
    // Sends all of `bytes`; `descriptors` with the first. False when the other
    // end is gone.
    bool send(std::span<const std::uint8_t> bytes, std::span<const int> descriptors = {}) {
        Bytes copy(bytes.begin(), bytes.end());
        std::size_t sent = 0;
        while (sent < copy.size()) {
            iovec piece = {copy.data() + sent, copy.size() - sent};
            const auto result = vox_link::send_pieces(
                fd_, {&piece, 1}, sent == 0 ? descriptors : std::span<const int>());
            if (result.error != 0 && result.error != EAGAIN)
                return false;
            sent += result.bytes;
            if (result.bytes == 0)
                ::usleep(1000);  // the kernel's buffer is full; polling would do no better
        }
        return true;
    }
    // Reads until the other end closes, or `enough` bytes came.
    Bytes read(std::size_t enough = SIZE_MAX) {
        Bytes all;
        std::array<std::uint8_t, 4096> part;
        while (all.size() < enough) {
            const ssize_t count =
                ::recv(fd_, part.data(), std::min(part.size(), enough - all.size()), 0);
            if (count <= 0)
                break;
            all.insert(all.end(), part.begin(), part.begin() + count);
        }
        return all;
    }
    // The next frame's header and body; type 0 at the end of the stream.
    std::pair<vox_link::frame_header, Bytes> readFrame() {
        const Bytes header = read(vox_link::kHeaderBytes);
        if (header.size() < vox_link::kHeaderBytes)
            return {{.type = vox_link::frame_type{0}}, {}};
        const vox_link::frame_header fields = vox_link::read_own_header(header.data());
        return {fields, read(fields.length)};
    }

  private:
    int fd_;
};

// A connection whose other end is spoken by hand. Not resumed.
inline std::pair<Ref, RawPeer> connectionWithRawPeer(const vox_limits_t* limits = nullptr) {
    std::array<int, 2> ends = {-1, -1};
    EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
    return {Ref(vox_connection_create_from_socket(ends[0], limits)), RawPeer(ends[1])};
}

// A stream socket connected to the file at `path`; -1 when that fails.
inline int connectTo(const std::string& path) {
    sockaddr_un address = {};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, path.c_str(), sizeof address.sun_path - 1);
    const int fd = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    if (::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0)
        return fd;
    ::close(fd);
    return -1;
}

}  // namespace plr::test
