#include "plr/ipc/vox_server_helper.h"

namespace plr {

VoxServerHelper::VoxServerHelper(vox::connection listener) noexcept
    : listener_(std::move(listener)) {}

VoxServerHelper::~VoxServerHelper() {
    setListener(nullptr);
}

void VoxServerHelper::setListener(vox::connection listener) {
    listener_.cancel();
    listener_ = std::move(listener);
}

void VoxServerHelper::flush(const dispatch::group& group) const {
    detail::flush(listener_, group);
}

void detail::flush(const vox::connection& connection, const dispatch::group& group) {
    if (!connection)
        return;
    // The session leaves the group when the block is released, after its run.
    connection.send_barrier(dispatch::block<void()>([session = dispatch::group_session(group)] {}));
}

}  // namespace plr
