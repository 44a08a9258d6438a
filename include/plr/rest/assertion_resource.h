#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <memory>
#include <string>
#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/array.h"
#include "plr/ipc/object.h"
#include "plr/rest/assertion_state.h"
#include "plr/rest/path_map.h"
#include "plr/rest/resource.h"
#include "plr/rest/watchable.h"

// An AssertionRestResource arbitrates named assertions ("keep the radio on")
// between many clients, who hold them, and one provider each, who can grant them.
//
//   NAME            PUSH asserts, POP releases; GET: all there is to say of it
//   NAME/provider   PUSH registers the provider, POP unregisters it; GET: its name
//   NAME/granted    SET to the generation grants; GET: the names of who is granted
//   NAME/revoked    SET to the generation revokes; GET: … whose grant was taken
//   NAME/waiting    GET: … who waits
//   (nothing), *    GET: the assertions' names; what there is to say of each
//
// Clients are notified at NAME with an AssertionAcquireState: granted, or idle
// when their grant is taken. The provider is notified at NAME/provider: pending
// while somebody waits, else granted while somebody is granted, else idle. It
// answers with the generation that it was told; an answer to an older one is
// ignored. A generation ends when the provider revokes, and when the last who is
// granted, or the last who waits, leaves. The first is 1, and 4294967295 is
// followed by 1: what is no integer of that range reads as 0, and is never current.
//
// The document of an assertion, its own GET and its entry in a dump:
//
//   "generation", "state"             what the provider would be told now
//   "granted", "waiting", "revoked"   names of clients, arrays
//   "provider"                        its name; null without one
//
// and null, or an empty array, for an assertion that is not known. Assertions
// exist from their first PUSH for the resource's life, as many as limitNames() says; a
// GET makes none.
//
// Owner:   the tree. Clients and providers are held weakly; who is not registered
//          at "/connections" can be neither.
// Queue:   the server's.
// Errors:  stale and malformed answers are ignored; nobody is sent an error.
namespace plr::rest {

// Selects hold-off: a client that asserts while others are granted waits for the
// next grant, and a new generation leaves the granted ones as they are.
struct hold_off_tag {};
inline constexpr hold_off_tag hold_off{};

// Lets the registered provider alone grant and revoke; otherwise any client may.
struct provider_only_tag {};
inline constexpr provider_only_tag provider_only{};

// One assertion.
struct PLR_EXPORT AssertionRestResourceState {
    std::uint32_t generation = 1;
    WatchableRestResourceHelper waiting;  // asserted, and not granted yet
    WatchableRestResourceHelper granted;
    WatchableRestResourceHelper revoked;  // not released since
    std::weak_ptr<RestResourceConnection> provider;

    // What its parties are told: AssertionAcquireState values of this generation.
    [[nodiscard]] vox::object createNotifyWithState(AssertionState state) const;
    [[nodiscard]] vox::object createNotifyForProvider() const;
    // Its document.
    [[nodiscard]] vox::object dumpState() const;
};

class PLR_EXPORT AssertionRestResource : public RestResource {
  public:
    AssertionRestResource();
    explicit AssertionRestResource(hold_off_tag);
    explicit AssertionRestResource(provider_only_tag);
    AssertionRestResource(hold_off_tag, provider_only_tag);
    ~AssertionRestResource() override;

    // From `limit` assertions on, a client's PUSH of a further name is not handled; the
    // service's own messages, on no connection, are. No limit at first. On the queue,
    // or before the resource is registered.
    void limitNames(std::size_t limit) noexcept { limit_ = limit; }

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_SET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_POP(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_NOTIFY(RestResourceContext& context, const PathView& path) override;
    void handleDroppedConnection(
        RestResourceContext& context, const PathView& path,
        const std::shared_ptr<RestResourceConnection>& connection) override;

  protected:
    // The assertion, made now when the name is new: for who derives and has its
    // generations go on where a former process left them. Valid for the resource's
    // life.
    AssertionRestResourceState& createIfNotPresent(std::string_view name);

  private:
    AssertionRestResource(bool holdOff, bool providerOnly);

    // The handlers by operation and kind of path. Paths stand on the assertion's
    // own segment.
    void handleMessage_Root_GET(RestResourceContext& context);
    void handleMessage_DumpState_GET(RestResourceContext& context);
    void handleMessage_Resource_GET(RestResourceContext& context, std::string_view name);
    void handleMessage_Resource_Granted_GET(RestResourceContext& context, std::string_view name);
    void handleMessage_Resource_Revoked_GET(RestResourceContext& context, std::string_view name);
    void handleMessage_Resource_Waiting_GET(RestResourceContext& context, std::string_view name);
    void handleMessage_Resource_Provider_GET(RestResourceContext& context, std::string_view name);
    void handleMessage_Resource_Granted_SET(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_Revoked_SET(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_PUSH(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_POP(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_Provider_PUSH(RestResourceContext& context, const PathView& path);
    void handleMessage_Resource_Provider_POP(RestResourceContext& context, const PathView& path);

    [[nodiscard]] vox::array getResourceArray() const;
    [[nodiscard]] AssertionRestResourceState* find(std::string_view name);
    [[nodiscard]] bool isOneTooMany(RestResourceContext& context, std::string_view name);
    // The assertion that a SET of a generation is about; null when the message is
    // to be ignored.
    [[nodiscard]] AssertionRestResourceState* findAnswered(RestResourceContext& context,
                                                           std::string_view name);
    // `path` is the assertion's.
    void startNewGeneration(RestResourceContext& context, const std::string& path,
                            AssertionRestResourceState& state) const;
    static void notifyWatcherWithState(RestResourceContext& context,
                                       const RestResourceConnection& client,
                                       const std::string& path, const vox::object& state);
    static void notifyProvider(RestResourceContext& context, const std::string& path,
                               const AssertionRestResourceState& state);

    const bool holdOff_;
    PathMap<std::unique_ptr<AssertionRestResourceState>> assertions_;  // by name
    const bool providerOnly_;
    std::size_t limit_ = std::numeric_limits<std::size_t>::max();  // names
};

}  // namespace plr::rest
