// What clients, retained topics and subscriptions take of the mosquitto broker's
// memory: growth of what it has resident.

#include <unistd.h>

#include <fstream>
#include <string>
#include <vector>

#include "bench/fanout_sockets.h"
#include "bench/mqtt.h"
#include "bench/rest_memory_cases.h"

namespace {

using namespace bench::rest_memory_cases;

double residentBytes(pid_t process) {
    std::ifstream file("/proc/" + std::to_string(process) + "/statm");
    double total = 0;
    double resident = 0;
    file >> total >> resident;
    return resident * static_cast<double>(::sysconf(_SC_PAGESIZE));
}

}  // namespace

int main() {
    bench::allowOpenFiles(8'192);
    const bench::mqtt::Broker broker;
    std::vector<int> clients;
    const auto measure = [&](const char* key, std::uint64_t count, const auto& make) {
        const double before = residentBytes(broker.pid());
        make();
        for (const int client : clients)
            bench::mqtt::ping(client);
        bench::result(key, (residentBytes(broker.pid()) - before) / static_cast<double>(count));
    };
    measure("client_bytes", kClients, [&] {
        for (std::uint64_t i = 0; i < kClients; ++i)
            clients.push_back(broker.connectClient("client" + std::to_string(i)));
    });
    measure("property_bytes", kNames, [&] {
        for (std::uint64_t i = 0; i < kNames; ++i) {
            const std::string packet = bench::mqtt::publishPacket("/kept/" + name(i), kValue);
            bench::fanout_sockets::sendAll(clients.front(), packet.data(), packet.size());
        }
    });
    // Other topics, of which nothing is retained that would be sent at once.
    measure("watcher_bytes", kClients * kWatched, [&] {
        for (const int client : clients)
            for (std::uint64_t i = 0; i < kWatched; ++i)
                bench::mqtt::subscribe(client, "/watched/" + name(i));
    });
}
