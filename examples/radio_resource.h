#pragma once

#include <cstddef>

#include "plr/rest.h"

namespace radio {

// What the modem reported: properties, and below "sms" a map of the messages that came.
//
// Owner: the tree.
// Queue: the server's.
class RadioResource : public plr::rest::PropertyRestResource {
  public:
    explicit RadioResource(std::size_t mostMessages)
        : PropertyRestResource(true), sms_(mostMessages) {}

    bool handleMessage(plr::rest::RestResourceContext& context,
                       const plr::rest::PathView& path) override;
    void handleDroppedConnection(
        plr::rest::RestResourceContext& context, const plr::rest::PathView& path,
        const std::shared_ptr<plr::rest::RestResourceConnection>& connection) override;
    void cleanupWatchers(plr::rest::RestResourceContext& context,
                         const plr::rest::PathView& path) override;
    [[nodiscard]] plr::rest::Reached reached(plr::rest::Operation operation,
                                             const plr::rest::PathView& path) const override;

  private:
    plr::rest::MapRestResource sms_;
};

}  // namespace radio
