#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "plr/base/export.h"
#include "plr/rest/assertion_state.h"
#include "plr/rest/rest_module.h"

// An AssertionProvider is the client that grants an assertion of a server
// (assertion_resource.h). It registers through the module, again after each
// reconnect, and unregisters when it is dropped.
//
//   rest::AssertionProvider power(module, "/assertions/keep_radio_on",
//       [&](const rest::AssertionAcquireState& wanted) {
//           if (wanted.state == rest::AssertionState::kPending)
//               power.grant();        // now or later
//       });
//
// `handler` is called on the module's queue with each notification: kPending while
// somebody waits, else kGranted while somebody is granted, else kIdle; kIdle, with
// generation 0, when the connection to the server has ended.
//
// Owner:   whoever made it; not movable, so that its handler may use it.
// Queue:   the module's, for everything, destruction included.
namespace plr::rest {

class PLR_EXPORT AssertionProvider {
  public:
    using Handler = std::function<void(const AssertionAcquireState&)>;

    AssertionProvider(RestModule module, const std::string& path, Handler handler);
    ~AssertionProvider();
    AssertionProvider(const AssertionProvider&) = delete;
    AssertionProvider& operator=(const AssertionProvider&) = delete;

    // What was notified last.
    [[nodiscard]] const AssertionAcquireState& state() const noexcept;
    // Grants or revokes the generation that was notified last; nothing happens
    // before the first.
    void grant() const;
    void revoke() const;
    // to be written
};

}  // namespace plr::rest
