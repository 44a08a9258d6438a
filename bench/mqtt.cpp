#include "bench/mqtt.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstdlib>
#include <fstream>

#include "bench/fanout_sockets.h"

namespace bench::mqtt {
namespace {

// A string with its length in two bytes, high one first.
std::string text(std::string_view content) {
    return std::string{static_cast<char>(content.size() >> 8), static_cast<char>(content.size())}
        .append(content);
}

std::string packet(unsigned char type, const std::string& body) {
    return std::string{static_cast<char>(type), static_cast<char>(body.size())} + body;
}

// Sends a packet and takes its answer.
void exchange(int fd, const std::string& sent, const std::string& answer) {
    fanout_sockets::sendAll(fd, sent.data(), sent.size());
    std::string got(answer.size(), '\0');
    fanout_sockets::receiveAll(fd, got.data(), got.size());
    if (got != answer)
        fail("the broker answered something else");
}

// Negative when nobody listens yet.
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

std::vector<std::string> command(const std::string& folder) {
    // Also where a shell of an ordinary user does not look for it.
    ::setenv("PATH", (std::string(::getenv("PATH")) + ":/usr/sbin").c_str(), 1);
    const std::string file = folder + "/mosquitto.conf";
    std::ofstream(file) << "listener 0 " << folder << "/socket\n"
                        << "allow_anonymous true\n"
                           "persistence false\n"
                           "max_queued_messages 0\n"
                           "log_type error\n"
                           "user root\n";  // or its socket could not be made here
    return {"mosquitto", "-c", file};
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
    fail("mosquitto did not start");
}

}  // namespace

Broker::Broker()
    : socket_(folder_.path() + "/socket"),
      process_(command(folder_.path()), folder_.path() + "/log") {
    awaitBroker(socket_);
}

int Broker::connectClient(const std::string& name) const {
    const int fd = check(tryConnect(socket_), "connecting to the broker");
    // Version 4, clean session, no keep-alive.
    exchange(fd, packet(0x10, text("MQTT") + std::string("\x04\x02\x00\x00", 4) + text(name)),
             std::string("\x20\x02\x00\x00", 4));
    return fd;
}

std::string publishPacket(std::string_view topic, std::string_view value) {
    return packet(0x31, text(topic).append(value));
}

void subscribe(int client, std::string_view topic) {
    exchange(client, packet(0x82, std::string("\x00\x01", 2) + text(topic) + '\0'),
             std::string("\x90\x03\x00\x01\x00", 5));
}

void ping(int client) {
    exchange(client, packet(0xC0, ""), std::string("\xD0\x00", 2));
}

}  // namespace bench::mqtt
