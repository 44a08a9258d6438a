// What passes between a service and its service manager: sockets at the start,
// and word of how it goes. This program starts as a service would.
#include <fcntl.h>

#include "platform/linux/vox/passed_sockets.h"
#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;

std::string folder;  // of the sockets

void set(const char* variable, const std::string& value) {
    ::setenv(variable, value.c_str(), 1);  // NOLINT(concurrency-mt-unsafe): one thread
}

// ---- Sockets -----------------------------------------------------------------------------

constexpr const char* kPassed = "net.example.passed";
constexpr const char* kSuffixed = "net.example.suffixed";

// What the service manager does before it starts a service.
void passSockets() {
    const int sockets[] = {listeningSocket(folder + "/" + kPassed),
                           listeningSocket(folder + "/" + kSuffixed),
                           boundSocket(SOCK_DGRAM, folder + "/datagram"),
                           boundSocket(SOCK_STREAM, folder + "/deaf"),
                           listeningSocket(folder + "/first"),
                           listeningSocket(folder + "/second")};
    std::vector<int> parked;  // above where they go
    for (const int fd : sockets)
        parked.push_back(::fcntl(fd, F_DUPFD, 100));
    for (std::size_t i = 0; i < parked.size(); ++i)
        ::dup2(parked[i], 3 + static_cast<int>(i));
    set("LISTEN_PID", std::to_string(::getpid()));
    set("LISTEN_FDS", std::to_string(std::size(sockets)));
    set("LISTEN_FDNAMES",
        "net.example.passed:net.example.suffixed.socket:datagram:deaf:twice:twice");
}

TEST(VoxPassedSockets, ClientsWaitInThemForTheNextListener) {
    for (const char* name : {kPassed, kSuffixed}) {
        SCOPED_TRACE(name);
        for (int round = 0; round < 3; ++round) {
            Client early(vox_connection_create(name));
            EXPECT_EQ(early.send(message(1)), 0);
            EchoService service(vox_connection_create_listener(name, nullptr));
            EXPECT_TRUE(early.works());
            EXPECT_EQ(service.client(0).inbox.numbers(), Numbers{1});
            Client second(vox_connection_create_listener(name, nullptr));
            second.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, "EADDRINUSE");
            EXPECT_TRUE(early.works());
        }
        EXPECT_TRUE(std::filesystem::exists(folder + "/" + name));
    }
    for (int fd = 3; fd < 9; ++fd)
        EXPECT_EQ(::fcntl(fd, F_GETFD), FD_CLOEXEC) << fd;
}

TEST(VoxPassedSockets, ThatAreWrongMakeTheListenerInvalid) {
    for (const auto& [name, why] : {std::pair("datagram", "no listening AF_UNIX stream socket"),
                                    {"deaf", "no listening AF_UNIX stream socket"},
                                    {"twice", "passed several sockets for 'twice'"}}) {
        SCOPED_TRACE(name);
        Client listener(vox_connection_create_listener(name, nullptr));
        listener.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, why);
    }
}

TEST(VoxPassedSockets, OneThatSomebodyElseShutsDownEndsItsListener) {
    Client listener(vox_connection_create_listener(kSuffixed, nullptr));
    ::shutdown(4, SHUT_RDWR);
    EXPECT_EQ(listener.inbox.errorCode(), VOX_ERROR_CONNECTION_INVALID);
}

TEST(VoxPassedSockets, AreReadStrictly) {
    const struct {
        const char* name;
        const char* pid;
        const char* count;
        const char* names;
        std::vector<std::string> found;
        const char* why;
    } rows[] = {
        {"one", "7", "1", "a", {"a"}, ""},
        {"several", "7", "3", "a::b", {"a", "", "b"}, ""},
        {"none", "7", "0", nullptr, {}, ""},
        {"no variables", nullptr, nullptr, nullptr, {}, ""},
        {"for the parent", "8", "1", "a", {}, ""},
        {"pid is a word", "7x", "1", "a", {}, "LISTEN_PID"},
        {"pid has a sign", "+7", "1", "a", {}, "LISTEN_PID"},
        {"count is empty", "7", "", "a", {}, "LISTEN_FDS"},
        {"count is negative", "7", "-1", "a", {}, "LISTEN_FDS"},
        {"count is huge", "7", "2147483647", "a", {}, "LISTEN_FDS"},
        {"count is no int", "7", "99999999999999999999", "a", {}, "LISTEN_FDS"},
        {"count with a blank", "7", "1 ", "a", {}, "LISTEN_FDS"},
        {"no names", "7", "1", nullptr, {}, "LISTEN_FDNAMES"},
        {"too few names", "7", "2", "a", {}, "LISTEN_FDNAMES"},
        {"too many names", "7", "1", "a:b", {}, "LISTEN_FDNAMES"},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.name);
        std::string why;
        std::vector<std::string> names;
        int fd = 3;
        for (const auto& found :
             vox_link::read_passed_names(7, row.pid, row.count, row.names, why)) {
            EXPECT_EQ(found.fd, fd++);
            names.push_back(found.name);
        }
        EXPECT_EQ(names, row.found);
        EXPECT_EQ(why.substr(0, why.find(' ')), row.why);
    }
}

// ---- Word to the service manager -----------------------------------------------------------

std::string received(int fd) {
    std::array<char, 256> text{};
    const ssize_t size = ::recv(fd, text.data(), text.size(), MSG_DONTWAIT);
    return {text.data(), static_cast<std::size_t>(std::max<ssize_t>(size, 0))};
}

TEST(VoxNotify, ReachesPathsAndAbstractNames) {
    const std::string place = "@net.example.notify." + std::to_string(::getpid());
    const std::pair<std::string, int> places[] = {
        {folder + "/notify", boundSocket(SOCK_DGRAM, folder + "/notify")},
        {place, boundSocket(SOCK_DGRAM, place)}};
    for (const auto& [name, fd] : places) {
        SCOPED_TRACE(name);
        set("NOTIFY_SOCKET", name);
        EXPECT_EQ(vox_notify_ready(), 0);
        EXPECT_EQ(vox_notify("STATUS=registering\nWATCHDOG=1"), 0);
        EXPECT_EQ(vox_notify_stopping(), 0);
        for (const char* state : {"READY=1", "STATUS=registering\nWATCHDOG=1", "STOPPING=1", ""})
            EXPECT_EQ(received(fd), state);
        int error = 0;
        while (error == 0)
            error = vox_notify("X=1");
        EXPECT_EQ(error, EAGAIN) << "a full one is not waited for";
        ::close(fd);
        EXPECT_EQ(vox_notify_ready(), ECONNREFUSED);
    }
}

TEST(VoxNotify, SaysWhyItCannot) {
    const std::pair<std::string, int> places[] = {{"", ENOENT},
                                                  {"relative", EAFNOSUPPORT},
                                                  {"/", EAFNOSUPPORT},
                                                  {"/" + std::string(107, 'a'), EAFNOSUPPORT},
                                                  {folder + "/missing", ENOENT}};
    for (const auto& [place, error] : places) {
        SCOPED_TRACE(place);
        set("NOTIFY_SOCKET", place);
        EXPECT_EQ(vox_notify_ready(), error);
    }
    EXPECT_EQ(vox_notify(nullptr), EINVAL);
    EXPECT_EQ(vox_notify(""), EINVAL);
    const DescriptorLimit none(0);
    EXPECT_EQ(vox_notify_ready(), EMFILE);
}

}  // namespace

int main(int count, char** arguments) {
    const RuntimeDirectory directory;
    folder = directory.path();
    passSockets();
    ::testing::InitGoogleTest(&count, arguments);
    return RUN_ALL_TESTS();
}
