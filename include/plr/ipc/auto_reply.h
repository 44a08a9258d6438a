#pragma once

#include <memory>
#include <utility>

#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"

// vox::auto_reply is the only owner of a reply, which is sent when the owner
// goes: exactly once, whatever path the handler of the request took.
//
// Owner:   whoever holds it; movable.
// Threads: the reply is sent on the thread that drops it.
namespace vox {

class PLR_EXPORT auto_reply {
  public:
    // Holds nothing, sends nothing.
    auto_reply() noexcept = default;
    // Sends `reply` where the request came from.
    explicit auto_reply(dict reply);
    // Sends `reply` on `connection`.
    auto_reply(dict reply, connection connection);

    // The reply to fill in; the null object without a holder.
    [[nodiscard]] dict get() const { return holder_ ? *holder_ : dict(); }
    // When there is a holder: replaces its dictionary by `reply`, which is left
    // holding the null object.
    void connect(dict&& reply);

    // What ends a reply: sends it on its remote connection, or on the given one,
    // when it is a dictionary; then frees the holder. Null is ignored.
    static void deleter(dict* holder);
    static void deleter_with_conn(dict* holder, const connection& connection);

  private:
    // Calls the one of the two that fits.
    struct Deleter {
        Deleter() noexcept : hasConnection(false) {}
        explicit Deleter(connection given) noexcept : to(std::move(given)), hasConnection(true) {}
        void operator()(dict* holder) const;
        connection to;
        bool hasConnection;  // else to the reply's remote connection
    };
    std::unique_ptr<dict, Deleter> holder_;
};

}  // namespace vox
