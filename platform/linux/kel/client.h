#pragma once

#include <memory>

#include "kel/kel.h"
#include "platform/linux/kel/sender.h"

// A client as its user holds it. All are known to the process, so that a forked
// child can give each a fresh sender.
struct kel_client {
    std::shared_ptr<kel::sender> sender;
};

namespace kel {

// Throw std::bad_alloc.
[[nodiscard]] kel_client* make_client(identity who);
void destroy_client(kel_client* client) noexcept;

// Where clients made from now on find the logs.
void set_places(places where);

}  // namespace kel
