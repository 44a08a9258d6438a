#include "plr/rest/request_resource.h"

#include <cstdint>
#include <deque>
#include <map>
#include <string>
#include <utility>
#include <vector>

#include "plr/ipc/array.h"
#include "plr/ipc/dict.h"
#include "plr/ipc/values.h"
#include "plr/rest/auto_reply.h"
#include "src/rest/notify.h"
#include "src/rest/request_provider.h"

namespace plr::rest {
namespace {

enum class Kind : std::uint8_t { Root, DumpState, Name, Provider, Waiting, Unknown };

Kind kindOf(PathView path) noexcept {
    if (!path)
        return Kind::Root;
    if (path.current() == "*")
        return path.hasTail() ? Kind::Unknown : Kind::DumpState;
    if (!path.hasTail())
        return Kind::Name;
    path.advance(1);
    if (path.hasTail())
        return Kind::Unknown;
    if (path.current() == "provider")
        return Kind::Provider;
    return path.current() == "waiting" ? Kind::Waiting : Kind::Unknown;
}

using Client = std::shared_ptr<RestResourceConnection>;
using Reply = std::shared_ptr<vox::object>;  // empty when none is wanted

bool is(const std::weak_ptr<RestResourceConnection>& one, const Client& client) {
    return client && one.lock() == client;
}

vox::object error(const char* text) {
    return vox::error(VOX_ERROR_APPLICATION, text);
}

vox::object count(std::size_t number) {
    return vox::int64(static_cast<std::int64_t>(number));
}

// One that waits for a provider.
struct Request {
    std::weak_ptr<RestResourceConnection> asker;  // empty when not registered
    vox::object author;
    vox::object value;
    Reply reply;
};

// One that a provider has.
struct SentRequest {
    std::weak_ptr<RestResourceConnection> asker;
    std::shared_ptr<const RequestProvider> provider;
    Reply reply;
};

struct Name {
    std::shared_ptr<const RequestProvider> provider;  // null, or gone, when there is none
    std::deque<Request> queue;
    std::map<std::uint64_t, SentRequest> sent;  // by number

    [[nodiscard]] bool hasProvider() const noexcept { return provider && !provider->isGone(); }
    [[nodiscard]] std::size_t waiting() const noexcept { return queue.size() + sent.size(); }
    [[nodiscard]] bool isUnused() const noexcept { return !hasProvider() && waiting() == 0; }
    [[nodiscard]] vox::object providerName() const {
        return hasProvider() ? provider->nameValue() : vox::object();
    }
};

Request requestOf(RestResourceContext& context) {
    const Client asker = context.getAuthorResource();
    return {.asker = asker,
            .author = asker ? asker->nameValue() : context.getRestAuthor(),
            .value = context.getRestValue(),
            .reply = context.takeAutoReplyValue()};
}

// Answers that are to leave once the books are right: with the last holder.
class Departures {
  public:
    void add(const Reply& reply, const char* text) {
        if (!reply)
            return;
        *reply = error(text);
        replies_.push_back(reply);
    }

  private:
    std::vector<Reply> replies_;
};

// The client provides the name no more, and answers nothing of what it has.
void forgetProvider(Name& name, const Client& client, Departures& departures) {
    if (name.provider && name.provider->is(client))
        name.provider = nullptr;
    std::erase_if(name.sent, [&](const auto& entry) {
        if (!entry.second.provider->is(client))
            return false;
        departures.add(entry.second.reply, "provider is gone");
        return true;
    });
}

// The client waits for nothing more. How many of its requests were queued.
std::size_t forgetAsker(Name& name, const Client& client, Departures& departures) {
    const auto isItsOwn = [&](const auto& request) {
        if (!is(request.asker, client))
            return false;
        departures.add(request.reply, "asker is gone");
        return true;
    };
    std::erase_if(name.sent, [&](const auto& entry) { return isItsOwn(entry.second); });
    return std::erase_if(name.queue, isItsOwn);
}

}  // namespace

struct RequestRestResource::Names : std::enable_shared_from_this<Names> {
    using Map = std::map<std::string, Name, std::less<>>;

    Map byName;
    std::size_t queued = 0;  // for all names
    std::uint64_t lastNumber = 0;
    const vox::object gone = error("provider is gone");

    [[nodiscard]] const Name* find(std::string_view name) const {
        const auto place = byName.find(name);
        return place == byName.end() ? nullptr : &place->second;
    }
    void eraseUnused(Map::iterator place) {
        if (place->second.isUnused())
            byName.erase(place);
    }
    // Passes a request to the name's provider.
    void send(RestResourceContext& context, Map::value_type& entry, Request&& request);
    // Passes on what waited for the name's provider.
    void sendQueued(RestResourceContext& context, Map::value_type& entry);
    // The end of a request that was sent, unless it has ended otherwise.
    void answer(const std::string& name, std::uint64_t number, const vox::object& value);
};

void RequestRestResource::Names::send(RestResourceContext& context, Map::value_type& entry,
                                      Request&& request) {
    const std::shared_ptr<const RequestProvider> provider = entry.second.provider;
    const std::uint64_t number = ++lastNumber;
    entry.second.sent.emplace(number, SentRequest{.asker = request.asker,
                                                  .provider = provider,
                                                  .reply = std::move(request.reply)});
    Reply slot = createAutoReplyWithAction(
        [weak = weak_from_this(), name = entry.first, number](const vox::object& value) {
            if (const auto names = weak.lock())
                names->answer(name, number, value);
        });
    *slot = gone;  // stays when the provider's connection ends
    context.sendGet(*provider, request.author, provider->path(), request.value, std::move(slot));
}

void RequestRestResource::Names::sendQueued(RestResourceContext& context, Map::value_type& entry) {
    std::deque<Request> queue = std::exchange(entry.second.queue, {});
    queued -= queue.size();
    for (Request& request : queue)
        send(context, entry, std::move(request));
}

void RequestRestResource::Names::answer(const std::string& name, std::uint64_t number,
                                        const vox::object& value) {
    const auto place = byName.find(name);
    if (place == byName.end())
        return;
    const auto node = place->second.sent.extract(number);
    if (!node)
        return;
    eraseUnused(place);
    if (const Reply& reply = node.mapped().reply)
        *reply = value;
}

RequestRestResource::RequestRestResource() : RequestRestResource(queue_requests{0, 0}) {}
RequestRestResource::RequestRestResource(queue_requests waiting)
    : waiting_(waiting), names_(std::make_shared<Names>()) {}
RequestRestResource::~RequestRestResource() = default;

// ---- GET -----------------------------------------------------------------------

bool RequestRestResource::handleRestMessage_GET(RestResourceContext& context,
                                                const PathView& path) {
    const Name* name = names_->find(path.current());
    switch (kindOf(path)) {
        case Kind::Root:
            handleMessage_Root_GET(context);
            break;
        case Kind::DumpState:
            handleMessage_DumpState_GET(context);
            break;
        case Kind::Name:
            handleMessage_Name_GET(context, path.current());
            break;
        case Kind::Provider:
            context.sendReplyWithValue(name ? name->providerName() : vox::object());
            break;
        case Kind::Waiting:
            context.sendReplyWithValue(count(name ? name->waiting() : 0));
            break;
        case Kind::Unknown:
            return false;
    }
    return true;
}

void RequestRestResource::handleMessage_Root_GET(RestResourceContext& context) const {
    const vox::array names = vox::array::create();
    for (const auto& entry : names_->byName)
        names.append(asText(entry.first));
    context.sendReplyWithValue(names);
}

void RequestRestResource::handleMessage_DumpState_GET(RestResourceContext& context) const {
    const vox::dict dump = vox::dict::create();
    for (const auto& [text, name] : names_->byName) {
        const vox::dict state = vox::dict::create();
        state["provider"] = name.providerName();
        state["waiting"] = count(name.waiting());
        dump[text.c_str()] = state;
    }
    context.sendReplyWithValue(dump);
}

void RequestRestResource::handleMessage_Name_GET(RestResourceContext& context,
                                                 std::string_view name) {
    const auto place = names_->byName.find(name);
    const bool isKnown = place != names_->byName.end();
    if (isKnown && place->second.waiting() >= kMaximumWaiting)
        context.sendReplyWithValue(error("too many requests"));
    else if (isKnown && place->second.hasProvider())
        names_->send(context, *place, requestOf(context));
    else if (mayWait(name))
        enqueue(context, name);
    else
        context.sendReplyWithValue(
            error(waiting_.limit == 0 ? "no provider" : "too many requests"));
}

bool RequestRestResource::mayWait(std::string_view name) const {
    const Name* known = names_->find(name);
    if (!known && names_->byName.size() >= kMaximumNames)
        return false;
    return (known ? known->queue.size() : 0) < waiting_.limit && names_->queued < waiting_.total;
}

void RequestRestResource::enqueue(RestResourceContext& context, std::string_view name) {
    names_->byName[std::string(name)].queue.push_back(requestOf(context));
    ++names_->queued;
}

// ---- PUSH, POP and drops ---------------------------------------------------------

bool RequestRestResource::handleRestMessage_PUSH(RestResourceContext& context,
                                                 const PathView& path) {
    const Client author = context.getAuthorResource();
    if (kindOf(path) != Kind::Name || !author)
        return false;
    if (!names_->find(path.current()) && names_->byName.size() >= kMaximumNames)
        return false;
    const auto place = names_->byName.try_emplace(std::string(path.current())).first;
    place->second.provider = std::make_shared<RequestProvider>(author, path.full());
    names_->sendQueued(context, *place);
    return true;
}

bool RequestRestResource::handleRestMessage_POP(RestResourceContext& context,
                                                const PathView& path) {
    if (kindOf(path) != Kind::Name)
        return false;
    const auto place = names_->byName.find(path.current());
    if (place == names_->byName.end())
        return true;
    Departures departures;
    forgetProvider(place->second, context.getAuthorResource(), departures);
    names_->eraseUnused(place);
    return true;
}

void RequestRestResource::handleDroppedConnection(
    RestResourceContext&, const PathView&,
    const std::shared_ptr<RestResourceConnection>& connection) {
    Departures departures;
    for (auto& entry : names_->byName) {
        forgetProvider(entry.second, connection, departures);
        names_->queued -= forgetAsker(entry.second, connection, departures);
    }
    std::erase_if(names_->byName, [](const auto& entry) { return entry.second.isUnused(); });
}

}  // namespace plr::rest
