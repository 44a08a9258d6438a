#pragma once

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>
#include <mutex>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/linux/vox/frame.h"
#include "platform/linux/vox/hello.h"
#include "platform/linux/vox/socket_io.h"
#include "plr/base/report.h"
#include "support/waiting.h"
#include "vox/vox.h"

// What the tests of Vox connections share.
namespace plr::test {

// One owned reference.
class Ref {
  public:
    Ref() = default;
    explicit Ref(vox_object_t adopted) : object_(adopted) {}
    Ref(const Ref& other) : object_(vox_retain(other.object_)) {}
    Ref(Ref&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    Ref& operator=(Ref other) noexcept {
        std::swap(object_, other.object_);
        return *this;
    }
    ~Ref() { vox_release(object_); }
    operator vox_object_t() const { return object_; }
    static Ref retain(vox_object_t lent) { return Ref(vox_retain(lent)); }

  private:
    vox_object_t object_ = nullptr;
};

// {"n": n}, and with "data" of `bytes` bytes when that is not 0.
inline Ref message(std::int64_t n, std::size_t bytes = 0) {
    Ref made(vox_dictionary_create());
    vox_dictionary_set_value(made, "n", Ref(vox_int64_create(n)));
    if (bytes > 0) {
        const std::string data(bytes, 'x');
        vox_dictionary_set_value(made, "data", Ref(vox_data_create(data.data(), bytes)));
    }
    return made;
}
inline std::int64_t numberIn(vox_object_t message) {
    return vox_int64_get_value(vox_dictionary_get_value(message, "n"));
}
inline std::string descriptionOf(vox_object_t error) {
    const vox_object_t text = vox_error_get_value(error, vox_error_key_description);
    return text ? vox_string_get_string_ptr(text) : "";
}

// The events of one connection, in order.
class Inbox {
  public:
    // For vox_connection_set_event_handler(); the inbox outlives the connection.
    dispatch::block<void(vox_object_t)> handler() {
        return dispatch::block<void(vox_object_t)>([this](vox_object_t event) { add(event); });
    }
    void add(vox_object_t event) {
        const std::lock_guard guard(lock_);
        events_.push_back(Ref::retain(event));
        changed_.notify_all();
    }
    // Whether `count` events came in time.
    [[nodiscard]] bool wait(std::size_t count) {
        std::unique_lock guard(lock_);
        return changed_.wait_for(guard, kBound, [&] { return events_.size() >= count; });
    }
    // The error event, waited for; null when none came in time.
    [[nodiscard]] Ref waitForError() {
        std::unique_lock guard(lock_);
        Ref found;
        changed_.wait_for(guard, kBound, [&] {
            if (!events_.empty() && vox_get_type(events_.back()) == VOX_TYPE_ERROR)
                found = events_.back();
            return vox_object_t(found) != nullptr;
        });
        return found;
    }
    [[nodiscard]] std::vector<Ref> all() const {
        const std::lock_guard guard(lock_);
        return events_;
    }
    // The "n" of every message so far.
    [[nodiscard]] std::vector<std::int64_t> numbers() const {
        std::vector<std::int64_t> found;
        for (const Ref& event : all()) {
            if (vox_get_type(event) == VOX_TYPE_DICTIONARY)
                found.push_back(numberIn(event));
        }
        return found;
    }
    void clear() {
        const std::lock_guard guard(lock_);
        events_.clear();
    }

  private:
    mutable std::mutex lock_;
    std::condition_variable changed_;
    std::vector<Ref> events_;
};

// Sets up and resumes.
inline void resumeWith(vox_connection_t connection, Inbox& inbox,
                       const dispatch::queue& queue = dispatch::queue()) {
    const auto handler = inbox.handler();
    vox_connection_set_event_handler(connection, &handler);
    if (queue)
        vox_connection_set_target_queue(connection, &queue);
    vox_connection_resume(connection);
}

// Sends `message` with reply; the reply or error arrives in `inbox`.
inline void request(vox_connection_t connection, vox_object_t message, const dispatch::queue& queue,
                    Inbox& inbox) {
    const auto handler = inbox.handler();
    vox_connection_send_message_with_reply(connection, message, &queue, &handler);
}

// The lines that went through the report hook since it was made. One at a time.
class Reports {
  public:
    Reports() {
        lines().clear();
        plr::setReportHook([](const char* line) noexcept {
            const std::lock_guard guard(lock());
            lines().emplace_back(line);
        });
    }
    ~Reports() { plr::setReportHook(nullptr); }
    Reports(const Reports&) = delete;
    Reports& operator=(const Reports&) = delete;
    // How many lines contain `text`.
    [[nodiscard]] std::size_t count(std::string_view text) const {
        const std::lock_guard guard(lock());
        std::size_t found = 0;
        for (const std::string& line : lines())
            found += line.find(text) != std::string::npos ? 1 : 0;
        return found;
    }

  private:
    static std::mutex& lock() {
        static std::mutex shared;
        return shared;
    }
    static std::vector<std::string>& lines() {
        static std::vector<std::string> shared;
        return shared;
    }
};

// A fresh runtime directory for this process.
class RuntimeDirectory {
  public:
    RuntimeDirectory() {
        std::string pattern =
            (std::filesystem::temp_directory_path() / "pelorin-vox-XXXXXX").string();
        if (::mkdtemp(pattern.data()))
            path_ = pattern;
        use(path_);
    }
    ~RuntimeDirectory() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    RuntimeDirectory(const RuntimeDirectory&) = delete;
    RuntimeDirectory& operator=(const RuntimeDirectory&) = delete;
    [[nodiscard]] const std::string& path() const { return path_; }
    static void use(const std::string& directory) {
        ::setenv("VOX_RUNTIME_DIR", directory.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    }

  private:
    std::string path_;
};

// Whether `condition` came true in time: for what no event tells.
template <class Condition>
[[nodiscard]] bool eventually(Condition condition) {
    const auto end = std::chrono::steady_clock::now() + kBound;
    while (!condition()) {
        if (std::chrono::steady_clock::now() > end)
            return false;
        ::usleep(1000);
    }
    return true;
}

// Descriptors that this process has open.
inline std::size_t openDescriptors() {
    std::size_t count = 0;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        static_cast<void>(entry);
        ++count;
    }
    return count;
}

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

// A service in this process that answers requests with their number and records
// the events of each of its clients.
class EchoService {
  public:
    struct Client {
        Ref connection;
        Inbox inbox;
    };

    // `make` makes the listener.
    explicit EchoService(vox_connection_t listener)
        : listener_(listener), queue_(dispatch::queue::create("service")) {
        const dispatch::block<void(vox_object_t)> handler(
            [this](vox_object_t event) { take(event); });
        vox_connection_set_event_handler(listener_, &handler);
        vox_connection_set_target_queue(listener_, &queue_);
        vox_connection_resume(listener_);
    }
    ~EchoService() {
        vox_connection_cancel(listener_);
        EXPECT_TRUE(errors_.waitForError());
        queue_.sync([this] {
            for (const auto& client : clients_)
                vox_connection_cancel(client->connection);
        });
        for (const auto& client : clients_)
            EXPECT_TRUE(client->inbox.waitForError());
        drain(queue_);
    }
    EchoService(const EchoService&) = delete;
    EchoService& operator=(const EchoService&) = delete;

    [[nodiscard]] vox_connection_t listener() const { return listener_; }
    // The listener's error.
    [[nodiscard]] Inbox& errors() { return errors_; }
    // The client that came as number `index`, waited for; null in vain.
    [[nodiscard]] Client* client(std::size_t index) {
        Client* found = nullptr;
        static_cast<void>(eventually([&] {
            const std::lock_guard guard(lock_);
            found = index < clients_.size() ? clients_[index].get() : nullptr;
            return found != nullptr;
        }));
        return found;
    }

  private:
    void take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return errors_.add(event);
        auto client = std::make_unique<Client>();
        client->connection = Ref::retain(event);
        const dispatch::block<void(vox_object_t)> handler(
            [taken = client.get()](vox_object_t arrived) { answer(*taken, arrived); });
        vox_connection_set_event_handler(event, &handler);
        vox_connection_set_target_queue(event, &queue_);
        {
            const std::lock_guard guard(lock_);
            clients_.push_back(std::move(client));
        }
        vox_connection_resume(event);
    }
    static void answer(Client& client, vox_object_t event) {
        const Ref reply(vox_dictionary_create_reply(event));
        if (!vox_object_t(reply))
            return client.inbox.add(event);
        vox_dictionary_set_value(reply, "n", vox_dictionary_get_value(event, "n"));
        static_cast<void>(vox_connection_send_message(client.connection, reply));
    }

    Ref listener_;
    dispatch::queue queue_;
    Inbox errors_;
    std::mutex lock_;
    std::vector<std::unique_ptr<Client>> clients_;
};

// A client with its events, cancelled at the end.
class TestClient {
  public:
    explicit TestClient(vox_connection_t connection)
        : connection_(connection), queue_(dispatch::queue::create("client")) {
        resumeWith(connection_, inbox_, queue_);
    }
    ~TestClient() {
        vox_connection_cancel(connection_);
        EXPECT_TRUE(inbox_.waitForError());
        drain(queue_);
    }
    TestClient(const TestClient&) = delete;
    TestClient& operator=(const TestClient&) = delete;
    [[nodiscard]] vox_connection_t connection() const { return connection_; }
    [[nodiscard]] Inbox& inbox() { return inbox_; }
    // Whether a request is answered.
    [[nodiscard]] bool works() {
        auto replies = std::make_shared<Inbox>();
        const dispatch::block<void(vox_object_t)> handler(
            [replies](vox_object_t reply) { replies->add(reply); });
        vox_connection_send_message_with_reply(connection_, message(42), &queue_, &handler);
        return replies->wait(1) && numberIn(replies->all().front()) == 42;
    }

  private:
    Ref connection_;
    dispatch::queue queue_;
    Inbox inbox_;
};

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
