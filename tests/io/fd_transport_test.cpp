#include <sys/stat.h>

#include <fstream>
#include <future>
#include <vector>

#include "io/open_transport.h"
#include "support/debug_records.h"
#include "support/descriptors.h"
#include "support/failing_allocations.h"
#include "support/scratch_folder.h"

namespace plr::test {
namespace {

using Got = OpenTransport::Got;
using Lines = std::vector<std::string>;

// A transport on one of two sockets.
struct FdTransport : testing::Test {
    FdTransport() { EXPECT_TRUE(PelorinTransportCreateWithFD(&transport, ends.out())); }

    Ends ends{SOCK_STREAM};
    OpenTransport transport;
    DebugRecords records;
};

TEST_F(FdTransport, SaysWhatFailed) {
    EXPECT_EQ(transport.get(4, false, 0), Got(true, ""));
    ends.put("ab");
    EXPECT_EQ(transport.get(4, true, 0), Got(false, ""));
    EXPECT_TRUE(transport.unblockRead(&transport));
    EXPECT_EQ(transport.get(4, true), Got(false, ""));
    ends.closeIn();
    EXPECT_EQ(transport.get(4), Got(true, ""));
    EXPECT_EQ(transport.get(4, true), Got(false, ""));

    OpenTransport bad;
    ASSERT_TRUE(PelorinTransportCreateWithFD(&bad, -5));
    EXPECT_FALSE(bad.isValid(&bad));
    EXPECT_EQ(bad.get(4), Got(false, ""));
    EXPECT_FALSE(bad.flushRead(&bad));
    EXPECT_FALSE(bad.put("x"));
    EXPECT_FALSE(bad.put("x", false));
    EXPECT_TRUE(PelorinTransportFreeFD(&bad));
    EXPECT_EQ(
        records.take(),
        (Lines{"PelorinTransportReadFD: read returned Connection timed out (110)\n",
               "PelorinTransportReadFD: read returned Operation canceled (125)\n",
               "PelorinTransportReadFD: read returned No data available (61)\n",
               "PelorinTransportReadFD: read returned Bad file descriptor (9)\n",
               "PelorinTransportFlushReadFD: read returned Bad file descriptor (9)\n",
               "PelorinTransportWriteFD: write to completion returned Bad file descriptor (9)\n",
               "PelorinTransportWriteFD: write returned Bad file descriptor (9)\n"}));
}

TEST_F(FdTransport, UnblockingNeverWaitsAndEndsNoFlush) {
    for (int i = 0; i < 70'000; i++)  // more than a pipe holds
        ASSERT_TRUE(transport.unblockRead(&transport));
    ends.put("old");
    EXPECT_TRUE(transport.flushRead(&transport));
    EXPECT_EQ(transport.get(4), Got(true, ""));
    char byte;
    EXPECT_EQ(::recv(ends.out(), &byte, 1, MSG_DONTWAIT), -1);
}

TEST_F(FdTransport, CyclesLeaveNoDescriptorAndTheCallersOpen) {
    const auto before = openDescriptors();
    for (int i = 0; i < 10'000; i++) {
        OpenTransport other;
        ASSERT_TRUE(PelorinTransportCreateWithFD(&other, ends.in()));
        ASSERT_TRUE(other.unblockRead(&other));
    }
    EXPECT_EQ(openDescriptors(), before);
    ends.put("still open");
}

// Descriptor 0 is left open although it is the pipe's.
TEST_F(FdTransport, DescriptorZeroStaysOpen) {
    const int standardInput = ::dup(0);
    ::close(0);
    OpenTransport other;
    ASSERT_TRUE(PelorinTransportCreateWithFD(&other, standardInput));
    EXPECT_TRUE(PelorinTransportFree(&other));
    struct stat status {};
    EXPECT_EQ(::fstat(0, &status), 0);
    EXPECT_TRUE(S_ISFIFO(status.st_mode));
    ::dup2(standardInput, 0);
    ::close(standardInput);
}

TEST_F(FdTransport, IsNotMadeWithoutDescriptorsOrMemory) {
    OpenTransport other;
    {
        const DescriptorLimit none(0);
        EXPECT_FALSE(PelorinTransportCreateWithFD(&other, 1));
    }
    EXPECT_EQ(other.free, nullptr);
    EXPECT_EQ(records.take(), Lines{"PelorinTransportCreateWithFD: Failed to create pipe FD's, err "
                                    "= Too many open files (24)\n"});
    succeedingAllocations = 0;
    EXPECT_FALSE(PelorinTransportCreateWithFD(&other, ends.in()));
    EXPECT_EQ(other.free, nullptr);
    succeedingAllocations = 0;
    EXPECT_FALSE(PelorinTransportCreateWithFile(&other, "/dev/null", nullptr));
    EXPECT_EQ(other.free, nullptr);
}

TEST(FileTransport, ReadsFromTheStartAndAppends) {
    const ScratchFolder folder;
    std::ofstream(folder.at("in")) << "recorded";
    for (const char* piece : {"one ", "two"}) {
        OpenTransport transport;
        ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, folder.at("in").c_str(),
                                                   folder.at("out").c_str()));
        EXPECT_EQ(transport.get(5), Got(true, "recor"));
        EXPECT_TRUE(transport.put(piece));
        EXPECT_TRUE(transport.flushRead(&transport));
        EXPECT_EQ(transport.get(5), Got(true, ""));
    }
    EXPECT_EQ(folder.read("out"), "one two");
    EXPECT_EQ(std::filesystem::status(folder.at("out")).permissions(),
              std::filesystem::perms(0600));
}

TEST(FileTransport, HasTheOperationsOfItsFiles) {
    OpenTransport reads, writes;
    ASSERT_TRUE(PelorinTransportCreateWithFile(&reads, "/dev/null", nullptr));
    EXPECT_TRUE(!reads.write && reads.read && reads.unblockRead && reads.flushRead);
    ASSERT_TRUE(PelorinTransportCreateWithFile(&writes, nullptr, "/dev/null"));
    EXPECT_TRUE(writes.write && !writes.read && !writes.unblockRead && !writes.flushRead);
    EXPECT_TRUE(writes.isValid(&writes));
}

// A FIFO is opened without its other end; its input begins with the first writer.
TEST(FileTransport, OfAFifoTheInputEndsWithItsLastWriter) {
    const ScratchFolder folder;
    const std::string path = folder.at("fifo");
    ASSERT_EQ(::mkfifo(path.c_str(), 0600), 0);
    OpenTransport transport;
    ASSERT_TRUE(PelorinTransportCreateWithFile(&transport, path.c_str(), nullptr));
    auto read = std::async(std::launch::async, [&] { return transport.get(8); });
    std::ofstream(path) << "hello";
    EXPECT_EQ(read.get(), Got(true, "hello"));
    EXPECT_EQ(transport.get(8), Got(true, ""));
}

TEST(FileTransport, SaysWhichFileItCannotOpenAndKeepsNone) {
    const ScratchFolder folder;
    ASSERT_EQ(::mkfifo(folder.at("fifo").c_str(), 0600), 0);
    const std::string absent = folder.at("absent/file");
    const std::string fifo = folder.at("fifo");
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
