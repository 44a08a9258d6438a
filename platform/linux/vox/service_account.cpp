#include "platform/linux/vox/service_account.h"

#include "platform/linux/vox/user_turns.h"

namespace vox_link {

// ---- One user ------------------------------------------------------------------------

user_account::user_account(std::shared_ptr<service_account> of, uid_t user) noexcept
    : service_(std::move(of)), user_(user) {}

user_account::~user_account() {
    service_->forget(user_);
}

std::shared_ptr<user_turns> user_account::turns_on(const dispatch::queue& queue) {
    const lock_guard guard(service_->lock_);
    std::shared_ptr<user_turns> turns = turns_.lock();
    if (!turns || !turns->is_on(queue)) {
        turns = std::make_shared<user_turns>(queue);
        turns_ = turns;
    }
    return turns;
}

limit_hit user_account::limit(cost of) const noexcept {
    const vox_limits_t& limits = service_->limits();
    switch (of) {
        case cost::queued_bytes:
            return {"max_queued_bytes_per_uid", limits.max_queued_bytes_per_uid};
        case cost::queued_messages:
            return {"max_queued_messages_per_uid", limits.max_queued_messages_per_uid};
        case cost::pending_replies:
            return {"max_pending_replies_per_uid", limits.max_pending_replies_per_uid};
        case cost::open_requests:
            return {"max_open_requests_per_uid", limits.max_open_requests_per_uid};
        case cost::held_descriptors:
            return {"max_held_descriptors_per_uid", limits.max_held_descriptors_per_uid};
        case cost::partial_bytes:
            break;
    }
    return {"max_partial_bytes_per_uid", limits.max_partial_bytes_per_uid};
}

// No other client of the user is refused for what this one tries in vain.
bool user_account::take(cost of, std::uint64_t amount, unsigned times) noexcept {
    const std::uint64_t most = times * limit(of).most;
    std::atomic<std::uint64_t>& used = used_[static_cast<std::size_t>(of)];
    std::uint64_t before = used.load(std::memory_order_relaxed);
    do {
        if (before + amount > most)
            return false;
    } while (!used.compare_exchange_weak(before, before + amount, std::memory_order_relaxed));
    return true;
}

void user_account::give_back(cost of, std::uint64_t amount) noexcept {
    used_[static_cast<std::size_t>(of)].fetch_sub(amount, std::memory_order_relaxed);
}

bool user_account::adjust(cost of, std::uint64_t& charged, std::uint64_t now,
                          unsigned times) noexcept {
    if (now > charged && !take(of, now - charged, times))
        return false;
    if (now < charged)
        give_back(of, charged - now);
    charged = now;
    return true;
}

// ---- Clients -------------------------------------------------------------------------

service_account::ticket::~ticket() {
    if (user_)
        user_->service().give_back(*user_);
}

service_account::ticket service_account::take(uid_t user, limit_hit& hit) {
    std::shared_ptr<user_account> account;  // not destroyed under the lock
    const lock_guard guard(lock_);
    std::weak_ptr<user_account>& known = users_[user];
    account = known.lock();
    if (!account) {
        account = std::make_shared<user_account>(shared_from_this(), user);
        known = account;
    }
    if (connections_ >= limits_.max_connections)
        hit = {"max_connections", limits_.max_connections};
    else if (account->connections_ >= limits_.max_connections_per_uid)
        hit = {"max_connections_per_uid", limits_.max_connections_per_uid};
    if (hit) {
        count(event::refused_by_limit);
        return {};
    }
    ++account->connections_;
    ++connections_;
    return ticket(account);
}

void service_account::give_back(user_account& user) noexcept {
    const lock_guard guard(lock_);
    --user.connections_;
    --connections_;
}

// Another account may have taken the place of the one that ends.
void service_account::forget(uid_t user) noexcept {
    const lock_guard guard(lock_);
    if (const auto found = users_.find(user); found != users_.end() && found->second.expired())
        users_.erase(found);
}

void service_account::enter(const counted_client& client) {
    const lock_guard guard(clients_lock_);
    clients_.insert(&client);
}

void service_account::leave(const counted_client& client) {
    const lock_guard guard(clients_lock_);
    clients_.erase(&client);
    client.add_counts(past_);
}

// ---- Looking -------------------------------------------------------------------------

vox_listener_statistics_t service_account::statistics() const {
    const auto counted = [this](event of) {
        return events_[static_cast<std::size_t>(of)].load(std::memory_order_relaxed);
    };
    vox_listener_statistics_t sums;
    {
        const lock_guard guard(clients_lock_);
        sums = past_;
        for (const counted_client* client : clients_)
            client->add_counts(sums);
    }
    const lock_guard guard(lock_);
    sums.clients = connections_;
    sums.clients_accepted = counted(event::accepted);
    sums.refused_by_policy = counted(event::refused_by_policy);
    sums.refused_by_limit = counted(event::refused_by_limit);
    sums.refused_without_descriptors = counted(event::refused_without_descriptors);
    sums.ended_for_limits = counted(event::ended_for_limit);
    sums.ended_for_protocol = counted(event::ended_for_protocol);
    return sums;
}

vox_user_statistics_t service_account::user_statistics(uid_t user) const {
    std::shared_ptr<user_account> account;
    vox_user_statistics_t now = {};
    {
        const lock_guard guard(lock_);
        if (const auto found = users_.find(user); found != users_.end())
            account = found->second.lock();
        if (!account)
            return now;
        now.connections = account->connections_;
    }
    now.queued_bytes = account->used(cost::queued_bytes);
    now.queued_messages = account->used(cost::queued_messages);
    now.pending_replies = account->used(cost::pending_replies);
    now.open_requests = account->used(cost::open_requests);
    now.held_descriptors = account->used(cost::held_descriptors);
    now.partial_bytes = account->used(cost::partial_bytes);
    return now;
}

}  // namespace vox_link
