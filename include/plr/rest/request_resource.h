#pragma once

#include <cstddef>

#include "plr/base/export.h"
#include "plr/rest/resource.h"

// A RequestRestResource passes requests to those who answer them: one provider
// for each name, a client of the server as those who ask are.
//
//   NAME            GET asks: the value goes to the provider, whose answer comes
//                   back; PUSH makes the sender the provider, POP ends that
//   NAME/provider   GET: the provider's name; null without one
//   NAME/waiting    GET: how many requests have no answer yet
//   (nothing), *    GET: the names; provider and number of waiting of each
//
// RestModule::registerAsRequestSink(path, …) provides, sendRequest(path, …) asks.
// A request may come without a value, as any. It is sent on to the provider as a
// GET of the same path, with the asking client's name as author.
//
// No provider:   a request is refused at once with the error "no provider";
//                with `queue_requests` it waits for one, at most the number that
//                was given for each name, further ones are refused with "too
//                many requests".
// Provider gone: what it had not answered is answered with the error "provider
//                is gone", and never sent to another: it may have been carried
//                out. What waits in the queue keeps waiting.
// A second provider takes the first one's place, as when a provider has been
// restarted before its end was noticed; what the first has, it may still answer.
//
// Owner:   the tree. Providers are held weakly; who is not registered at
//          "/connections" cannot be one.
// Queue:   the server's.
// Order:   requests reach the provider in the order in which they came.
namespace plr::rest {

// Selects waiting for a provider.
struct queue_requests {
    std::size_t limit = 64;  // requests for each name
};

class PLR_EXPORT RequestRestResource : public RestResource {
  public:
    RequestRestResource();
    explicit RequestRestResource(queue_requests waiting);
    ~RequestRestResource() override;
    // to be written
};

}  // namespace plr::rest
