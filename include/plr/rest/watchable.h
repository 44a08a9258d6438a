#pragma once

#include <memory>
#include <utility>
#include <vector>

#include "plr/base/export.h"
#include "plr/ipc/array.h"
#include "plr/rest/resource_connection.h"

// A WatchableRestResourceHelper is a set of watchers, held weakly: a client
// that goes away expires, and its entry stays until it is cleaned up. Watchers are
// known by their owner: the std::shared_ptr that a client has at "/connections".
//
// Queue: the server's.
// Cost:  a search is binary.
namespace plr::rest {

class PLR_EXPORT WatchableRestResourceHelper {
  public:
    // False when it is there already.
    bool addWatcher(const std::shared_ptr<RestResourceConnection>& watcher);
    // False when it is not there; expired entries are nobody.
    bool removeWatcher(const std::shared_ptr<RestResourceConnection>& watcher);
    // Deliberate: expired entries count here, and only here.
    [[nodiscard]] bool hasWatchers() const noexcept { return !watchers_.empty(); }
    [[nodiscard]] bool hasActiveWatchers() const noexcept;
    void cleanupExpired();
    void removeWatchers() noexcept { watchers_.clear(); }
    // Takes everybody out: the live watchers, in the set's order.
    [[nodiscard]] std::vector<std::shared_ptr<RestResourceConnection>> takeWatchers();

    // Calls `function` with every live watcher, in the set's order.
    template <class Function>
    void map(Function&& function) const {
        for (const auto& entry : watchers_)
            if (const std::shared_ptr<RestResourceConnection> watcher = entry.lock())
                function(static_cast<const RestResourceConnection&>(*watcher));
    }

    // The live watchers' names, in the set's order.
    [[nodiscard]] vox::array getWatcherNames() const;

  private:
    using Place = std::vector<std::weak_ptr<RestResourceConnection>>::iterator;
    std::pair<Place, bool> find(const std::shared_ptr<RestResourceConnection>& watcher);

    // Ordered by owner (std::owner_less), each once.
    std::vector<std::weak_ptr<RestResourceConnection>> watchers_;
};

}  // namespace plr::rest
