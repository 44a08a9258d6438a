#pragma once

#include <memory>
#include <utility>

#include "dispatch/queue.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/vox_server_helper.h"

// The listening end of a REST server: keeps the listener, and delivers the
// clients' messages and their ends to the server.
//
// Owner:   it is part of the server T, which is held weakly; events after its
//          end are ignored.
// Queue:   handlers run on the queue given; members are called there.
//
// What a server T offers:
//   bool handleNewClient(vox::connection)
//   void handleListenerError(vox::object)
//   void handleClientMessage(const vox::connection&, const vox::dict&)
//   void handleDroppedConnection(const vox::connection&)
namespace plr::rest {

class VoxConnectorServer {
  public:
    // Replaces the listener and starts the new one.
    template <class T>
    void listen(vox::connection listener, const dispatch::queue& queue, std::weak_ptr<T> server) {
        helper_.setListener(std::move(listener));
        helper_.startListener(queue, std::move(server));
    }

    template <class T>
    void accept(vox::connection client, const dispatch::queue& queue,
                std::weak_ptr<T> server) const {
        client.set_event_handler([server = std::move(server), client](vox::object event) {
            const std::shared_ptr<T> alive = server.lock();
            if (!alive)
                return;
            if (event.type() == VOX_TYPE_DICTIONARY)
                alive->handleClientMessage(client, vox::dict(std::move(event)));
            else if (event.type() == VOX_TYPE_ERROR)
                alive->handleDroppedConnection(client);
        });
        client.set_target_queue(queue);
        client.resume();
    }

  private:
    VoxServerHelper helper_;
};

}  // namespace plr::rest
