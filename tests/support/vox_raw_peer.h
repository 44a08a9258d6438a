#pragma once

#include <algorithm>
#include <array>
#include <cstring>

#include "platform/linux/vox/frame.h"
#include "platform/linux/vox/hello.h"
#include "support/unix_socket.h"
#include "support/vox_test.h"

// The wire protocol by hand, for peers that misbehave.
namespace plr::test {

inline Bytes join(std::initializer_list<Bytes> parts) {
    Bytes all;
    for (const Bytes& part : parts)
        all.insert(all.end(), part.begin(), part.end());
    return all;
}
// A header alone.
inline Bytes header(const vox_link::frame_header& fields) {
    Bytes made(vox_link::kHeaderBytes);
    vox_link::write_header(fields, made.data());
    return made;
}
// A header, its length filled in, and a body.
inline Bytes frame(vox_link::frame_header fields, const Bytes& body) {
    fields.length = static_cast<std::uint32_t>(body.size());
    return join({header(fields), body});
}
inline Bytes frame(const vox_link::frame_header& fields, vox_object_t body) {
    return frame(fields, encoding(body));
}
inline Bytes plainMessage(std::int64_t n, std::size_t bytes = 0) {
    return frame({.type = vox_link::frame_type::message}, message(n, bytes));
}
inline Bytes hello(const vox_wire::codec_limits& limits = {}) {
    vox_wire::encoded made;
    vox_link::build_hello(limits, made);
    return {made.bytes.view().begin(), made.bytes.view().end()};
}

// The other end of a connection, spoken by hand.
class RawPeer {
  public:
    explicit RawPeer(int fd) : fd_(fd) {}
    ~RawPeer() { close(); }
    RawPeer(const RawPeer&) = delete;
    RawPeer& operator=(const RawPeer&) = delete;
    void close() {
        if (fd_ >= 0)
            ::close(std::exchange(fd_, -1));
    }

    // Sends all of `bytes`; `descriptors`, as many as the kernel takes, with the
    // first. False when the other end is gone.
    bool send(std::span<const std::uint8_t> bytes, const std::vector<int>& descriptors = {}) const {
        if (!descriptors.empty()) {
            if (!sendWith(bytes.first(1), descriptors))
                return false;
            bytes = bytes.subspan(1);
        }
        while (!bytes.empty()) {
            const ssize_t sent = ::send(fd_, bytes.data(), bytes.size(), MSG_NOSIGNAL);
            if (sent < 0)
                return false;
            bytes = bytes.subspan(static_cast<std::size_t>(sent));
        }
        return true;
    }
    // Reads until the other end closes, or `enough` bytes came.
    [[nodiscard]] Bytes read(std::size_t enough = SIZE_MAX) const {
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
    // The next frame's header and what its body stands for; type 0 at the end of
    // the stream.
    [[nodiscard]] std::pair<vox_link::frame_header, Ref> readFrame() const {
        const Bytes bytes = read(vox_link::kHeaderBytes);
        if (bytes.size() < vox_link::kHeaderBytes)
            return {{.type = vox_link::frame_type{0}}, Ref()};
        const vox_link::frame_header fields = vox_link::read_own_header(bytes.data());
        return {fields, decode(read(fields.length)).first};
    }

  private:
    bool sendWith(std::span<const std::uint8_t> bytes, const std::vector<int>& descriptors) const {
        const std::size_t size = descriptors.size() * sizeof(int);
        std::vector<std::byte> control(CMSG_SPACE(size));
        iovec piece = {const_cast<std::uint8_t*>(bytes.data()), bytes.size()};
        msghdr header = {};
        header.msg_iov = &piece;
        header.msg_iovlen = 1;
        header.msg_control = control.data();
        header.msg_controllen = control.size();
        cmsghdr* rights = CMSG_FIRSTHDR(&header);
        rights->cmsg_level = SOL_SOCKET;
        rights->cmsg_type = SCM_RIGHTS;
        rights->cmsg_len = CMSG_LEN(size);
        std::memcpy(CMSG_DATA(rights), descriptors.data(), size);
        return ::sendmsg(fd_, &header, MSG_NOSIGNAL) >= 0;
    }

    int fd_;
};

// A connection whose other end is spoken by hand.
class RawPair {
  public:
    explicit RawPair(const vox_limits_t* limits = nullptr) : RawPair(sockets(), limits) {}
    // Resumes, and says hello.
    void start(const End::Handler& first = {}) {
        end.resume(first);
        peer.send(hello());
    }

    End end;
    RawPeer peer;

  private:
    RawPair(std::array<int, 2> ends, const vox_limits_t* limits)
        : end(vox_connection_create_from_socket(ends[0], limits)), peer(ends[1]) {}
    static std::array<int, 2> sockets() {
        std::array<int, 2> ends = {-1, -1};
        EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends.data()), 0);
        return ends;
    }
};

}  // namespace plr::test
