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
// after each reconnect, and releases when it is dropped. `handler` is called with
// each change, on the module's queue: true when the assertion is granted, false when
// the grant is taken or the connection to the server has ended. It is not granted
// at first.
//
// After a revocation the handle waits until it is dropped, or asked to reassert().
// Several handles of one module for one path are one client to the server: they
// assert with the first, release with the last, and each is told the present state.
//
// Owner:   whoever made it; movable. It keeps the module's state.
// Queue:   constructed, moved and asked on the module's queue. It may be dropped on
//          any thread; dropped on the queue, `handler` is not called any more.
namespace plr::rest {

class PLR_EXPORT AssertionHandle {
  public:
    using Handler = std::function<void(bool granted)>;

    AssertionHandle() noexcept = default;  // holds nothing
    AssertionHandle(const RestModule& module, const std::string& path, Handler handler);
    ~AssertionHandle();
    AssertionHandle(AssertionHandle&& other) noexcept;
    AssertionHandle& operator=(AssertionHandle&& other) noexcept;

    [[nodiscard]] bool isGranted() const;
    // Asks for a grant again after a revocation; nothing happens otherwise.
    void reassert() const;
    // Releases now.
    void reset();
    // to be written
};

}  // namespace plr::rest
