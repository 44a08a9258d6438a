#include <fcntl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <vector>

#include "io/transport_contract.h"

namespace plr::test {
namespace {

class SocketPeer : public TransportPeer {
  public:
    SocketPeer() {
        EXPECT_EQ(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends_.data()), 0);
        EXPECT_TRUE(PelorinTransportCreateWithFD(&transport, ends_[0]));
    }
    ~SocketPeer() override {
        ::close(ends_[0]);
        ::close(ends_[1]);
    }
    [[nodiscard]] int in() const override { return ends_[1]; }
    [[nodiscard]] int out() const override { return ends_[1]; }
    [[nodiscard]] int fd() const { return ends_[0]; }

  private:
    std::array<int, 2> ends_{};
};

// A folder for this test.
class Folder {
  public:
    Folder() : path_(std::filesystem::temp_directory_path() / "pelorin-io-XXXXXX") {
        path_ = ::mkdtemp(path_.data());
    }
    ~Folder() { std::filesystem::remove_all(path_); }
    Folder(const Folder&) = delete;
    Folder& operator=(const Folder&) = delete;
    [[nodiscard]] std::string operator/(const char* name) const { return path_ + "/" + name; }

  private:
    std::string path_;
};

// A transport between two FIFOs.
class FifoPeer : public TransportPeer {
  public:
    FifoPeer() : in_(open("in")), out_(open("out")) {
        EXPECT_TRUE(PelorinTransportCreateWithFile(&transport, (folder_ / "in").c_str(),
                                                   (folder_ / "out").c_str()));
    }
    ~FifoPeer() override {
        ::close(in_);
        ::close(out_);
    }
    [[nodiscard]] int in() const override { return in_; }
    [[nodiscard]] int out() const override { return out_; }

  private:
    [[nodiscard]] int open(const char* name) const {
        EXPECT_EQ(::mkfifo((folder_ / name).c_str(), 0600), 0);
        return ::open((folder_ / name).c_str(), O_RDWR | O_CLOEXEC);
    }
    Folder folder_;
    int in_;
    int out_;
};

template <class Peer>
std::unique_ptr<TransportPeer> make() {
    return std::make_unique<Peer>();
}
INSTANTIATE_TEST_SUITE_P(Io, TransportContract,
                         testing::Values(TransportCase{"FD", make<SocketPeer>},
                                         TransportCase{"file", make<FifoPeer>}),
                         testing::PrintToStringParamName());

std::ptrdiff_t openDescriptors() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
}

std::string contents(const std::string& path) {
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    return text.str();
}

TEST(FdTransport, SaysWhatFailed) {
    SocketPeer peer;
    DebugRecords records;
    char byte = 0;
    std::uint32_t count = 99;
    EXPECT_EQ(readFrom(peer.transport, 4, false, 0), (TransportRead{true, ""}));
    peer.send("ab");
    EXPECT_EQ(readFrom(peer.transport, 4, true, 0), (TransportRead{false, ""}));
    EXPECT_TRUE(peer.transport.unblockRead(&peer.transport));
    EXPECT_EQ(readFrom(peer.transport, 4, true), (TransportRead{false, ""}));
    ASSERT_EQ(::shutdown(peer.in(), SHUT_WR), 0);
    EXPECT_EQ(readFrom(peer.transport, 4), (TransportRead{true, ""}));
    EXPECT_EQ(readFrom(peer.transport, 4, true), (TransportRead{false, ""}));

    PelorinTransport bad;
    ASSERT_TRUE(PelorinTransportCreateWithFD(&bad, -5));
    EXPECT_FALSE(bad.isValid(&bad));
    EXPECT_EQ(readFrom(bad, 4), (TransportRead{false, ""}));
    EXPECT_FALSE(bad.flushRead(&bad));
    EXPECT_FALSE(bad.write(&bad, &byte, 1, &count, true, 0, nullptr));
    EXPECT_FALSE(bad.write(&bad, &byte, 1, &count, false, 0, nullptr));
    EXPECT_EQ(count, 0u);
    EXPECT_TRUE(PelorinTransportFreeFD(&bad));
    EXPECT_TRUE(PelorinTransportFree(&bad));
    EXPECT_EQ(records.take(),
              (std::vector<std::string>{
                  "PelorinTransportReadFD: read returned Connection timed out (110)\n",
                  "PelorinTransportReadFD: read returned Operation canceled (125)\n",
                  "PelorinTransportReadFD: read returned No data available (61)\n",
                  "PelorinTransportReadFD: read returned Bad file descriptor (9)\n",
                  "PelorinTransportFlushReadFD: read returned Bad file descriptor (9)\n",
                  "PelorinTransportWriteFD: write to completion returned Bad file descriptor (9)\n",
                  "PelorinTransportWriteFD: write returned Bad file descriptor (9)\n"}));
}

TEST(FdTransport, UnblockingNeverWaitsAndEndsNoFlush) {
    SocketPeer peer;
    for (int i = 0; i < 70'000; i++)  // more than a pipe holds
        ASSERT_TRUE(peer.transport.unblockRead(&peer.transport));
    peer.send("old");
    EXPECT_TRUE(peer.transport.flushRead(&peer.transport));
    EXPECT_EQ(readFrom(peer.transport, 4), (TransportRead{true, ""}));
    char byte;
    EXPECT_EQ(::recv(peer.fd(), &byte, 1, MSG_DONTWAIT), -1);
}

TEST(FdTransport, CyclesLeaveNoDescriptorAndTheCallersOpen) {
    SocketPeer peer;
    const auto before = openDescriptors();
    for (int i = 0; i < 10'000; i++) {
        PelorinTransport transport;
        ASSERT_TRUE(PelorinTransportCreateWithFD(&transport, peer.in()));
        ASSERT_TRUE(transport.unblockRead(&transport));
        ASSERT_TRUE(PelorinTransportFree(&transport));
    }
    EXPECT_EQ(openDescriptors(), before);
    peer.send("still open");
}

// Descriptor 0 is left open although it is the pipe's.
TEST(FdTransport, DescriptorZeroStaysOpen) {
    const int standardInput = ::dup(0);
    PelorinTransport transport;
    ::close(0);
    ASSERT_TRUE(PelorinTransportCreateWithFD(&transport, standardInput));
    EXPECT_TRUE(PelorinTransportFree(&transport));
    struct stat status {};
    EXPECT_EQ(::fstat(0, &status), 0);
    EXPECT_TRUE(S_ISFIFO(status.st_mode));
    ::dup2(standardInput, 0);
    ::close(standardInput);
}

TEST(FdTransport, IsNotMadeWithoutDescriptors) {
    DebugRecords records;
    rlimit before{};
    ::getrlimit(RLIMIT_NOFILE, &before);
    const rlimit none{0, before.rlim_max};
    PelorinTransport transport;
    ::setrlimit(RLIMIT_NOFILE, &none);
    const bool made = PelorinTransportCreateWithFD(&transport, 1);
    ::setrlimit(RLIMIT_NOFILE, &before);
    EXPECT_FALSE(made);
    EXPECT_EQ(transport.free, nullptr);
    EXPECT_EQ(records.take(), std::vector<std::string>{
                                  "PelorinTransportCreateWithFD: Failed to create pipe FD's, err "
                                  "= Too many open files (24)\n"});
}

TEST(FileTransport, ReadsFromTheStartAndAppends) {
    const Folder folder;
    std::ofstream(folder / "in") << "recorded";
    PelorinTransport transport;
    std::uint32_t count = 0;
    for (const char* piece : {"one ", "two"}) {
        ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, (folder / "in").c_str(),
                                                   (folder / "out").c_str()));
        EXPECT_EQ(readFrom(transport, 5).text, "recor");
        EXPECT_TRUE(transport.write(&transport, piece, static_cast<std::uint32_t>(strlen(piece)),
                                    &count, true, 0, nullptr));
        EXPECT_TRUE(transport.flushRead(&transport));
        EXPECT_EQ(readFrom(transport, 5), (TransportRead{true, ""}));
        EXPECT_TRUE(PelorinTransportFree(&transport));
    }
    EXPECT_EQ(contents(folder / "out"), "one two");
    struct stat status {};
    ASSERT_EQ(::stat((folder / "out").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 0777, 0600u);
}

TEST(FileTransport, HasTheOperationsOfItsFiles) {
    PelorinTransport transport;
    ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, "/dev/null", nullptr));
    EXPECT_TRUE(!transport.write && transport.read && transport.unblockRead && transport.flushRead);
    PelorinTransportFree(&transport);
    ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, nullptr, "/dev/null"));
    EXPECT_TRUE(transport.write && !transport.read && !transport.unblockRead &&
                !transport.flushRead);
    EXPECT_TRUE(transport.isValid(&transport));
    PelorinTransportFree(&transport);
}

// A FIFO is opened without its other end; its input begins with the first writer.
TEST(FileTransport, OfAFifoTheInputEndsWithItsLastWriter) {
    const Folder folder;
    const std::string path = folder / "fifo";
    ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    PelorinTransport transport;
    ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, path.c_str(), nullptr));
    auto read = std::async(std::launch::async, [&] { return readFrom(transport, 8); });
    std::ofstream(path) << "hello";
    EXPECT_EQ(read.get(), (TransportRead{true, "hello"}));
    EXPECT_EQ(readFrom(transport, 8), (TransportRead{true, ""}));
    PelorinTransportFree(&transport);
}

TEST(FileTransport, SaysWhichFileItCannotOpenAndKeepsNone) {
    const Folder folder;
    ASSERT_EQ(::mkfifo((folder / "fifo").c_str(), 0600), 0);
    const std::string absent = folder / "absent" + "/file";
    const std::string fifo = folder / "fifo";
    const std::string begin = "PelorinTransportCreateWithFile: ";
    const std::string noFile = ", err = No such file or directory (2)\n";
    struct {
        const char *input, *output;
        std::string print;
    } const rows[] = {
        {nullptr, nullptr, "No path given\n"},
        {absent.c_str(), "/dev/null", "Failed to open " + absent + noFile},
        {"/dev/null", absent.c_str(), "Failed to open " + absent + noFile},
        {nullptr, fifo.c_str(),
         "Failed to open " + fifo + ", err = No such device or address (6)\n"},
    };
    DebugRecords records;
    const auto before = openDescriptors();
    for (const auto& row : rows) {
        PelorinTransport transport;
        EXPECT_FALSE(PelorinTransportCreateWithFile(&transport, row.input, row.output));
        EXPECT_EQ(transport.free, nullptr);
        EXPECT_EQ(records.take(), std::vector{begin + row.print});
    }
    EXPECT_EQ(openDescriptors(), before);
}

}  // namespace
}  // namespace plr::test
