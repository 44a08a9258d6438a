#include "platform/linux/kel/client.h"

#include <pthread.h>

#include <algorithm>
#include <mutex>
#include <utility>
#include <vector>

namespace kel {
namespace {

struct registry {
    std::mutex lock;
    std::vector<kel_client*> clients;
    std::vector<std::shared_ptr<sender>> of_parent;  // in a forked child
    places where;
};

registry& all();

void before_fork() {
    all().lock.lock();
}

void in_parent() {
    all().lock.unlock();
}

// The parent's senders may have been in use and locked at the fork: their
// memory is left alone.
void in_child() {
    for (kel_client* client : all().clients) {
        all().of_parent.push_back(client->sender);
        client->sender = std::make_shared<sender>(sender::forked{}, *client->sender);
    }
    all().lock.unlock();
}

// Never destroyed: others log until the process is gone.
registry& all() {
    static registry* const instance = [] {
        ::pthread_atfork(before_fork, in_parent, in_child);
        return new registry;
    }();
    return *instance;
}

}  // namespace

kel_client* make_client(identity who) {
    registry& known = all();
    const std::lock_guard guard(known.lock);
    known.clients.reserve(known.clients.size() + 1);
    known.clients.push_back(new kel_client{std::make_shared<sender>(std::move(who), known.where)});
    return known.clients.back();
}

void destroy_client(kel_client* client) noexcept {
    registry& known = all();
    const std::lock_guard guard(known.lock);
    std::erase(known.clients, client);
    delete client;
}

void set_places(places where) {
    registry& known = all();
    const std::lock_guard guard(known.lock);
    known.where = std::move(where);
}

}  // namespace kel
