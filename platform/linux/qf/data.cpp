#include "qf/data.h"

#include "platform/linux/qf/value.h"

namespace {

qf_data* make_elsewhere(const void* bytes, std::size_t length, QfAllocatorRef owner) noexcept {
    auto* const made = qf::make<qf::elsewhere<qf_data>>(0, length, bytes, length, owner);
    if (bytes)
        made->bytes = bytes;
    return made;
}

}  // namespace

extern "C" {

QfDataRef qf_data_create(const void* bytes, size_t length) {
    auto* const made = qf::make<qf_data>(length, length);
    if (length > 0)
        std::memcpy(made->inline_bytes(), bytes, length);
    return made;
}

QfDataRef qf_data_create_with_allocator(QfAllocatorRef allocator, const void* bytes,
                                        size_t length) {
    if (!allocator || length == 0)
        return qf_data_create(bytes, length);
    void* const copy = qf::allocate_from(allocator, length);
    if (!copy)
        return nullptr;
    std::memcpy(copy, bytes, length);
    return make_elsewhere(copy, length, allocator);
}

QfDataRef qf_data_create_no_copy(const void* bytes, size_t length, QfAllocatorRef deallocator) {
    return make_elsewhere(bytes, length, deallocator);
}

const void* qf_data_get_bytes_ptr(QfDataRef data) {
    return qf::checked(data)->bytes;
}
size_t qf_data_get_length(QfDataRef data) {
    return qf::checked(data)->length;
}

}  // extern "C"
