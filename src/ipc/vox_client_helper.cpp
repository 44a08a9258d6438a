#include "plr/ipc/vox_client_helper.h"

#include "plr/ipc/vox_server_helper.h"

namespace plr {

VoxClientHelper::VoxClientHelper() noexcept = default;

VoxClientHelper::~VoxClientHelper() {
    setServer(nullptr);
}

void VoxClientHelper::flush(const dispatch::group& group) const {
    detail::flush(server_, group);
}

void VoxClientHelper::setServer_internal(vox::connection server) {
    const vox::connection old = std::exchange(server_, std::move(server));
    if (old)
        old.send_barrier(dispatch::block<void()>([old] { old.cancel(); }));
}

}  // namespace plr
