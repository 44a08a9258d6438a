// D-Bus: dbus-daemon, started here on a Unix socket of its own, and sd-bus on all
// sides. The service's property is set by org.freedesktop.DBus.Properties.Set
// without a reply, and the service emits PropertiesChanged with the value; each
// watcher is a connection of its own with one match rule, and reads the value.
// The service does by hand what sd-bus would find in its tables, which is faster.

#include <sys/epoll.h>
#include <unistd.h>

#include <array>
#include <fstream>
#include <string>
#include <vector>

#include "bench/fanout_cases.h"
#include "bench/support/sdbus.h"

namespace {

using bench::check;
using bench::fanout_cases::Board;
using bench::sdbus::succeed;

constexpr const char* kService = "net.example.bench";
constexpr const char* kObject = "/radio";
constexpr const char* kInterface = "net.example.Radio";
constexpr const char* kProperty = "Signal";
constexpr const char* kProperties = "org.freedesktop.DBus.Properties";
const std::string kValue(bench::fanout_cases::kValue);

// No limit is met: a thousand clients, and what waits for them.
std::string configure(const std::string& folder) {
    const std::string file = folder + "/bus.conf";
    std::ofstream stream(file);
    stream << "<busconfig><type>session</type><listen>unix:path=" << folder
           << "/socket</listen><auth>EXTERNAL</auth><policy context=\"default\">"
              "<allow send_destination=\"*\" eavesdrop=\"true\"/><allow eavesdrop=\"true\"/>"
              "<allow own=\"*\"/></policy>";
    for (const char* limit :
         {"max_incoming_bytes", "max_outgoing_bytes", "max_completed_connections",
          "max_incomplete_connections", "max_connections_per_user"})
        stream << "<limit name=\"" << limit << "\">1000000000</limit>";
    stream << "</busconfig>\n";
    return file;
}

// Null when nobody listens yet.
sd_bus* tryConnect(const std::string& path) {
    sd_bus* bus = nullptr;
    succeed(::sd_bus_new(&bus), "sd_bus_new");
    succeed(::sd_bus_set_address(bus, ("unix:path=" + path).c_str()), "sd_bus_set_address");
    succeed(::sd_bus_set_bus_client(bus, 1), "sd_bus_set_bus_client");
    if (::sd_bus_start(bus) >= 0)
        return bus;
    ::sd_bus_unref(bus);
    return nullptr;
}

sd_bus* connectClient(const std::string& path) {
    for (int tries = 0; tries < 1'000; ++tries) {
        if (sd_bus* const bus = tryConnect(path))
            return bus;
        ::usleep(10'000);
    }
    bench::fail("dbus-daemon did not start");
}

void announce(sd_bus* bus, const char* value) {
    sd_bus_message* signal = nullptr;
    succeed(::sd_bus_message_new_signal(bus, &signal, kObject, kProperties, "PropertiesChanged"),
            "sd_bus_message_new_signal");
    succeed(::sd_bus_message_append(signal, "sa{sv}as", kInterface, 1, kProperty, "s", value, 0),
            "sd_bus_message_append");
    succeed(::sd_bus_send(bus, signal, nullptr), "sd_bus_send");
    ::sd_bus_message_unref(signal);
}

int handleCall(sd_bus_message* message, void* context, sd_bus_error*) {
    if (!::sd_bus_message_is_method_call(message, kProperties, "Set"))
        return 0;
    auto& kept = *static_cast<std::string*>(context);
    const char* interface = nullptr;
    const char* property = nullptr;
    const char* value = nullptr;
    succeed(::sd_bus_message_read(message, "ssv", &interface, &property, "s", &value),
            "reading a Set");
    kept = value;
    announce(::sd_bus_message_get_bus(message), kept.c_str());
    return 1;
}

void serve(const std::string& path, bench::Event& listening) {
    sd_bus* const bus = connectClient(path);
    std::string kept;
    succeed(::sd_bus_add_filter(bus, nullptr, handleCall, &kept), "sd_bus_add_filter");
    succeed(::sd_bus_request_name(bus, kService, 0), "sd_bus_request_name");
    listening.signal();
    bench::sdbus::serve(bus);
}

int handleSignal(sd_bus_message* message, void* context, sd_bus_error*) {
    const char* interface = nullptr;
    const char* property = nullptr;
    const char* value = nullptr;
    succeed(::sd_bus_message_read(message, "sa{sv}", &interface, 1, &property, "s", &value),
            "reading PropertiesChanged");
    if (value != kValue)
        bench::fail("another value arrived");
    static_cast<Board*>(context)->deliver();
    return 1;
}

[[noreturn]] void watch(const std::string& path, std::size_t count, Board& board) {
    const int epoll = check(::epoll_create1(EPOLL_CLOEXEC), "epoll_create1");
    for (std::size_t i = 0; i < count; ++i) {
        sd_bus* const bus = connectClient(path);
        succeed(::sd_bus_match_signal(bus, nullptr, kService, kObject, kProperties,
                                      "PropertiesChanged", handleSignal, &board),
                "sd_bus_match_signal");
        epoll_event event{};
        event.events = EPOLLIN;
        event.data.ptr = bus;
        check(::epoll_ctl(epoll, EPOLL_CTL_ADD, ::sd_bus_get_fd(bus), &event), "epoll_ctl");
        board.attach(count);
    }
    std::array<epoll_event, 256> events{};
    for (;;) {
        const int ready = ::epoll_wait(epoll, events.data(), static_cast<int>(events.size()), -1);
        for (int n = 0; n < ready; ++n) {
            auto* const bus = static_cast<sd_bus*>(events[static_cast<std::size_t>(n)].data.ptr);
            while (succeed(::sd_bus_process(bus, nullptr), "sd_bus_process") > 0) {
            }
        }
    }
}

void set(sd_bus* bus) {
    sd_bus_message* call = nullptr;
    succeed(::sd_bus_message_new_method_call(bus, &call, kService, kObject, kProperties, "Set"),
            "sd_bus_message_new_method_call");
    succeed(::sd_bus_message_append(call, "ssv", kInterface, kProperty, "s", kValue.c_str()),
            "sd_bus_message_append");
    succeed(::sd_bus_message_set_expect_reply(call, 0), "sd_bus_message_set_expect_reply");
    succeed(::sd_bus_send(bus, call, nullptr), "sd_bus_send");
    ::sd_bus_message_unref(call);
    succeed(::sd_bus_flush(bus), "sd_bus_flush");
}

}  // namespace

int main(int argc, char** argv) {
    auto measured = bench::fanout_cases::parse(argc, argv);
    measured.share = 5;
    auto& board = bench::makeShared<Board>();
    auto& listening = bench::makeShared<bench::Event>();
    const bench::TemporaryFolder folder;
    const std::string path = folder.path() + "/socket";
    const bench::Child daemon({"dbus-daemon", "--nofork", "--nopidfile", "--nosyslog",
                               "--config-file=" + configure(folder.path())},
                              folder.path() + "/log");
    const bench::Child service([&] { serve(path, listening); });
    listening.wait();
    const bench::Child watching([&] { watch(path, measured.watchers, board); });
    board.waitForWatchers();
    sd_bus* const setter = connectClient(path);
    bench::fanout_cases::measure(measured, board, [&] { set(setter); });
}
