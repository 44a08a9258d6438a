// What clients, properties, assertions and their watchers take of the service's
// memory: growth of its heap by many of each, divided by their number. The clients
// are another process, each with a connection of its own.

#include <malloc.h>

#include <cstdlib>
#include <memory>
#include <semaphore>
#include <string>
#include <vector>

#include "bench/rest_memory_cases.h"
#include "bench/support/event.h"
#include "bench/support/process.h"
#include "dispatch/dispatch.h"
#include "plr/ipc.h"
#include "plr/rest.h"

namespace {

using namespace bench::rest_memory_cases;
using plr::rest::Operation;

constexpr const char* kService = "net.example.bench";

// The clients do one thing at a time; in shared memory.
class Turns {
  public:
    // Clients: wait for the next turn; it is done.
    void begin() { began_.wait(); }
    void finish() { finished_.signal(); }
    // Service: has one turn done.
    void take() {
        began_.signal();
        finished_.wait();
    }

  private:
    bench::Event began_;
    bench::Event finished_;
};

class Client {
  public:
    Client(const dispatch::queue& queue, const std::string& name)
        : queue_(queue), name_(vox::string(std::string_view(name))) {
        connection_.set_event_handler([](const vox::object&) {});
        connection_.set_target_queue(queue_);
        connection_.resume();
        send(Operation::kPush, "/connections");
        // Once around, for what a connection makes at its first messages.
        send(Operation::kPush, "/kept/first");
        send(Operation::kPop, "/kept/first");
    }

    void send(Operation operation, const std::string& path, const vox::object& value = {}) const {
        connection_.send_message(message(operation, path, value));
    }
    // Everything sent before has been handled.
    void await() const {
        std::binary_semaphore answered(0);
        connection_.send_message_with_reply(
            message(Operation::kGet, "/connections", {}), queue_,
            dispatch::block<void(vox::object)>(
                [&answered](const vox::object&) { answered.release(); }));
        answered.acquire();
    }

  private:
    [[nodiscard]] vox::dict message(Operation operation, const std::string& path,
                                    const vox::object& value) const {
        return plr::rest::createRestMessage(plr::rest::asObject(operation), name_,
                                            vox::string(std::string_view(path)), value);
    }

    const dispatch::queue queue_;
    const vox::object name_;
    const vox::connection connection_ = vox::connection::create(kService);
};

// All clients PUSH the first paths of `folder`, which the first client has made.
void pushAll(const std::vector<Client>& clients, const std::string& folder) {
    for (const Client& client : clients)
        for (std::uint64_t i = 0; i < kWatched; ++i)
            client.send(Operation::kPush, folder + name(i));
}

[[noreturn]] void actAsClients(Turns& turns) {
    const auto queue = dispatch::queue::create("bench.clients");
    std::vector<Client> clients;
    const auto finish = [&] {
        for (const Client& client : clients)
            client.await();
        turns.finish();
    };
    const vox::object value = vox::string(kValue);
    turns.begin();
    for (std::uint64_t i = 0; i < kClients; ++i)
        clients.emplace_back(queue, "client" + std::to_string(i));
    finish();
    turns.begin();
    for (std::uint64_t i = 0; i < kNames; ++i)
        clients.front().send(Operation::kSet, "/kept/" + name(i), value);
    finish();
    turns.begin();
    pushAll(clients, "/kept/");
    finish();
    turns.begin();
    for (std::uint64_t i = 0; i < kNames; ++i)
        clients.front().send(Operation::kPush, "/held/" + name(i));
    finish();
    turns.begin();
    pushAll(clients, "/held/");
    finish();
    for (;;)
        turns.begin();
}

double heapBytes() {
    const struct mallinfo2 info = ::mallinfo2();
    return static_cast<double>(info.uordblks + info.hblkhd);
}

}  // namespace

int main() {
    bench::allowOpenFiles(8'192);
    auto& turns = bench::makeShared<Turns>();
    const bench::TemporaryFolder folder;
    ::setenv("VOX_RUNTIME_DIR", folder.path().c_str(), 1);
    const bench::Child clients([&] { actAsClients(turns); });
    const auto queue = dispatch::queue::create("bench.service");
    const auto server = plr::rest::RestServerExample::create(queue, kService);
    server->registerResource("/connections", std::make_shared<plr::rest::ConnectionRestResource>());
    server->registerResource("/kept", std::make_shared<plr::rest::PropertyRestResource>(true));
    server->registerResource("/held", std::make_shared<plr::rest::AssertionRestResource>());
    server->connect(vox::listener::create(kService));
    const auto measure = [&](const char* key, std::uint64_t count) {
        const double before = heapBytes();
        turns.take();
        queue.sync([] {});
        bench::result(key, (heapBytes() - before) / static_cast<double>(count));
    };
    measure("client_bytes", kClients);
    measure("property_bytes", kNames);
    measure("watcher_bytes", kClients * kWatched);
    measure("assertion_bytes", kNames);
    measure("holder_bytes", kClients * kWatched);
}
