// Our messages, through the C functions, between a named listener and a client:
// the receiver reads all four values; an echo carries them back. One way, the
// sender waits for a barrier now and then, so that what the connection queues
// stays far below its limit.

#include <atomic>
#include <cstdlib>
#include <vector>

#include "bench/support/event.h"
#include "bench/vox_cases.h"
#include "dispatch/dispatch.h"
#include "vox/vox.h"

namespace {

using bench::vox_cases::Case;
using bench::vox_cases::kEntries;
using Handler = dispatch::block<void(vox_object_t)>;

constexpr const char* kService = "net.example.bench";

void failOnError(vox_object_t event) {
    if (vox_get_type(event) == VOX_TYPE_ERROR)
        bench::fail(
            vox_string_get_string_ptr(vox_error_get_value(event, vox_error_key_description)));
}

// The values that `message` carries, lent, in kEntries' order. Fails on other
// content.
std::array<vox_object_t, 4> read(vox_object_t message, bool large) {
    std::array<vox_object_t, 4> values{};
    for (std::size_t i = 0; i < values.size(); ++i)
        values[i] = vox_dictionary_get_value(message, kEntries[i].first);
    const bool whole = large ? vox_data_get_length(values[3]) == bench::vox_cases::kLargeBytes
                             : vox_string_get_length(values[3]) == 32;
    if (!whole || vox_string_get_length(values[2]) == 0)
        bench::fail("a message came with other content");
    return values;
}

// A new message; `data` null for a small one.
vox_object_t makeMessage(const std::vector<char>* data) {
    vox_object_t message = vox_dictionary_create();
    for (std::size_t i = 0; i < kEntries.size(); ++i) {
        const bool isData = i == 3 && data;
        vox_object_t value = isData ? vox_data_create(data->data(), data->size())
                                    : vox_string_create(kEntries[i].second);
        vox_dictionary_set_value(message, kEntries[i].first, value);
        vox_release(value);
    }
    return message;
}

class Server {
  public:
    explicit Server(const Case& measured)
        : measured_(measured),
          queue_(dispatch::queue::create("bench.server")),
          listener_(vox_connection_create_listener(kService, nullptr)) {
        const Handler handler([this](vox_object_t event) { accept(event); });
        vox_connection_set_event_handler(listener_, &handler);
        vox_connection_set_target_queue(listener_, &queue_);
    }
    // The socket exists once this returns.
    void start() { vox_connection_resume(listener_); }

  private:
    void accept(vox_object_t event) {
        failOnError(event);
        const Handler handler([this](vox_object_t message) { receive(message); });
        vox_connection_set_event_handler(event, &handler);
        vox_connection_set_target_queue(event, &queue_);
        vox_connection_resume(event);
        client_ = vox_retain(event);  // without a holder it would be cancelled
    }

    void receive(vox_object_t message) {
        if (vox_get_type(message) == VOX_TYPE_ERROR)
            return;
        const auto values = read(message, measured_.large);
        ++received_;
        if (!measured_.roundTrip && received_ <= measured_.messages())
            return;
        vox_object_t reply = vox_dictionary_create_reply(message);
        for (std::size_t i = 0; i < values.size(); ++i)
            vox_dictionary_set_value(reply, kEntries[i].first, values[i]);
        if (vox_connection_send_message(vox_dictionary_get_remote_connection(message), reply))
            bench::fail("the reply was refused");
        vox_release(reply);
    }

    const Case& measured_;
    dispatch::queue queue_;
    vox_connection_t listener_;
    vox_connection_t client_ = nullptr;
    std::uint64_t received_ = 0;
};

class Client {
  public:
    explicit Client(const Case& measured)
        : measured_(measured),
          laps_(measured.recorder()),
          data_(bench::vox_cases::kLargeBytes),
          queue_(dispatch::queue::create("bench.client")),
          connection_(vox_connection_create(kService)),
          replied_([this](vox_object_t reply) { takeReply(reply); }) {
        const Handler handler([this](vox_object_t event) {
            if (!ending_.load())
                failOnError(event);
            ended_.signal();
        });
        vox_connection_set_event_handler(connection_, &handler);
        vox_connection_set_target_queue(connection_, &queue_);
        vox_connection_resume(connection_);
    }

    Client(const Client&) = delete;
    Client& operator=(const Client&) = delete;
    ~Client() {
        ending_.store(true);
        vox_connection_cancel(connection_);
        ended_.wait();
        vox_release(connection_);
    }

    void roundTrips() {
        queue_.async([this] {
            laps_.start();
            sendRequest();
        });
        done_.wait();
        bench::vox_cases::reportRoundTrips(laps_);
    }

    void oneWay() {
        bench::vox_cases::measureOneWay(
            measured_, [this] { sendOne(); },
            [this] {
                sendRequest();
                done_.wait();
            });
    }

  private:
    void sendRequest() {
        vox_object_t message = makeMessage(measured_.large ? &data_ : nullptr);
        vox_connection_send_message_with_reply(connection_, message, &queue_, &replied_);
        vox_release(message);
    }

    void takeReply(vox_object_t reply) {
        failOnError(reply);
        read(reply, measured_.large);
        if (measured_.roundTrip && laps_.lap())
            sendRequest();
        else
            done_.signal();
    }

    void sendOne() {
        const std::uint64_t window = measured_.large ? 16 : 4'096;
        if (sent_++ % window == 0)
            keepWithin(2 * window);
        vox_object_t message = makeMessage(measured_.large ? &data_ : nullptr);
        if (vox_connection_send_message(connection_, message))
            bench::fail("a message was refused");
        vox_release(message);
    }

    // Waits until at most `limit` messages are not with the kernel yet.
    void keepWithin(std::uint64_t limit) {
        const dispatch::block<void()> barrier([this, upTo = sent_] {
            handedOver_.store(upTo);
            moved_.signal();
        });
        vox_connection_send_barrier(connection_, &barrier);
        while (sent_ - handedOver_.load() > limit)
            moved_.wait();
    }

    const Case& measured_;
    bench::LapRecorder laps_;
    const std::vector<char> data_;
    dispatch::queue queue_;
    vox_connection_t connection_;
    const Handler replied_;
    bench::Event done_;
    std::uint64_t sent_ = 0;
    std::atomic<std::uint64_t> handedOver_{0};  // messages behind the last barrier
    bench::Event moved_;
    std::atomic<bool> ending_{false};
    bench::Event ended_;
};

}  // namespace

int main(int argc, char** argv) {
    const Case measured = bench::vox_cases::parse(argc, argv);
    const bench::TemporaryFolder folder;
    ::setenv("VOX_RUNTIME_DIR", folder.path().c_str(), 1);
    auto& listening = bench::makeShared<bench::Event>();
    const bench::Child service([&] {
        measured.place(true);
        Server server(measured);
        server.start();
        listening.signal();
        bench::Event never;
        never.wait();
    });
    listening.wait();
    measured.place(false);
    Client client(measured);
    if (measured.roundTrip)
        client.roundTrips();
    else
        client.oneWay();
}
