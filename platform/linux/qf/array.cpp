#include "platform/linux/qf/value.h"
#include "qf/collection.h"

namespace {

constexpr std::uint32_t kUsualRoom = 4;

qf_array* make_array(std::uint32_t room) noexcept {
    return qf::make<qf_array>(room * sizeof(QfTypeRef), room);
}

void grow(qf_array* array) noexcept {
    const std::uint32_t capacity = qf::grown_capacity(array->capacity);
    auto* const items = static_cast<QfTypeRef*>(qf::allocate(capacity * sizeof(QfTypeRef)));
    if (array->count > 0)
        std::memcpy(items, array->items, array->count * sizeof(QfTypeRef));
    if (array->items != array->inline_items())
        std::free(array->items);
    array->items = items;
    array->capacity = capacity;
}

void append(qf_array* array, QfTypeRef value) noexcept {
    if (array->count == array->capacity)
        grow(array);
    array->items[array->count++] = qf::retained(value);
}

}  // namespace

extern "C" {

QfArrayRef qf_array_create(const QfTypeRef* values, size_t count) {
    PLR_ASSERT(count < UINT32_MAX, "a collection has too many elements");
    qf_array* const array = make_array(static_cast<std::uint32_t>(count));
    for (std::size_t i = 0; i < count; i++)
        append(array, values[i]);
    return array;
}

QfMutableArrayRef qf_array_create_mutable(void) {
    return make_array(kUsualRoom);
}

size_t qf_array_get_count(QfArrayRef array) {
    return qf::checked(array)->count;
}

QfTypeRef qf_array_get_value(QfArrayRef array, size_t index) {
    return index < qf::checked(array)->count ? array->items[index] : nullptr;
}

void qf_array_append_value(QfMutableArrayRef array, QfTypeRef value) {
    append(qf::checked(array), value);
}

}  // extern "C"
