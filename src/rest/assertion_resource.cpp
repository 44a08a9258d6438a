#include "plr/rest/assertion_resource.h"

#include <limits>
#include <string>

#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"
#include "plr/rest/reply_dict_context.h"
#include "plr/rest/typed_value.h"
#include "src/rest/notify.h"

namespace plr::rest {
namespace {

enum class Kind : std::uint8_t { Root, DumpState, Resource, Granted, Revoked, Waiting, Provider };

// What a path below the resource means. Deliberate: any other word below an
// assertion means the assertion, and what follows the word is not looked at.
Kind kindOf(PathView path) noexcept {
    if (!path)
        return Kind::Root;
    if (path.current() == "*")
        return Kind::DumpState;
    path.advance(1);
    const std::string_view word = path.current();
    if (word == "granted")
        return Kind::Granted;
    if (word == "revoked")
        return Kind::Revoked;
    if (word == "waiting")
        return Kind::Waiting;
    return word == "provider" ? Kind::Provider : Kind::Resource;
}

std::string assertionPath(const PathView& path) {
    return path_join(path.head(), path.current());
}

vox::array namesOf(const WatchableRestResourceHelper* clients) {
    return clients ? clients->getWatcherNames() : vox::array::create();
}

vox::object nameOf(const std::weak_ptr<RestResourceConnection>& client) {
    const std::shared_ptr<RestResourceConnection> live = client.lock();
    return live ? live->nameValue() : vox::object();
}

// Removes the client; whether it was the last one there.
bool removeLast(WatchableRestResourceHelper& clients,
                const std::shared_ptr<RestResourceConnection>& client) {
    return clients.removeWatcher(client) && !clients.hasActiveWatchers();
}

std::uint32_t generationAfter(std::uint32_t generation) noexcept {
    return generation == std::numeric_limits<std::uint32_t>::max() ? 1 : generation + 1;
}

}  // namespace

vox::object AssertionRestResourceState::createNotifyWithState(AssertionState state) const {
    return write_rest_value({generation, state});
}

vox::object AssertionRestResourceState::createNotifyForProvider() const {
    if (waiting.hasActiveWatchers())
        return createNotifyWithState(AssertionState::kPending);
    return createNotifyWithState(granted.hasActiveWatchers() ? AssertionState::kGranted
                                                             : AssertionState::kIdle);
}

vox::object AssertionRestResourceState::dumpState() const {
    const vox::dict document(createNotifyForProvider());
    document["granted"] = granted.getWatcherNames();
    document["waiting"] = waiting.getWatcherNames();
    document["revoked"] = revoked.getWatcherNames();
    document["provider"] = nameOf(provider);
    return document;
}

AssertionRestResource::AssertionRestResource() : AssertionRestResource(false, false) {}
AssertionRestResource::AssertionRestResource(hold_off_tag) : AssertionRestResource(true, false) {}
AssertionRestResource::AssertionRestResource(provider_only_tag)
    : AssertionRestResource(false, true) {}
AssertionRestResource::AssertionRestResource(hold_off_tag, provider_only_tag)
    : AssertionRestResource(true, true) {}
AssertionRestResource::AssertionRestResource(bool holdOff, bool providerOnly)
    : holdOff_(holdOff), providerOnly_(providerOnly) {}
AssertionRestResource::~AssertionRestResource() = default;

bool AssertionRestResource::handleRestMessage_GET(RestResourceContext& context,
                                                  const PathView& path) {
    switch (kindOf(path)) {
        case Kind::Root:
            handleMessage_Root_GET(context);
            break;
        case Kind::DumpState:
            handleMessage_DumpState_GET(context);
            break;
        case Kind::Resource:
            handleMessage_Resource_GET(context, path.current());
            break;
        case Kind::Granted:
            handleMessage_Resource_Granted_GET(context, path.current());
            break;
        case Kind::Revoked:
            handleMessage_Resource_Revoked_GET(context, path.current());
            break;
        case Kind::Waiting:
            handleMessage_Resource_Waiting_GET(context, path.current());
            break;
        case Kind::Provider:
            handleMessage_Resource_Provider_GET(context, path.current());
            break;
    }
    return true;
}

bool AssertionRestResource::handleRestMessage_SET(RestResourceContext& context,
                                                  const PathView& path) {
    const Kind kind = kindOf(path);
    if (kind == Kind::Granted)
        handleMessage_Resource_Granted_SET(context, path);
    else if (kind == Kind::Revoked)
        handleMessage_Resource_Revoked_SET(context, path);
    return kind == Kind::Granted || kind == Kind::Revoked;
}

bool AssertionRestResource::handleRestMessage_PUSH(RestResourceContext& context,
                                                   const PathView& path) {
    const Kind kind = kindOf(path);
    if ((kind == Kind::Resource || kind == Kind::Provider) && isOneTooMany(context, path.current()))
        return false;
    if (kind == Kind::Resource)
        handleMessage_Resource_PUSH(context, path);
    else if (kind == Kind::Provider)
        handleMessage_Resource_Provider_PUSH(context, path);
    return kind == Kind::Resource || kind == Kind::Provider;
}

bool AssertionRestResource::handleRestMessage_POP(RestResourceContext& context,
                                                  const PathView& path) {
    const Kind kind = kindOf(path);
    if (kind == Kind::Resource)
        handleMessage_Resource_POP(context, path);
    else if (kind == Kind::Provider)
        handleMessage_Resource_Provider_POP(context, path);
    return kind == Kind::Resource || kind == Kind::Provider;
}

bool AssertionRestResource::handleRestMessage_NOTIFY(RestResourceContext&, const PathView&) {
    return false;
}

// A client that is in no set and loses nothing costs three searches and makes no
// text: a drop asks every assertion.
void AssertionRestResource::handleDroppedConnection(
    RestResourceContext& context, const PathView& path,
    const std::shared_ptr<RestResourceConnection>& connection) {
    for (const auto& [name, state] : assertions_) {
        const bool wasLastWaiting = removeLast(state->waiting, connection);
        const bool wasLastGranted = removeLast(state->granted, connection);
        state->revoked.removeWatcher(connection);
        if (wasLastWaiting || wasLastGranted)
            startNewGeneration(context, path_join(path.full(), name), *state);
    }
}

// ---- GET -----------------------------------------------------------------------

void AssertionRestResource::handleMessage_Root_GET(RestResourceContext& context) {
    context.sendReplyWithValue(getResourceArray());
}

void AssertionRestResource::handleMessage_DumpState_GET(RestResourceContext& context) {
    ReplyDictRestResourceContextDecorator answers(context);
    for (const auto& [name, state] : assertions_) {
        answers.pushScope(name);
        answers.sendReplyWithValue(state->dumpState());
    }
}

void AssertionRestResource::handleMessage_Resource_GET(RestResourceContext& context,
                                                       std::string_view name) {
    const AssertionRestResourceState* state = find(name);
    context.sendReplyWithValue(state ? state->dumpState() : vox::object());
}

void AssertionRestResource::handleMessage_Resource_Granted_GET(RestResourceContext& context,
                                                               std::string_view name) {
    const AssertionRestResourceState* state = find(name);
    context.sendReplyWithValue(namesOf(state ? &state->granted : nullptr));
}

void AssertionRestResource::handleMessage_Resource_Revoked_GET(RestResourceContext& context,
                                                               std::string_view name) {
    const AssertionRestResourceState* state = find(name);
    context.sendReplyWithValue(namesOf(state ? &state->revoked : nullptr));
}

void AssertionRestResource::handleMessage_Resource_Waiting_GET(RestResourceContext& context,
                                                               std::string_view name) {
    const AssertionRestResourceState* state = find(name);
    context.sendReplyWithValue(namesOf(state ? &state->waiting : nullptr));
}

void AssertionRestResource::handleMessage_Resource_Provider_GET(RestResourceContext& context,
                                                                std::string_view name) {
    const AssertionRestResourceState* state = find(name);
    context.sendReplyWithValue(state ? nameOf(state->provider) : vox::object());
}

// ---- SET: the provider's answers -----------------------------------------------

void AssertionRestResource::handleMessage_Resource_Granted_SET(RestResourceContext& context,
                                                               const PathView& path) {
    AssertionRestResourceState* state = findAnswered(context, path.current());
    if (!state)
        return;
    const std::string resource = assertionPath(path);
    const vox::object granted = state->createNotifyWithState(AssertionState::kGranted);
    for (const auto& client : state->waiting.takeWatchers())
        if (state->granted.addWatcher(client))
            notifyWatcherWithState(context, *client, resource, granted);
    notifyProvider(context, resource, *state);
}

void AssertionRestResource::handleMessage_Resource_Revoked_SET(RestResourceContext& context,
                                                               const PathView& path) {
    if (AssertionRestResourceState* state = findAnswered(context, path.current()))
        startNewGeneration(context, assertionPath(path), *state);
}

// ---- PUSH and POP --------------------------------------------------------------

void AssertionRestResource::handleMessage_Resource_PUSH(RestResourceContext& context,
                                                        const PathView& path) {
    AssertionRestResourceState& state = createIfNotPresent(path.current());
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!author)
        return;
    const bool hasGranted = state.granted.hasActiveWatchers();
    if (holdOff_ || !hasGranted) {
        const bool isFirst = !hasGranted && !state.waiting.hasActiveWatchers();
        state.waiting.addWatcher(author);
        if (isFirst)
            notifyProvider(context, assertionPath(path), state);
    } else if (state.granted.addWatcher(author)) {
        notifyWatcherWithState(context, *author, assertionPath(path),
                               state.createNotifyWithState(AssertionState::kGranted));
    }
    state.revoked.removeWatcher(author);
}

// Deliberate: who is granted and, by hold-off, waits for the next grant as well
// releases the grant alone, and waits on until it releases again.
void AssertionRestResource::handleMessage_Resource_POP(RestResourceContext& context,
                                                       const PathView& path) {
    AssertionRestResourceState* state = find(path.current());
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!state || !author)
        return;
    const bool wasGranted = state->granted.removeWatcher(author);
    WatchableRestResourceHelper& left = wasGranted ? state->granted : state->waiting;
    const bool wasThere = wasGranted || left.removeWatcher(author);
    state->revoked.removeWatcher(author);
    if (wasThere && !left.hasActiveWatchers())
        startNewGeneration(context, assertionPath(path), *state);
}

void AssertionRestResource::handleMessage_Resource_Provider_PUSH(RestResourceContext& context,
                                                                 const PathView& path) {
    AssertionRestResourceState& state = createIfNotPresent(path.current());
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    if (!author)
        return;
    state.provider = author;
    notifyProvider(context, assertionPath(path), state);
}

void AssertionRestResource::handleMessage_Resource_Provider_POP(RestResourceContext& context,
                                                                const PathView& path) {
    AssertionRestResourceState* state = find(path.current());
    if (state && state->provider.lock() == context.getAuthorResource())
        state->provider.reset();
}

// ---- Generations ---------------------------------------------------------------

AssertionRestResourceState* AssertionRestResource::findAnswered(RestResourceContext& context,
                                                                std::string_view name) {
    AssertionRestResourceState* state = find(name);
    const std::uint32_t answered = valueAs<std::uint32_t>(context.getRestValue()).value_or(0);
    if (!state || answered != state->generation)
        return nullptr;
    const std::shared_ptr<RestResourceConnection> author = context.getAuthorResource();
    const bool isAllowed = !providerOnly_ || (author && author == state->provider.lock());
    return isAllowed ? state : nullptr;
}

void AssertionRestResource::startNewGeneration(RestResourceContext& context,
                                               const std::string& path,
                                               AssertionRestResourceState& state) const {
    if (!holdOff_ && state.granted.hasWatchers()) {
        // Deliberate: what is taken away is told with the generation that ends.
        const vox::object idle = state.createNotifyWithState(AssertionState::kIdle);
        for (const auto& client : state.granted.takeWatchers())
            if (state.revoked.addWatcher(client))
                notifyWatcherWithState(context, *client, path, idle);
    }
    state.generation = generationAfter(state.generation);
    notifyProvider(context, path, state);
}

// ---- Notifications: `path` is the assertion's ----------------------------------

void AssertionRestResource::notifyWatcherWithState(RestResourceContext& context,
                                                   const RestResourceConnection& client,
                                                   const std::string& path,
                                                   const vox::object& state) {
    notifyWatcher(context, client, asText(path), state);
}

void AssertionRestResource::notifyProvider(RestResourceContext& context, const std::string& path,
                                           const AssertionRestResourceState& state) {
    if (const std::shared_ptr<RestResourceConnection> provider = state.provider.lock())
        notifyWatcher(context, *provider, asText(path_join(path, "provider")),
                      state.createNotifyForProvider());
}

// ---- Assertions ----------------------------------------------------------------

vox::array AssertionRestResource::getResourceArray() const {
    const vox::array names = vox::array::create();
    for (const auto& assertion : assertions_)
        names.append(asText(assertion.first));
    return names;
}

AssertionRestResourceState* AssertionRestResource::find(std::string_view name) {
    const auto* found = assertions_.find(name);
    return found ? found->get() : nullptr;
}

bool AssertionRestResource::isOneTooMany(RestResourceContext& context, std::string_view name) {
    return assertions_.size() >= limit_ && context.getRawAuthorConnection() && !find(name);
}

AssertionRestResourceState& AssertionRestResource::createIfNotPresent(std::string_view name) {
    if (AssertionRestResourceState* state = find(name))
        return *state;
    return **assertions_.insert(name, std::make_unique<AssertionRestResourceState>()).first;
}

}  // namespace plr::rest
