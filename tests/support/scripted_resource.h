#pragma once

#include <functional>
#include <utility>

#include "plr/rest.h"

namespace plr::test {

// A resource that does what a test says with GET, and with SET or PUSH.
class ScriptedResource : public rest::RestResource {
  public:
    using Handler = std::function<bool(rest::RestResourceContext&, const rest::PathView&)>;
    explicit ScriptedResource(Handler get, Handler other = {})
        : get_(std::move(get)), other_(std::move(other)) {}
    bool handleRestMessage_GET(rest::RestResourceContext& context,
                               const rest::PathView& path) override {
        return get_ && get_(context, path);
    }
    bool handleRestMessage_SET(rest::RestResourceContext& context,
                               const rest::PathView& path) override {
        return other_ && other_(context, path);
    }
    bool handleRestMessage_PUSH(rest::RestResourceContext& context,
                                const rest::PathView& path) override {
        return other_ && other_(context, path);
    }

  private:
    const Handler get_;
    const Handler other_;
};

}  // namespace plr::test
