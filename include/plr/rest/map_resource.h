#pragma once

#include <cstddef>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/object.h"
#include "plr/rest/map_change.h"
#include "plr/rest/resource.h"
#include "plr/rest/watchable.h"
#include "plr/rest/watcher_cleanup.h"

// A MapRestResource holds entries that come and go: values by key.
//
//   KEY             SET to a value makes or changes the entry, to null removes it;
//                   GET: the value, KEY@SUB.PATH a part of it; PUSH and POP watch
//                   it, before it exists as well
//   (the resource)  GET: the whole map, a dictionary; PUSH and POP watch it
//   *               GET: the same as of the resource, for dumps from above
//   _/watchers, KEY/_/watchers
//                   GET: the names of who watches the map, or the key
//
// A key is one segment, without '@' and NUL, and neither "_" nor "*". Everything else
// is not handled. Who is not registered at "/connections" can watch nothing.
//
// Who watches a key is notified at its path with the value, null when there is
// none: at once, and whenever it is set or removed. Who watches the map is
// notified at the map's path with a MapChange (map_change.h): at once with the
// whole map, then with each change. Both paths start with '/'. Removing what is not
// there changes nothing and is not notified.
//
// With `owned_entries` an entry belongs to the client that made it: no other can
// change or remove it (not handled), and it is removed when its owner's
// connection drops, all of its entries in one MapChange. Entries that the service
// itself makes belong to nobody; only the service can change them, and it can change
// all others too, which keep their owners. A client that is not registered cannot
// set then.
//
// Owner:   the tree. Watchers and owners are held weakly.
// Queue:   the server's.
// Order:   each watcher is notified of changes in their order.
// Bounds:  `limit` entries, and as many keys that are watched: a SET or PUSH over it
//          is not handled. The whole map must fit into one message (vox/limits.h).
// Cost:    a SET costs a search and a message for each watcher; who watches the map
//          shares one MapChange.
namespace plr::rest {

struct owned_entries_tag {};
inline constexpr owned_entries_tag owned_entries{};

class PLR_EXPORT MapRestResource : public RestResource, public WatcherCleanup {
  public:
    static constexpr std::size_t kDefaultLimit = 65'536;  // entries

    explicit MapRestResource(std::size_t limit = kDefaultLimit);
    explicit MapRestResource(owned_entries_tag, std::size_t limit = kDefaultLimit);
    ~MapRestResource() override;

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_SET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_POP(RestResourceContext& context, const PathView& path) override;
    void handleDroppedConnection(
        RestResourceContext& context, const PathView& path,
        const std::shared_ptr<RestResourceConnection>& connection) override;
    void cleanupWatchers(RestResourceContext& context, const PathView& path) override;

  private:
    using Client = std::shared_ptr<RestResourceConnection>;

    struct Entry {
        vox::object value;  // null for a key that is only watched
        WatchableRestResourceHelper watchers;
        std::weak_ptr<RestResourceConnection> owner;  // empty: nobody
    };
    using Entries = std::map<std::string, Entry, std::less<>>;

    MapRestResource(bool areOwned, std::size_t limit);

    [[nodiscard]] vox::object valueOf(std::string_view key, std::string_view subpath) const;
    [[nodiscard]] vox::object watchersOf(std::string_view key) const;
    [[nodiscard]] MapChange wholeMap() const;

    // `map` is the map's own path.
    bool pushMap(RestResourceContext& context, const std::string& map);
    bool pushKey(RestResourceContext& context, const std::string& map, std::string_view key);

    [[nodiscard]] bool mayChange(RestResourceContext& context, const Client& author,
                                 const Entry* entry) const;
    bool set(RestResourceContext& context, const std::string& map, std::string_view key,
             Entries::iterator found, const Client& author);
    void remove(RestResourceContext& context, const std::string& map, Entries::iterator place);
    // Takes the value; its key's watchers stay.
    void clear(Entries::iterator place);
    // Tells who watches the key; the map.
    void tellKey(RestResourceContext& context, const std::string& map,
                 const Entries::value_type& entry) const;
    void tellMap(RestResourceContext& context, const std::string& map,
                 const MapChange& change) const;

    void stopWatching(Entry& entry, const Client& client);
    void eraseUnused(Entries::iterator place);

    const bool areOwned_;
    const std::size_t limit_;
    Entries entries_;
    std::size_t present_ = 0;               // keys with a value
    std::size_t watched_ = 0;               // keys with watchers, expired ones included
    WatchableRestResourceHelper watchers_;  // of the map
    // Which keys each client owns, lent by entries_.
    std::map<std::weak_ptr<RestResourceConnection>, std::set<std::string_view>, std::owner_less<>>
        owned_;
};

}  // namespace plr::rest
