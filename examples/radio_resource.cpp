#include "examples/radio_resource.h"

#include <memory>
#include <string>

namespace radio {
namespace {

using namespace plr::rest;

constexpr std::string_view kSms = "sms";

PathView behind(PathView path) {
    path.advance(1);
    return path;
}

}  // namespace

bool RadioResource::handleMessage(RestResourceContext& context, const PathView& path) {
    if (path.current() == kSms)
        return sms_.handleMessage(context, behind(path));
    return PropertyRestResource::handleMessage(context, path);
}

void RadioResource::handleDroppedConnection(
    RestResourceContext& context, const PathView& path,
    const std::shared_ptr<RestResourceConnection>& connection) {
    PropertyRestResource::handleDroppedConnection(context, path, connection);
    const std::string smsPath = path_join(path.full(), kSms);
    sms_.handleDroppedConnection(context, PathView(smsPath), connection);
}

void RadioResource::cleanupWatchers(RestResourceContext& context, const PathView& path) {
    PropertyRestResource::cleanupWatchers(context, path);
    const std::string smsPath = path_join(path.full(), kSms);
    sms_.cleanupWatchers(context, PathView(smsPath));
}

Reached RadioResource::reached(Operation operation, const PathView& path) const {
    if (path.current() == kSms)
        return reachedBy(sms_, operation, behind(path));
    return PropertyRestResource::reached(operation, path);
}

}  // namespace radio
