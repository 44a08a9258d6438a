#pragma once

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/stat.h>

#include <array>

#include "kel/kel.h"
#include "support/descriptors.h"
#include "support/journal_fields.h"
#include "support/scratch_folder.h"
#include "support/unix_socket.h"
#include "support/waiting.h"

// Logs for Kel to send to: a test's own in place of the system's.
namespace plr::test {

// A datagram socket at a path, such as a log daemon listens on.
class FakeLog {
  public:
    explicit FakeLog(std::string path) : path_(std::move(path)) { start(); }
    ~FakeLog() { stop(); }
    FakeLog(const FakeLog&) = delete;
    FakeLog& operator=(const FakeLog&) = delete;

    void start() { fd_ = boundSocket(SOCK_DGRAM, path_); }
    void stop() {
        if (fd_ < 0)
            return;
        ::close(std::exchange(fd_, -1));
        ::unlink(path_.c_str());
    }

    // The next datagram, or the sealed file that came in its place. Waits.
    [[nodiscard]] std::string receive() {
        pollfd ready{fd_, POLLIN, 0};
        if (::poll(&ready, 1, static_cast<int>(std::chrono::milliseconds(kBound).count())) != 1) {
            ADD_FAILURE() << "no message came";
            return {};
        }
        std::string bytes(1 << 20, '\0');
        alignas(cmsghdr) std::array<char, CMSG_SPACE(sizeof(int))> control{};
        iovec piece{bytes.data(), bytes.size()};
        msghdr header{};
        header.msg_iov = &piece;
        header.msg_iovlen = 1;
        header.msg_control = control.data();
        header.msg_controllen = control.size();
        const ssize_t length = ::recvmsg(fd_, &header, MSG_CMSG_CLOEXEC);
        bytes.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
        const cmsghdr* rights = CMSG_FIRSTHDR(&header);
        return rights ? contentOf(rights) : bytes;
    }
    [[nodiscard]] JournalFields receiveFields() {
        const std::string bytes = receive();
        auto fields = decodeJournalFields(bytes);
        EXPECT_TRUE(fields) << bytes;
        return fields.value_or(JournalFields());
    }
    // The field's value; "?" without one.
    [[nodiscard]] std::string receiveField(const std::string& name) {
        const JournalFields fields = receiveFields();
        for (const auto& [each, value] : fields)
            if (each == name)
                return value;
        return "?";
    }
    [[nodiscard]] bool hasMore() const {
        pollfd ready{fd_, POLLIN, 0};
        return ::poll(&ready, 1, 0) == 1;
    }

  private:
    // What the journal asks of a file: that it can change no more.
    static std::string contentOf(const cmsghdr* rights) {
        int file = -1;
        std::memcpy(&file, CMSG_DATA(rights), sizeof file);
        EXPECT_EQ(::fcntl(file, F_GET_SEALS),
                  F_SEAL_SHRINK | F_SEAL_GROW | F_SEAL_WRITE | F_SEAL_SEAL);
        struct stat status {};
        EXPECT_EQ(::fstat(file, &status), 0);
        std::string bytes(static_cast<std::size_t>(status.st_size), '\0');
        EXPECT_EQ(::pread(file, bytes.data(), bytes.size(), 0), status.st_size);
        ::close(file);
        return bytes;
    }

    const std::string path_;
    int fd_ = -1;
};

// A folder with room for the sockets, and a pipe for standard error. Clients that
// are opened while it lives send there. No log listens at first.
class LogPlaces {
  public:
    LogPlaces() { kel_set_places(journal().c_str(), syslog().c_str(), console_.in()); }
    ~LogPlaces() { kel_set_places(nullptr, nullptr, -1); }
    LogPlaces(const LogPlaces&) = delete;
    LogPlaces& operator=(const LogPlaces&) = delete;

    [[nodiscard]] std::string journal() const { return folder_.at("journal"); }
    [[nodiscard]] std::string syslog() const { return folder_.at("log"); }
    [[nodiscard]] bool hasConsoleText() const {
        pollfd ready{console_.out(), POLLIN, 0};
        return ::poll(&ready, 1, 0) == 1;
    }
    // What the console has so far, at least a line.
    [[nodiscard]] std::string readConsole() const {
        std::string text(1 << 17, '\0');
        pollfd ready{console_.out(), POLLIN, 0};
        EXPECT_EQ(::poll(&ready, 1, static_cast<int>(std::chrono::milliseconds(kBound).count())),
                  1);
        const ssize_t length = ::read(console_.out(), text.data(), text.size());
        text.resize(length < 0 ? 0 : static_cast<std::size_t>(length));
        return text;
    }

  private:
    const ScratchFolder folder_;
    const Ends console_;
};

// A client for the length of a test.
struct LogClient {
    explicit LogClient(const char* ident = "test", const char* facility = nullptr)
        : handle(kel_open(ident, facility, 0)) {}
    ~LogClient() { kel_close(handle); }
    LogClient(const LogClient&) = delete;
    LogClient& operator=(const LogClient&) = delete;

    void send(const std::vector<std::pair<std::string, std::string>>& fields) const {
        const kel_message_t message = kel_new(0);
        for (const auto& [key, value] : fields)
            EXPECT_EQ(kel_set_bytes(message, key.c_str(), value.data(), value.size()), 0);
        kel_send(handle, message);
        kel_free(message);
    }
    void send(const std::string& text) const { send({{"Message", text}}); }
    [[nodiscard]] kel_statistics statistics() const { return kel_get_statistics(handle); }

    const kel_client_t handle;
};

// A client that sends to a log of the test's own.
struct LogClientFixture : testing::Test {
    LogPlaces places;
    FakeLog journal{places.journal()};
    const LogClient client;
};

}  // namespace plr::test
