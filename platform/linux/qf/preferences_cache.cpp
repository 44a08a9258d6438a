#include "platform/linux/qf/preferences_cache.h"

#include <utility>
#include <vector>

namespace qf::preferences {
namespace {

// Further selections take the place of older ones.
constexpr std::size_t kMaximumEntries = 16;

bool is_same(const owned_string& known, QfStringRef asked) noexcept {
    return known.get() == asked || view(known.get()) == view(asked);
}

struct entry {
    owned_string application, user, host;
    std::uint64_t version = 0;
    snapshot content;

    [[nodiscard]] bool is_of(QfStringRef for_application, QfStringRef for_user,
                             QfStringRef for_host) const noexcept {
        return is_same(application, for_application) && is_same(user, for_user) &&
               is_same(host, for_host);
    }
};

// One thread's entries.
class cache {
  public:
    entry& find(QfStringRef application, QfStringRef user, QfStringRef host) {
        for (entry& each : entries_) {
            if (each.is_of(application, user, host))
                return each;
        }
        entry made{owned_string::retain(application),
                   owned_string::retain(user),
                   owned_string::retain(host),
                   0,
                   {}};
        if (entries_.size() < kMaximumEntries)
            return entries_.emplace_back(std::move(made));
        next_ = (next_ + 1) % kMaximumEntries;
        return entries_[next_] = std::move(made);
    }

  private:
    std::vector<entry> entries_;
    std::size_t next_ = 0;
};

// Plain data: it outlives the thread's objects.
thread_local cache* of_thread = nullptr;
thread_local bool has_ended = false;

struct thread_end {
    ~thread_end() {
        has_ended = true;
        delete std::exchange(of_thread, nullptr);
    }
};

cache* of_this_thread() {
    if (!of_thread && !has_ended) {
        of_thread = new cache;
        thread_local const thread_end cleaner;
        (void)cleaner;
    }
    return of_thread;
}

}  // namespace

const snapshot* find_cached(QfStringRef application, QfStringRef user, QfStringRef host) {
    cache* const mine = of_this_thread();
    if (!mine)
        return nullptr;
    entry& known = mine->find(application, user, host);
    const std::uint64_t now = store::version();
    if (known.version != now) {
        known.content = store::instance().get(application, user, host);
        known.version = now;
    }
    return &known.content;
}

void forget_cached() noexcept {
    delete std::exchange(of_thread, nullptr);
}

}  // namespace qf::preferences
