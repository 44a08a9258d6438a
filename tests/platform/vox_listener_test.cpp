// Services by name and by endpoint: who gets a name, where, and who gets in.
#include <fcntl.h>
#include <sys/stat.h>

#include "platform/linux/vox/socket_io.h"
#include "platform/linux/vox/value_layout.h"
#include "support/vox_raw_peer.h"
#include "support/vox_service.h"

namespace {

using namespace plr::test;
namespace fs = std::filesystem;

constexpr const char* kName = "net.example.listener";

vox_connection_t listenerOf(const char* name, const vox_limits_t* limits = nullptr) {
    return vox_connection_create_listener(name, limits);
}
vox_connection_t clientOf(const char* name) {
    return vox_connection_create(name);
}

// That `made` ends at once.
void expectEnd(vox_connection_t made, vox_error_code_t code, const char* why = "") {
    Client(made).inbox.expectError(code, why);
}
void expectNobody(const char* name = kName) {
    expectEnd(clientOf(name), VOX_ERROR_CONNECTION_INTERRUPTED);
}
void expectInvalid(vox_connection_t made, const char* why = "") {
    expectEnd(made, VOX_ERROR_CONNECTION_INVALID, why);
}
void expectServed(vox_connection_t made) {
    EXPECT_TRUE(Client(made).works());
}

class VoxListener : public ::testing::Test {
  protected:
    RuntimeDirectory directory;
    const std::string path = directory.path() + "/" + kName;
    Reports reports;
};

TEST_F(VoxListener, ServesANameAndGivesItUpAtTheEnd) {
    expectNobody();
    {
        EchoService service(listenerOf(kName));
        EXPECT_EQ(fs::status(path).permissions(), fs::perms::owner_read | fs::perms::owner_write);
        Client first(clientOf(kName));
        EXPECT_TRUE(first.works());
        expectServed(clientOf(kName));
        EXPECT_STREQ(vox_connection_get_name(service.client(0)), kName);
        EXPECT_EQ(vox_connection_get_pid(service.client(0)), ::getpid());
        // It is not taken from who has it.
        expectInvalid(listenerOf(kName), "EADDRINUSE");
        expectServed(clientOf(kName));
        EXPECT_TRUE(first.works());
        EXPECT_TRUE(service.listener().inbox.all().empty());
    }
    EXPECT_FALSE(fs::exists(path));
    for (int round = 0; round < 50; ++round) {
        const Ref listener(listenerOf(kName));
        vox_connection_resume(listener);
        vox_connection_cancel(listener);  // free at once
    }
    const EchoService again(listenerOf(kName));
    expectServed(clientOf(kName));
}

TEST_F(VoxListener, ClientsWaitForAListenerThatIsSuspended) {
    EchoService service(listenerOf(kName));
    vox_connection_suspend(service.listener());
    Client client(clientOf(kName));
    EXPECT_EQ(client.send(message(1)), 0);
    vox_connection_resume(service.listener());
    EXPECT_TRUE(client.works());
    EXPECT_EQ(service.client(0).inbox.numbers(), Numbers{1});
}

TEST_F(VoxListener, ReplacesASocketThatADeadProcessLeft) {
    // Bound, as a killed service leaves it, and listening no more.
    ::close(boundSocket(SOCK_STREAM, path));
    expectNobody();
    const EchoService service(listenerOf(kName));
    expectServed(clientOf(kName));
}

void touch(const std::string& path) {
    ASSERT_EQ(::close(::open(path.c_str(), O_CREAT | O_WRONLY | O_CLOEXEC, 0600)), 0);
}

TEST_F(VoxListener, LeavesAFileAloneThatIsNotItsOwn) {
    {
        const EchoService service(listenerOf(kName));
        fs::remove(path);
        touch(path);
    }
    EXPECT_TRUE(fs::exists(path)) << "somebody else's file was removed";
    expectInvalid(listenerOf(kName), "no socket");
    EXPECT_TRUE(fs::exists(path));
}

TEST_F(VoxListener, UnusableNamesAreInvalid) {
    const std::string names[] = {"",           ".hidden", "a/b", "..",
                                 "with blank", "nul\n",   "ü",   std::string(101, 'a')};
    for (const std::string& name : names) {
        SCOPED_TRACE(name);
        expectInvalid(clientOf(name.c_str()), "no name of a service");
        expectInvalid(listenerOf(name.c_str()), "no name of a service");
    }
    const std::string longest(100, 'a');
    if (directory.path().size() + 101 < sizeof(sockaddr_un::sun_path))
        expectNobody(longest.c_str());
    else
        expectInvalid(clientOf(longest.c_str()));
}

TEST_F(VoxListener, UnsafeDirectoriesAreInvalid) {
    const std::string base = directory.path();
    for (const auto& [name, mode] :
         {std::pair("/open", 0777), {"/group", 0770}, {"/good", 0755}, {"/foreign", 0755}}) {
        fs::create_directory(base + name);
        fs::permissions(base + name, fs::perms(mode));
    }
    fs::create_directory_symlink(base + "/good", base + "/link");
    touch(base + "/file");
    const bool root = ::getuid() == 0;
    ASSERT_TRUE(!root || ::chown((base + "/foreign").c_str(), 12345, 12345) == 0);
    const struct {
        std::string directory;
        const char* why;
    } rows[] = {
        {base + "/open", "may be written to by others"},
        {base + "/group", "may be written to by others"},
        {base + "/link", "is a symbolic link"},
        {base + "/file", "is no directory"},
        {"relative", "is not an absolute path"},
        {root ? base + "/foreign" : "relative", root ? "belongs to another user" : ""},
    };
    for (const auto& row : rows) {
        SCOPED_TRACE(row.directory);
        RuntimeDirectory::use(row.directory);
        expectInvalid(listenerOf(kName), row.why);
        expectInvalid(clientOf(kName), row.why);
    }
    // A missing one is made, private; its parent is not.
    RuntimeDirectory::use(base + "/new");
    {
        const EchoService service(listenerOf(kName));
        expectServed(clientOf(kName));
        EXPECT_EQ(fs::status(base + "/new").permissions(), fs::perms::owner_all);
    }
    RuntimeDirectory::use(base + "/no/parent");
    expectInvalid(listenerOf(kName));
    expectNobody();
    RuntimeDirectory::use(base);
}

// ---- Who gets in -------------------------------------------------------------------------

TEST_F(VoxListener, AClientThatTheHandlerDoesNotKeepIsRefused) {
    End listener(listenerOf(kName));
    listener.resume([](vox_object_t event) { return vox_get_type(event) != VOX_TYPE_ERROR; });
    expectNobody();
}

TEST_F(VoxListener, DescriptorsThatCannotBeTakenEndTheConnection) {
    RawPair pair;
    pair.start();
    const std::size_t open = openDescriptors();
    {
        const DescriptorLimit limit(open + 3);
        pair.peer.send(frame({.descriptors = 10}, message(1)), std::vector<int>(10, 0));
        pair.end.inbox.expectError(VOX_ERROR_CONNECTION_INVALID, "descriptors were lost");
    }
    EXPECT_EQ(openDescriptors(), open - 1);
}

// ---- Endpoints ------------------------------------------------------------------------------

TEST_F(VoxListener, EndpointsLeadToTheirListenerAsLongAsThereIsOne) {
    Ref endpoint;
    for (const char* name : {"", kName}) {
        const bool isHidden = *name == '\0';
        EchoService service(isHidden ? vox_connection_create_anonymous_listener(nullptr)
                                     : listenerOf(name));
        endpoint = Ref(vox_endpoint_create(service.listener()));
        Client first(vox_connection_create_from_endpoint(endpoint));
        expectServed(vox_connection_create_from_endpoint(endpoint));
        EXPECT_TRUE(first.works());
        EXPECT_EQ(vox_connection_get_pid(service.client(0)), ::getpid());
    }
    expectEnd(vox_connection_create_from_endpoint(endpoint), VOX_ERROR_CONNECTION_INTERRUPTED);
    expectInvalid(vox_connection_create_from_endpoint(number(1)));
}

TEST_F(VoxListener, WhatIsNoConnectionIsRefusedByAnEndpoint) {
    EchoService hidden(vox_connection_create_anonymous_listener(nullptr));
    const Ref endpoint(vox_endpoint_create(hidden.listener()));
    Client client(vox_connection_create_from_endpoint(endpoint));
    EXPECT_TRUE(client.works());
    const std::size_t before = openDescriptors();
    const int fd = vox_values::as<vox_descriptor_object>(endpoint, VOX_TYPE_ENDPOINT)->descriptor;
    const Ends datagram(SOCK_DGRAM);
    const auto packet = [fd](std::size_t size, const std::vector<int>& descriptors) {
        Bytes bytes(size);
        iovec piece = {bytes.data(), size};
        EXPECT_EQ(vox_link::send_pieces(fd, {&piece, 1}, descriptors).error, 0);
    };
    packet(1, {});
    packet(1, {0});
    packet(1, {datagram.out()});
    packet(1, {datagram.out(), datagram.in()});
    packet(2, {datagram.out()});
    packet(1, std::vector<int>(64, 0));
    Client next(vox_connection_create_from_endpoint(endpoint));
    EXPECT_TRUE(next.works());
    EXPECT_EQ(openDescriptors(), before + 4) << "but both ends of the new client, and ours";
}

}  // namespace
