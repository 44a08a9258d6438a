// Services by name and by endpoint: who gets a name, where, and who gets in.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>

#include <array>
#include <filesystem>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/linux/vox/value_layout.h"
#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using plr::test::descriptionOf;
using plr::test::EchoService;
using plr::test::Inbox;
using plr::test::message;
using plr::test::Ref;
using plr::test::TestClient;

constexpr const char* kName = "net.example.listener";

// The error of a connection that is made and resumed.
Ref errorOf(vox_connection_t made) {
    const Ref connection(made);
    const auto inbox = std::make_shared<Inbox>();
    const dispatch::block<void(vox_object_t)> handler(
        [inbox](vox_object_t event) { inbox->add(event); });
    vox_connection_set_event_handler(connection, &handler);
    vox_connection_resume(connection);
    return inbox->waitForError();
}

bool mentions(vox_object_t error, const char* text) {
    return descriptionOf(error).find(text) != std::string::npos;
}

class VoxListener : public ::testing::Test {
  protected:
    [[nodiscard]] std::string path(const std::string& name = kName) const {
        return directory.path() + "/" + name;
    }
    plr::test::RuntimeDirectory directory;
    plr::test::Reports reports;
};

TEST_F(VoxListener, ServesANameAndGivesItUpAtTheEnd) {
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(kName))),
              VOX_ERROR_CONNECTION_INTERRUPTED)
        << "nobody serves it yet";
    {
        EchoService service(vox_connection_create_listener(kName, nullptr));
        struct stat file {};
        ASSERT_EQ(::stat(path().c_str(), &file), 0);
        EXPECT_EQ(file.st_mode & 07777, 0600u);
        TestClient first(vox_connection_create(kName));
        TestClient second(vox_connection_create(kName));
        EXPECT_TRUE(first.works());
        EXPECT_TRUE(second.works());
        EXPECT_STREQ(vox_connection_get_name(service.client(0)->connection), kName);
        EXPECT_EQ(vox_connection_get_pid(service.client(0)->connection), ::getpid());
        EXPECT_EQ(vox_connection_get_pid(first.connection()), ::getpid());
    }
    EXPECT_FALSE(std::filesystem::exists(path()));
}

TEST_F(VoxListener, ANameIsFreeAsSoonAsItsListenerIsCancelled) {
    for (int round = 0; round < 50; ++round) {
        const Ref listener(vox_connection_create_listener(kName, nullptr));
        vox_connection_resume(listener);
        vox_connection_cancel(listener);
    }
    EchoService service(vox_connection_create_listener(kName, nullptr));
    TestClient client(vox_connection_create(kName));
    EXPECT_TRUE(client.works());
}

TEST_F(VoxListener, ClientsWaitForAListenerThatIsSuspended) {
    EchoService service(vox_connection_create_listener(kName, nullptr));
    vox_connection_suspend(service.listener());
    TestClient client(vox_connection_create(kName));
    EXPECT_EQ(vox_connection_send_message(client.connection(), message(1)), 0);
    vox_connection_resume(service.listener());
    EXPECT_TRUE(client.works());
    EXPECT_EQ(service.client(0)->inbox.numbers(), std::vector<std::int64_t>{1});
}

TEST_F(VoxListener, ANameThatIsServedIsNotTaken) {
    EchoService service(vox_connection_create_listener(kName, nullptr));
    TestClient client(vox_connection_create(kName));
    EXPECT_TRUE(client.works());
    const Ref error = errorOf(vox_connection_create_listener(kName, nullptr));
    EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_TRUE(mentions(error, "EADDRINUSE")) << descriptionOf(error);
    EXPECT_TRUE(client.works());
    EXPECT_TRUE(std::filesystem::exists(path()));
    TestClient other(vox_connection_create(kName));
    EXPECT_TRUE(other.works());
    EXPECT_EQ(service.errors().all().size(), 0u);
}

TEST_F(VoxListener, ASocketThatADeadProcessLeftIsReplaced) {
    const pid_t child = ::fork();
    if (child == 0) {
        // No threads here: only the socket, as a killed service leaves it.
        sockaddr_un address = {};
        address.sun_family = AF_UNIX;
        std::strncpy(address.sun_path, path().c_str(), sizeof address.sun_path - 1);
        const int fd = ::socket(AF_UNIX, SOCK_STREAM, 0);
        const bool bound =
            ::bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
        ::_exit(bound && ::listen(fd, 5) == 0 ? 0 : 1);
    }
    int status = -1;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ASSERT_EQ(status, 0);
    ASSERT_TRUE(std::filesystem::exists(path()));
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(kName))),
              VOX_ERROR_CONNECTION_INTERRUPTED);
    EchoService service(vox_connection_create_listener(kName, nullptr));
    TestClient client(vox_connection_create(kName));
    EXPECT_TRUE(client.works());
}

TEST_F(VoxListener, AFileThatIsNotItsOwnIsLeftAlone) {
    {
        EchoService service(vox_connection_create_listener(kName, nullptr));
        std::filesystem::remove(path());
        ASSERT_EQ(::close(::open(path().c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600)), 0);
    }
    EXPECT_TRUE(std::filesystem::exists(path())) << "somebody else's file was removed";
    const Ref error = errorOf(vox_connection_create_listener(kName, nullptr));
    EXPECT_TRUE(mentions(error, "no socket")) << descriptionOf(error);
    EXPECT_TRUE(std::filesystem::exists(path()));
}

TEST_F(VoxListener, UnusableNamesAreInvalid) {
    const std::string names[] = {"",           ".hidden", "a/b", "..",
                                 "with blank", "nul\n",   "ü",   std::string(101, 'a')};
    for (const std::string& name : names) {
        SCOPED_TRACE(name);
        for (const vox_connection_t made :
             {vox_connection_create(name.c_str()),
              vox_connection_create_listener(name.c_str(), nullptr)}) {
            const Ref error = errorOf(made);
            EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
            EXPECT_TRUE(mentions(error, "no name of a service")) << descriptionOf(error);
        }
    }
    const std::string longest(100, 'a');
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(longest.c_str()))),
              directory.path().size() + 101 < sizeof(sockaddr_un::sun_path)
                  ? VOX_ERROR_CONNECTION_INTERRUPTED
                  : VOX_ERROR_CONNECTION_INVALID);
}

TEST_F(VoxListener, UnsafeDirectoriesAreInvalid) {
    namespace fs = std::filesystem;
    const std::string base = directory.path();
    fs::create_directory(base + "/open");
    ::chmod((base + "/open").c_str(), 0777);
    fs::create_directory(base + "/group");
    ::chmod((base + "/group").c_str(), 0770);
    fs::create_directory(base + "/good");
    ::chmod((base + "/good").c_str(), 0755);
    fs::create_directory_symlink(base + "/good", base + "/link");
    ASSERT_EQ(::close(::open((base + "/file").c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600)), 0);
    fs::create_directory(base + "/foreign");
    const bool root = ::getuid() == 0;
    ASSERT_EQ(root ? ::chown((base + "/foreign").c_str(), 12345, 12345) : 0, 0);
    struct Row {
        std::string directory;
        const char* why;
    };
    const Row rows[] = {
        {base + "/open", "may be written to by others"},
        {base + "/group", "may be written to by others"},
        {base + "/link", "is a symbolic link"},
        {base + "/file", "is no directory"},
        {"relative", "is not an absolute path"},
        {root ? base + "/foreign" : base + "/link",
         root ? "belongs to another user" : "is a symbolic link"},
    };
    for (const Row& row : rows) {
        SCOPED_TRACE(row.directory);
        plr::test::RuntimeDirectory::use(row.directory);
        for (const vox_connection_t made :
             {vox_connection_create(kName), vox_connection_create_listener(kName, nullptr)}) {
            const Ref error = errorOf(made);
            EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
            EXPECT_TRUE(mentions(error, row.why)) << descriptionOf(error);
        }
    }
    // A missing one is made, private; its parent is not.
    plr::test::RuntimeDirectory::use(base + "/new");
    {
        EchoService service(vox_connection_create_listener(kName, nullptr));
        TestClient client(vox_connection_create(kName));
        EXPECT_TRUE(client.works());
        EXPECT_EQ(fs::status(base + "/new").permissions(), fs::perms::owner_all);
    }
    plr::test::RuntimeDirectory::use(base + "/no/parent");
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create_listener(kName, nullptr))),
              VOX_ERROR_CONNECTION_INVALID);
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(kName))),
              VOX_ERROR_CONNECTION_INTERRUPTED);
    plr::test::RuntimeDirectory::use(base);
}

// ---- Who gets in -------------------------------------------------------------------------

TEST_F(VoxListener, AClientThatTheHandlerDoesNotKeepIsRefused) {
    Inbox events;
    const Ref listener(vox_connection_create_listener(kName, nullptr));
    const dispatch::block<void(vox_object_t)> handler([&](vox_object_t event) {
        if (vox_get_type(event) == VOX_TYPE_ERROR)
            events.add(event);
    });
    vox_connection_set_event_handler(listener, &handler);
    vox_connection_resume(listener);
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(kName))),
              VOX_ERROR_CONNECTION_INTERRUPTED);
    vox_connection_cancel(listener);
    EXPECT_TRUE(events.waitForError());
}

TEST_F(VoxListener, TakesNoMoreClientsThanItsLimits) {
    for (const bool per_user : {false, true}) {
        SCOPED_TRACE(per_user);
        vox_limits_t limits = vox_limits_default();
        (per_user ? limits.max_connections_per_uid : limits.max_connections) = 2;
        EchoService service(vox_connection_create_listener(kName, &limits));
        TestClient first(vox_connection_create(kName));
        std::optional<TestClient> second(std::in_place, vox_connection_create(kName));
        EXPECT_TRUE(first.works());
        EXPECT_TRUE(second->works());
        EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create(kName))),
                  VOX_ERROR_CONNECTION_INTERRUPTED);
        EXPECT_TRUE(first.works());
        second.reset();
        EXPECT_TRUE(service.client(1)->inbox.waitForError());  // its place is free then
        TestClient third(vox_connection_create(kName));
        EXPECT_TRUE(third.works());
    }
}

TEST_F(VoxListener, KeepsServingWhenDescriptorsRunOut) {
    EchoService service(vox_connection_create_listener(kName, nullptr));
    TestClient old(vox_connection_create(kName));
    ASSERT_TRUE(old.works());
    const int early = plr::test::connectTo(path());
    ASSERT_TRUE(service.client(1));
    // All but one, which the next client's own socket takes.
    std::vector<int> taken;
    rlimit before{};
    ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
    const rlimit low = {plr::test::openDescriptors() + 20, before.rlim_max};
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &low), 0);
    for (;;) {
        const int fd = ::open("/dev/null", O_RDONLY | O_CLOEXEC);
        if (fd < 0)
            break;
        taken.push_back(fd);
    }
    ::close(taken.back());
    taken.pop_back();
    plr::test::RawPeer refused(plr::test::connectTo(path()));
    ASSERT_GE(refused.fd(), 0);
    EXPECT_TRUE(refused.read().empty()) << "the client is refused, not left waiting";
    EXPECT_TRUE(old.works()) << "clients that were there are served";
    EXPECT_GE(reports.count("out of descriptors") + reports.count("left out"), 1u);
    for (const int fd : taken)
        ::close(fd);
    refused.close();
    TestClient next(vox_connection_create(kName));
    EXPECT_TRUE(next.works()) << "accepting goes on";
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
    ::close(early);
}

TEST_F(VoxListener, DescriptorsThatCannotBeTakenEndTheConnection) {
    auto [connection, peer] = plr::test::connectionWithRawPeer();
    Inbox inbox;
    plr::test::resumeWith(connection, inbox);
    const std::vector<int> descriptors(10, 0);
    peer.send(plr::test::RawPeer::hello());
    rlimit before{};
    ASSERT_EQ(::getrlimit(RLIMIT_NOFILE, &before), 0);
    const std::size_t open = plr::test::openDescriptors();
    const rlimit low = {open + 3, before.rlim_max};
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &low), 0);
    peer.send(plr::test::RawPeer::frame(vox_link::frame_type::message, 0, message(1), 10),
              descriptors);
    const Ref error = inbox.waitForError();
    ASSERT_EQ(::setrlimit(RLIMIT_NOFILE, &before), 0);
    EXPECT_EQ(vox_error_get_code(error), VOX_ERROR_CONNECTION_INVALID);
    EXPECT_TRUE(mentions(error, "descriptors were lost")) << descriptionOf(error);
    EXPECT_EQ(plr::test::openDescriptors(), open - 1);
}

// ---- Endpoints ------------------------------------------------------------------------------

TEST_F(VoxListener, EndpointsTravelInMessagesAndLeadToTheirListener) {
    const std::size_t before = plr::test::openDescriptors();
    {
        EchoService hidden(vox_connection_create_anonymous_listener(nullptr));
        EchoService broker(vox_connection_create_listener(kName, nullptr));
        TestClient client(vox_connection_create(kName));
        const Ref carrier = message(1);
        vox_dictionary_set_value(carrier, "endpoint", Ref(vox_endpoint_create(hidden.listener())));
        EXPECT_EQ(vox_connection_send_message(client.connection(), carrier), 0);
        ASSERT_TRUE(broker.client(0)->inbox.wait(1));
        const vox_object_t endpoint =
            vox_dictionary_get_value(broker.client(0)->inbox.all()[0], "endpoint");
        ASSERT_EQ(vox_get_type(endpoint), VOX_TYPE_ENDPOINT);
        TestClient first(vox_connection_create_from_endpoint(endpoint));
        TestClient second(vox_connection_create_from_endpoint(endpoint));
        EXPECT_TRUE(first.works());
        EXPECT_TRUE(second.works());
        EXPECT_EQ(vox_connection_get_pid(hidden.client(1)->connection), ::getpid());
        EXPECT_EQ(vox_get_type(Ref(vox_endpoint_create(broker.listener()))), VOX_TYPE_NULL);
        broker.client(0)->inbox.clear();
    }
    EXPECT_TRUE(plr::test::eventually([&] { return plr::test::openDescriptors() == before; }));
}

TEST_F(VoxListener, AnEndpointOutlivesItsListenerInVain) {
    Ref endpoint;
    {
        EchoService hidden(vox_connection_create_anonymous_listener(nullptr));
        endpoint = Ref(vox_endpoint_create(hidden.listener()));
        TestClient client(vox_connection_create_from_endpoint(endpoint));
        EXPECT_TRUE(client.works());
    }
    EXPECT_EQ(vox_error_get_code(errorOf(vox_connection_create_from_endpoint(endpoint))),
              VOX_ERROR_CONNECTION_INTERRUPTED);
    EXPECT_EQ(
        vox_error_get_code(errorOf(vox_connection_create_from_endpoint(Ref(vox_int64_create(1))))),
        VOX_ERROR_CONNECTION_INVALID);
}

TEST_F(VoxListener, WhatIsNoConnectionIsRefusedByAnEndpoint) {
    EchoService hidden(vox_connection_create_anonymous_listener(nullptr));
    const Ref endpoint(vox_endpoint_create(hidden.listener()));
    TestClient client(vox_connection_create_from_endpoint(endpoint));
    ASSERT_TRUE(client.works());
    const std::size_t before = plr::test::openDescriptors();
    const int fd = vox_values::as<vox_descriptor_object>(endpoint, VOX_TYPE_ENDPOINT)->descriptor;
    std::array<int, 2> datagram{};
    ASSERT_EQ(::socketpair(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0, datagram.data()), 0);
    const auto packet = [fd](std::size_t size, const std::vector<int>& descriptors) {
        std::vector<std::uint8_t> bytes(size);
        iovec piece = {bytes.data(), size};
        EXPECT_EQ(vox_link::send_pieces(fd, {&piece, 1}, descriptors).error, 0);
    };
    packet(1, {});
    packet(1, {0});
    packet(1, {datagram[0]});
    packet(1, {datagram[0], datagram[1]});
    packet(2, {datagram[0]});
    packet(1, std::vector<int>(64, 0));
    ::close(datagram[0]);
    ::close(datagram[1]);
    TestClient next(vox_connection_create_from_endpoint(endpoint));
    EXPECT_TRUE(next.works());
    EXPECT_EQ(plr::test::openDescriptors(), before + 2) << "but both ends of the new client";
}

}  // namespace
