#pragma once

#include <functional>
#include <memory>
#include <string>

#include "plr/base/export.h"
#include "plr/rest/rest_module.h"

// An AssertionHandle holds an assertion of a server (assertion_resource.h) for as
// long as it exists.
//
//   rest::AssertionHandle radioOn(module, "/assertions/keep_radio_on",
//                                 [](bool granted) { … });
//
// It asserts through the module, at once or as soon as that is connected, and again
// with each new connection, and releases when it is dropped. `handler` is called with
// each change, on the module's queue: true when the assertion is granted, false when
// the grant is taken or the connection to the server has ended, in whatever way. It
// is not granted at first.
//
// After a revocation the handle waits until it is dropped, asked to reassert(), or
// the module has a new connection. Several handles of one module for one path are one
// client to the server: they assert with the first and release with the last. One
// that comes late is told of the grant soon after its construction.
//
// Owner:   whoever made it; movable. It keeps the module's state, and its connection.
// Queue:   constructed, moved and asked on the module's queue. It may be dropped, and
//          reset, on any thread. Once that has happened on the queue, in a handler
//          too, `handler` is not called any more; elsewhere it may be until the queue
//          has come to it. `handler` is destroyed on the queue, or with a handle that
//          is dropped there.
namespace plr::rest {

class PLR_EXPORT AssertionHandle {
  public:
    using Handler = std::function<void(bool granted)>;

    AssertionHandle() noexcept = default;  // holds nothing
    // Throws std::invalid_argument when the module observes `path` for another
    // purpose.
    AssertionHandle(const RestModule& module, const std::string& path, Handler handler);
    ~AssertionHandle();
    AssertionHandle(AssertionHandle&& other) noexcept;
    AssertionHandle& operator=(AssertionHandle&& other) noexcept;

    // What `handler` was told last.
    [[nodiscard]] bool isGranted() const;
    // Asks for a grant again after a revocation; nothing happens otherwise.
    void reassert() const;
    // Releases now.
    void reset();

  private:
    class Assertion;
    struct Share;

    std::shared_ptr<Share> share_;
};

}  // namespace plr::rest
