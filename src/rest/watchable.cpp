#include "plr/rest/watchable.h"

#include <algorithm>

namespace plr::rest {

bool WatchableRestResourceHelper::addWatcher(
    const std::shared_ptr<RestResourceConnection>& watcher) {
    const std::owner_less<> before;
    const auto place = std::lower_bound(watchers_.begin(), watchers_.end(), watcher, before);
    if (place != watchers_.end() && !before(watcher, *place))
        return false;
    watchers_.insert(place, watcher);
    return true;
}

bool WatchableRestResourceHelper::removeWatcher(
    const std::shared_ptr<RestResourceConnection>& watcher) {
    const auto found = std::find_if(watchers_.begin(), watchers_.end(), [&](const auto& entry) {
        const std::shared_ptr<RestResourceConnection> live = entry.lock();
        return live && live == watcher;
    });
    if (found == watchers_.end())
        return false;
    watchers_.erase(found);
    return true;
}

bool WatchableRestResourceHelper::hasActiveWatchers() const noexcept {
    return std::any_of(watchers_.begin(), watchers_.end(),
                       [](const auto& entry) { return !entry.expired(); });
}

void WatchableRestResourceHelper::cleanupExpired() {
    // The order by owner does not change when an entry expires.
    const auto live = std::remove_if(watchers_.begin(), watchers_.end(),
                                     [](const auto& entry) { return entry.expired(); });
    watchers_.erase(live, watchers_.end());
}

vox::array WatchableRestResourceHelper::getWatcherNames() const {
    const vox::array names = vox::array::create();
    map([&names](const RestResourceConnection& watcher) { names.append(watcher.nameValue()); });
    return names;
}

}  // namespace plr::rest
