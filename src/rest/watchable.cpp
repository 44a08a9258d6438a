#include "plr/rest/watchable.h"

#include <algorithm>
#include <utility>

namespace plr::rest {

bool WatchableRestResourceHelper::addWatcher(
    const std::shared_ptr<RestResourceConnection>& watcher) {
    const auto [place, found] = find(watcher);
    if (found)
        return false;
    watchers_.insert(place, watcher);
    return true;
}

bool WatchableRestResourceHelper::removeWatcher(
    const std::shared_ptr<RestResourceConnection>& watcher) {
    const auto [place, found] = find(watcher);
    if (found)
        watchers_.erase(place);
    return found;
}

std::vector<std::shared_ptr<RestResourceConnection>> WatchableRestResourceHelper::takeWatchers() {
    std::vector<std::shared_ptr<RestResourceConnection>> live;
    for (const auto& entry : watchers_)
        if (std::shared_ptr<RestResourceConnection> watcher = entry.lock())
            live.push_back(std::move(watcher));
    watchers_.clear();
    return live;
}

bool WatchableRestResourceHelper::hasActiveWatchers() const noexcept {
    return std::any_of(watchers_.begin(), watchers_.end(),
                       [](const auto& entry) { return !entry.expired(); });
}

void WatchableRestResourceHelper::cleanupExpired() {
    // The order by owner does not change when an entry expires.
    const auto live = std::remove_if(watchers_.begin(), watchers_.end(),
                                     [](const auto& entry) { return entry.expired(); });
    if (live == watchers_.end())
        return;
    watchers_.erase(live, watchers_.end());
    // A crowd that left does not leave its memory.
    if (watchers_.size() <= watchers_.capacity() / 4)
        watchers_.shrink_to_fit();
}

// Its place in the order, and whether it is there. An expired entry keeps its
// owner, so that nobody live is found in its place.
std::pair<WatchableRestResourceHelper::Place, bool> WatchableRestResourceHelper::find(
    const std::shared_ptr<RestResourceConnection>& watcher) {
    const std::owner_less<> before;
    const auto place = std::lower_bound(watchers_.begin(), watchers_.end(), watcher, before);
    return {place, place != watchers_.end() && !before(watcher, *place)};
}

vox::array WatchableRestResourceHelper::getWatcherNames() const {
    const vox::array names = vox::array::create();
    map([&names](const RestResourceConnection& watcher) { names.append(watcher.nameValue()); });
    return names;
}

}  // namespace plr::rest
