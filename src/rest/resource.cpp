#include "plr/rest/resource.h"

#include "plr/rest/operation.h"

namespace plr::rest {

RestResourceBase::~RestResourceBase() = default;

bool RestResourceBase::installSubResource(const PathView&, std::shared_ptr<RestResourceBase>&&) {
    return false;
}

void RestResourceBase::handleDroppedConnection(RestResourceContext&, const PathView&,
                                               const std::shared_ptr<RestResourceConnection>&) {}

RestResource::~RestResource() = default;

bool RestResource::handleMessage(RestResourceContext& context, const PathView& path) {
    switch (asOperation(context.getRestOperation())) {
        case Operation::kSet:
            return handleRestMessage_SET(context, path);
        case Operation::kGet:
            return handleRestMessage_GET(context, path);
        case Operation::kPush:
            return handleRestMessage_PUSH(context, path);
        case Operation::kPop:
            return handleRestMessage_POP(context, path);
        case Operation::kNotify:
            return handleRestMessage_NOTIFY(context, path);
        case Operation::kNone:
        case Operation::kPing:
            break;
    }
    return false;
}

bool RestResource::handleRestMessage_GET(RestResourceContext&, const PathView&) {
    return false;
}
bool RestResource::handleRestMessage_SET(RestResourceContext&, const PathView&) {
    return false;
}
bool RestResource::handleRestMessage_PUSH(RestResourceContext&, const PathView&) {
    return false;
}
bool RestResource::handleRestMessage_POP(RestResourceContext&, const PathView&) {
    return false;
}
bool RestResource::handleRestMessage_NOTIFY(RestResourceContext&, const PathView&) {
    return false;
}

}  // namespace plr::rest
