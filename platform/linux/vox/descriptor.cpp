// Descriptors and endpoints: objects that own one file descriptor.
#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <new>

#include "platform/linux/vox/value_layout.h"

using namespace vox_values;

namespace vox_values {

vox_object* adopt_descriptor(vox_type type, int descriptor, vox_custom_object* from) noexcept {
    auto* object = new (allocate(sizeof(vox_descriptor_object))) vox_descriptor_object(type);
    object->descriptor = descriptor;
    object->from = from;
    return object;
}

void close_descriptor(int descriptor, vox_custom_object* from) noexcept {
    close(descriptor);
    if (from)
        from->vtable->descriptor_gone(from);
}

int duplicate_descriptor(vox_object* object) noexcept {
    const vox_type type = type_of(object);
    if (type != VOX_TYPE_FD && type != VOX_TYPE_ENDPOINT) {
        errno = EINVAL;
        return -1;
    }
    return fcntl(static_cast<vox_descriptor_object*>(object)->descriptor, F_DUPFD_CLOEXEC, 0);
}

}  // namespace vox_values

vox_object_t vox_fd_create(int descriptor) {
    const int copy = fcntl(descriptor, F_DUPFD_CLOEXEC, 0);
    return copy < 0 ? vox_null_create() : adopt_descriptor(VOX_TYPE_FD, copy);
}

int vox_fd_dup(vox_object_t fd) {
    if (type_of(fd) != VOX_TYPE_FD) {
        errno = EINVAL;
        return -1;
    }
    return duplicate_descriptor(fd);
}
