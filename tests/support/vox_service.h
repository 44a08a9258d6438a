#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <mutex>
#include <utility>
#include <vector>

#include "support/vox_test.h"

// A service and its clients in this process.
namespace plr::test {

// A service in this process that answers requests with their number and records
// the events of each of its clients.
class EchoService {
  public:
    struct Client {
        Ref connection;
        Inbox inbox;
    };

    // `make` makes the listener.
    explicit EchoService(vox_connection_t listener)
        : listener_(listener), queue_(dispatch::queue::create("service")) {
        const dispatch::block<void(vox_object_t)> handler(
            [this](vox_object_t event) { take(event); });
        vox_connection_set_event_handler(listener_, &handler);
        vox_connection_set_target_queue(listener_, &queue_);
        vox_connection_resume(listener_);
    }
    ~EchoService() {
        vox_connection_cancel(listener_);
        EXPECT_TRUE(errors_.waitForError());
        queue_.sync([this] {
            for (const auto& client : clients_)
                vox_connection_cancel(client->connection);
        });
        for (const auto& client : clients_)
            EXPECT_TRUE(client->inbox.waitForError());
        drain(queue_);
    }
    EchoService(const EchoService&) = delete;
    EchoService& operator=(const EchoService&) = delete;

    [[nodiscard]] vox_connection_t listener() const { return listener_; }
    // The listener's error.
    [[nodiscard]] Inbox& errors() { return errors_; }
    // The client that came as number `index`, waited for; null in vain.
    [[nodiscard]] Client* client(std::size_t index) {
        Client* found = nullptr;
        static_cast<void>(eventually([&] {
            const std::lock_guard guard(lock_);
            found = index < clients_.size() ? clients_[index].get() : nullptr;
            return found != nullptr;
        }));
        return found;
    }

  private:
    void take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return errors_.add(event);
        auto client = std::make_unique<Client>();
        client->connection = Ref::retain(event);
        const dispatch::block<void(vox_object_t)> handler(
            [taken = client.get()](vox_object_t arrived) { answer(*taken, arrived); });
        vox_connection_set_event_handler(event, &handler);
        vox_connection_set_target_queue(event, &queue_);
        {
            const std::lock_guard guard(lock_);
            clients_.push_back(std::move(client));
        }
        vox_connection_resume(event);
    }
    static void answer(Client& client, vox_object_t event) {
        const Ref reply(vox_dictionary_create_reply(event));
        if (!vox_object_t(reply))
            return client.inbox.add(event);
        vox_dictionary_set_value(reply, "n", vox_dictionary_get_value(event, "n"));
        static_cast<void>(vox_connection_send_message(client.connection, reply));
    }

    Ref listener_;
    dispatch::queue queue_;
    Inbox errors_;
    std::mutex lock_;
    std::vector<std::unique_ptr<Client>> clients_;
};

// A client with its events, cancelled at the end.
class TestClient {
  public:
    explicit TestClient(vox_connection_t connection)
        : connection_(connection), queue_(dispatch::queue::create("client")) {
        resumeWith(connection_, inbox_, queue_);
    }
    ~TestClient() {
        vox_connection_cancel(connection_);
        EXPECT_TRUE(inbox_.waitForError());
        drain(queue_);
    }
    TestClient(const TestClient&) = delete;
    TestClient& operator=(const TestClient&) = delete;
    [[nodiscard]] vox_connection_t connection() const { return connection_; }
    [[nodiscard]] Inbox& inbox() { return inbox_; }
    // Whether a request is answered.
    [[nodiscard]] bool works() {
        auto replies = std::make_shared<Inbox>();
        const dispatch::block<void(vox_object_t)> handler(
            [replies](vox_object_t reply) { replies->add(reply); });
        vox_connection_send_message_with_reply(connection_, message(42), &queue_, &handler);
        return replies->wait(1) && numberIn(replies->all().front()) == 42;
    }

  private:
    Ref connection_;
    dispatch::queue queue_;
    Inbox inbox_;
};

}  // namespace plr::test
