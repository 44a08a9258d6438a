#pragma once

#include <cstddef>
#include <memory>
#include <string_view>

#include "plr/base/export.h"
#include "plr/ipc/object.h"
#include "plr/rest/resource.h"

// A RequestRestResource passes requests to those who answer them: one provider
// for each name, a client of the server as those who ask are.
//
//   NAME            GET asks: the value goes to the provider, whose answer comes
//                   back; PUSH makes the sender the provider, POP ends that
//   NAME/provider   GET: the provider's name; null without one
//   NAME/waiting    GET: how many requests have no answer yet
//   (nothing), *    GET: the names; a dictionary by name of dictionaries with
//                   "provider" and "waiting"
//
// Everything else is not handled. RestModule::registerAsRequestSink(path, …)
// provides, sendRequest(path, …) asks.
//
// A request may come without a value, as any, and may want no reply. It is sent on
// as a GET of the path at which the provider registered; its author is the asking
// client's name. The answer may be an error too.
//
// No provider:   a request is refused at once with the error "no provider";
//                with `queue_requests` it waits for one, within the limits given
//                there, over which it is refused with "too many requests".
// Provider gone: what it had not answered is answered with the error "provider
//                is gone", and never sent to another: it may have been carried
//                out. The same after its POP: a client that has deregistered
//                drops what still reaches it. What waits in the queue keeps
//                waiting.
// Asker gone:    what it waited for counts no more; its place in the queue is
//                free. One that stays and gives its request up is not noticed.
// A second provider takes the first one's place, as when a provider has been
// restarted before its end was noticed; what the first has, it may still answer.
//
// A name is listed while it has a provider or requests without an answer.
//
// Owner:   the tree. Providers are held weakly; who is not registered at
//          "/connections" cannot be one (not handled).
// Queue:   the server's.
// Order:   requests reach the provider in the order in which they came.
// Bounds:  kMaximumWaiting requests without an answer for each name, queued ones
//          included; further ones are refused with "too many requests".
//          kMaximumNames names; a PUSH of further ones is not handled.
// Cost:    a client that drops costs a walk through all that wait.
namespace plr::rest {

// Selects waiting for a provider.
struct queue_requests {
    std::size_t limit = 64;    // requests that wait for one, for each name
    std::size_t total = 4096;  // and for all names together
};

class PLR_EXPORT RequestRestResource : public RestResource {
  public:
    static constexpr std::size_t kMaximumWaiting = 1024;
    static constexpr std::size_t kMaximumNames = 65'536;

    RequestRestResource();
    explicit RequestRestResource(queue_requests waiting);
    ~RequestRestResource() override;

    bool handleRestMessage_GET(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_PUSH(RestResourceContext& context, const PathView& path) override;
    bool handleRestMessage_POP(RestResourceContext& context, const PathView& path) override;
    void handleDroppedConnection(
        RestResourceContext& context, const PathView& path,
        const std::shared_ptr<RestResourceConnection>& connection) override;

  private:
    struct Names;  // shared with the answers that are on their way

    void handleMessage_Root_GET(RestResourceContext& context) const;
    void handleMessage_DumpState_GET(RestResourceContext& context) const;
    void handleMessage_Name_GET(RestResourceContext& context, std::string_view name);
    [[nodiscard]] bool mayWait(std::string_view name) const;
    void enqueue(RestResourceContext& context, std::string_view name);

    const queue_requests waiting_;
    const std::shared_ptr<Names> names_;
};

}  // namespace plr::rest
