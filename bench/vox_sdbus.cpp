// sd-bus from peer to peer over a pair of sockets, without a broker: method
// calls with four strings (the last one an array of 64 KiB in the large case),
// which the receiver reads; one way, calls that ask for no reply.

#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <cstddef>
#include <string>
#include <vector>

#include "bench/support/sdbus.h"
#include "bench/vox_cases.h"

namespace {

using bench::sdbus::succeed;
using bench::vox_cases::Case;
using bench::vox_cases::kEntries;

constexpr const char* kPath = "/bench";
constexpr const char* kInterface = "net.example.Bench";
constexpr std::uint64_t kFlushEvery = 1'024;  // messages; its queue is bounded

sd_bus* start(int fd, bool server) {
    sd_bus* bus = nullptr;
    succeed(::sd_bus_new(&bus), "sd_bus_new");
    succeed(::sd_bus_set_fd(bus, fd, fd), "sd_bus_set_fd");
    if (server)
        succeed(::sd_bus_set_server(bus, 1, sd_id128_t{}), "sd_bus_set_server");
    succeed(::sd_bus_set_anonymous(bus, 1), "sd_bus_set_anonymous");
    succeed(::sd_bus_start(bus), "sd_bus_start");
    return bus;
}

void fill(sd_bus_message* message, const void* data) {
    succeed(::sd_bus_message_append(message, "sss", kEntries[0].second, kEntries[1].second,
                                    kEntries[2].second),
            "sd_bus_message_append");
    if (data)
        succeed(::sd_bus_message_append_array(message, 'y', data, bench::vox_cases::kLargeBytes),
                "sd_bus_message_append_array");
    else
        succeed(::sd_bus_message_append_basic(message, 's', kEntries[3].second),
                "sd_bus_message_append_basic");
}

// The data of a large message, null for a small one. Fails on other content.
const void* read(sd_bus_message* message, bool large) {
    std::array<const char*, 3> texts{};
    succeed(::sd_bus_message_read(message, "sss", &texts[0], &texts[1], &texts[2]),
            "sd_bus_message_read");
    const void* data = nullptr;
    std::size_t length = 0;
    if (large)
        succeed(::sd_bus_message_read_array(message, 'y', &data, &length),
                "sd_bus_message_read_array");
    else
        succeed(::sd_bus_message_read_basic(message, 's', &texts[0]), "sd_bus_message_read_basic");
    return data;
}

struct Server {
    const Case& measured;
    std::uint64_t received = 0;
};

int handleMessage(sd_bus_message* message, void* context, sd_bus_error*) {
    auto& server = *static_cast<Server*>(context);
    const bool large = server.measured.large;
    if (!::sd_bus_message_is_method_call(message, kInterface, nullptr))
        return 0;
    const void* data = read(message, large);
    ++server.received;
    if (!::sd_bus_message_get_expect_reply(message))
        return 1;
    if (!server.measured.roundTrip && server.received <= server.measured.messages())
        bench::fail("messages were lost");
    sd_bus_message* reply = nullptr;
    succeed(::sd_bus_message_new_method_return(message, &reply), "new_method_return");
    fill(reply, data);
    succeed(::sd_bus_send(nullptr, reply, nullptr), "sd_bus_send");
    ::sd_bus_message_unref(reply);
    return 1;
}

void serve(const Case& measured, int fd) {
    Server server{measured};
    sd_bus* bus = start(fd, true);
    succeed(::sd_bus_add_filter(bus, nullptr, handleMessage, &server), "sd_bus_add_filter");
    bench::sdbus::serve(bus);
}

sd_bus_message* makeCall(sd_bus* bus, const void* data) {
    sd_bus_message* call = nullptr;
    succeed(::sd_bus_message_new_method_call(bus, &call, nullptr, kPath, kInterface, "Set"),
            "sd_bus_message_new_method_call");
    fill(call, data);
    return call;
}

void roundTrip(sd_bus* bus, const void* data) {
    sd_bus_message* call = makeCall(bus, data);
    sd_bus_message* reply = nullptr;
    succeed(::sd_bus_call(bus, call, 0, nullptr, &reply), "sd_bus_call");
    read(reply, data != nullptr);
    ::sd_bus_message_unref(reply);
    ::sd_bus_message_unref(call);
}

}  // namespace

int main(int argc, char** argv) {
    const Case measured = bench::vox_cases::parse(argc, argv);
    std::array<int, 2> pair{};
    bench::check(::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, pair.data()),
                 "socketpair");
    const bench::Child server([&] {
        ::close(pair[0]);
        measured.place(true);
        serve(measured, pair[1]);
    });
    ::close(pair[1]);
    measured.place(false);
    sd_bus* bus = start(pair[0], false);
    const std::vector<char> bytes(bench::vox_cases::kLargeBytes);
    const void* data = measured.large ? bytes.data() : nullptr;
    if (measured.roundTrip) {
        bench::vox_cases::measureRoundTrips(measured, [&] { roundTrip(bus, data); });
        return 0;
    }
    std::uint64_t unflushed = 0;
    bench::vox_cases::measureOneWay(
        measured,
        [&] {
            sd_bus_message* call = makeCall(bus, data);
            succeed(::sd_bus_message_set_expect_reply(call, 0), "sd_bus_message_set_expect_reply");
            succeed(::sd_bus_send(bus, call, nullptr), "sd_bus_send");
            ::sd_bus_message_unref(call);
            if (++unflushed % kFlushEvery == 0)
                succeed(::sd_bus_flush(bus), "sd_bus_flush");
        },
        [&] { roundTrip(bus, data); });
}
