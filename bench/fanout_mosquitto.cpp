// The mosquitto broker, started here on a Unix socket of its own, with clients
// that speak MQTT 3.1.1 (OASIS standard, 2014) by hand: QoS 0, one topic whose
// value is retained, as our properties keep theirs; each watcher a connection of its
// own. Packets here are shorter than 128 bytes, so that their length is one byte.

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <fstream>
#include <string>
#include <vector>

#include "bench/fanout_sockets.h"

namespace {

using bench::check;
using bench::fanout_sockets::receiveAll;
using bench::fanout_sockets::sendAll;

// A string with its length in two bytes, high one first.
std::string text(std::string_view content) {
    return std::string{static_cast<char>(content.size() >> 8), static_cast<char>(content.size())}
        .append(content);
}

std::string packet(unsigned char type, const std::string& body) {
    return std::string{static_cast<char>(type), static_cast<char>(body.size())} + body;
}

// QoS 0, retained; as long as what the watchers get, which lacks that bit.
std::string publishPacket() {
    return packet(0x31, text(bench::fanout_cases::kPath).append(bench::fanout_cases::kValue));
}

// Null when nobody listens yet.
int tryConnect(const std::string& path) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    path.copy(address.sun_path, sizeof address.sun_path - 1);
    const int fd = check(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0), "socket");
    if (::connect(fd, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0)
        return fd;
    ::close(fd);
    return -1;
}

void expect(int fd, const std::string& answer) {
    std::string got(answer.size(), '\0');
    receiveAll(fd, got.data(), got.size());
    if (got != answer)
        bench::fail("the broker answered something else");
}

int connectClient(const std::string& path, const std::string& name) {
    const int fd = check(tryConnect(path), "connecting to the broker");
    // Version 4, clean session, no keep-alive.
    const std::string connect =
        packet(0x10, text("MQTT") + std::string("\x04\x02\x00\x00", 4) + text(name));
    sendAll(fd, connect.data(), connect.size());
    expect(fd, std::string("\x20\x02\x00\x00", 4));
    return fd;
}

int connectWatcher(const std::string& path, std::size_t number) {
    const int fd = connectClient(path, "watcher" + std::to_string(number));
    const std::string subscribe =
        packet(0x82, std::string("\x00\x01", 2) + text(bench::fanout_cases::kPath) + '\0');
    sendAll(fd, subscribe.data(), subscribe.size());
    expect(fd, std::string("\x90\x03\x00\x01\x00", 5));
    return fd;
}

[[noreturn]] void watch(const std::string& path, std::size_t count,
                        bench::fanout_cases::Board& board) {
    std::vector<int> sockets;
    for (std::size_t i = 0; i < count; ++i) {
        sockets.push_back(connectWatcher(path, i));
        board.attach(count);
    }
    bench::fanout_sockets::watch(sockets, publishPacket().size(), board);
}

std::string configure(const std::string& folder) {
    const std::string file = folder + "/mosquitto.conf";
    std::ofstream(file) << "listener 0 " << folder << "/socket\n"
                        << "allow_anonymous true\n"
                           "persistence false\n"
                           "max_queued_messages 0\n"
                           "log_type error\n"
                           "user root\n";  // or its socket could not be made here
    return file;
}

// The broker shows no other sign that it is ready than its socket.
void awaitBroker(const std::string& path) {
    for (int tries = 0; tries < 1'000; ++tries) {
        const int fd = tryConnect(path);
        if (fd >= 0) {
            ::close(fd);
            return;
        }
        ::usleep(10'000);
    }
    bench::fail("mosquitto did not start");
}

}  // namespace

int main(int argc, char** argv) {
    const auto measured = bench::fanout_cases::parse(argc, argv);
    auto& board = bench::makeShared<bench::fanout_cases::Board>();
    const bench::TemporaryFolder folder;
    const std::string path = folder.path() + "/socket";
    // Also where a shell of an ordinary user does not look for it.
    ::setenv("PATH", (std::string(::getenv("PATH")) + ":/usr/sbin").c_str(), 1);
    const bench::Child broker({"mosquitto", "-c", configure(folder.path())},
                              folder.path() + "/log");
    awaitBroker(path);
    const bench::Child watching([&] { watch(path, measured.watchers, board); });
    const int setter = connectClient(path, "setter");
    board.waitForWatchers();
    const std::string publish = publishPacket();
    bench::fanout_cases::measure(measured, board,
                                 [&] { sendAll(setter, publish.data(), publish.size()); });
}
