#pragma once

#include <cstddef>

#include "plr/base/export.h"
#include "plr/rest/resource.h"

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
// Who watches a key is notified at its path with the value, null when there is
// none: at once, and whenever it is set or removed. Who watches the map is
// notified at the map's path with a MapChange (map_change.h): at once with the
// whole map, then with each change. Removing what is not there changes nothing
// and is not notified. Everything else is not handled.
//
// With `owned_entries` an entry belongs to the client that made it: nobody else
// can change or remove it (not handled), and it is removed when its owner's
// connection drops. Entries that the service itself sets belong to nobody, and
// only it can change them. A client that is not registered at "/connections"
// cannot set then.
//
// A SET of a new key over the limit of entries is not handled.
//
// Owner:   the tree. Watchers and owners are held weakly.
// Queue:   the server's.
// Order:   each watcher is notified of changes in their order.
namespace plr::rest {

struct owned_entries_tag {};
inline constexpr owned_entries_tag owned_entries{};

class PLR_EXPORT MapRestResource : public RestResource {
  public:
    static constexpr std::size_t kDefaultLimit = 65'536;  // entries

    explicit MapRestResource(std::size_t limit = kDefaultLimit);
    explicit MapRestResource(owned_entries_tag, std::size_t limit = kDefaultLimit);
    ~MapRestResource() override;
    // to be written
};

}  // namespace plr::rest
