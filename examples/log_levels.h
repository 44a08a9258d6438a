#pragma once

#include <memory>

#include "plr/log.h"
#include "plr/rest.h"

namespace radio {

// The levels of a program's log domains, as properties that clients set while
// it runs: radio.modem to "Debug"; null takes it back. What is no level is
// refused. A GET of the resource itself tells the log's configuration.
//
// Owner:   the tree of resources.
// Queue:   the REST server's.
class LogLevels : public plr::rest::PropertyRestResource {
  public:
    // `logger` says what changed, and has the server whose levels these are.
    explicit LogLevels(std::shared_ptr<plr::Logger> logger)
        : PropertyRestResource(true), logger_(std::move(logger)) {}

    bool handleRestMessage_GET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override;
    bool handleRestMessage_SET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override;

  private:
    const std::shared_ptr<plr::Logger> logger_;
};

}  // namespace radio
