#pragma once

#include <memory>

#include "plr/log/vox_log_server.h"
#include "plr/rest.h"

namespace radio {

// The program's log, open to its clients: a GET answers an endpoint, for a
// plr::VoxLogger to connect to.
//
// Owner:   the tree of resources.
// Queue:   the REST server's.
// Logs:    who comes and goes, in the domain radio.log.
class RemoteLog : public plr::rest::RestResource {
  public:
    explicit RemoteLog(const std::shared_ptr<plr::LogServer>& logServer)
        : server_(plr::VoxLogServer::create(logServer, "remote log", "radio.log")) {
        server_->startListeningOn(vox::listener::create_anonymous());
        endpoint_ = server_->getEndpoint();
    }

    bool handleRestMessage_GET(plr::rest::RestResourceContext& context,
                               const plr::rest::PathView& path) override {
        return !path && context.sendReplyWithValue(endpoint_);
    }

  private:
    const std::shared_ptr<plr::VoxLogServer> server_;
    vox::endpoint endpoint_;  // one for all: each that is made costs a descriptor
};

}  // namespace radio
