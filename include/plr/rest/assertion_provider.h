#pragma once

#include <functional>
#include <memory>
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
// generation 0, when the connection to the server that notified has ended.
//
// Owner:   whoever made it; not movable, so that its handler may use it, or drop it.
//          It keeps the module's state, and its connection.
// Queue:   the module's, for everything, destruction included.
namespace plr::rest {

class PLR_EXPORT AssertionProvider {
  public:
    using Handler = std::function<void(const AssertionAcquireState&)>;

    // Throws std::invalid_argument when the module observes path/provider already.
    AssertionProvider(const RestModule& module, const std::string& path, Handler handler);
    ~AssertionProvider();
    AssertionProvider(const AssertionProvider&) = delete;
    AssertionProvider& operator=(const AssertionProvider&) = delete;

    // What was notified last on this connection; kIdle, generation 0, before.
    [[nodiscard]] const AssertionAcquireState& state() const noexcept;
    // Grants or revokes the generation that was notified last. Nothing happens
    // before the first, and while disconnected.
    void grant() const;
    void revoke() const;

  private:
    class Registration;

    std::shared_ptr<Registration> registration_;
};

}  // namespace plr::rest
