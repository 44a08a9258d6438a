#include <cstring>
#include <new>

#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

using namespace vox_values;

namespace {

constexpr std::uint32_t kUsualRoom = 4;

vox_object* retained(vox_object* value) noexcept {
    return value ? vox_retain(value) : vox_null_create();
}

}  // namespace

namespace vox_values {

vox_array_object* make_array(std::uint32_t room) noexcept {
    const std::size_t bytes = sizeof(vox_array_object) + room * sizeof(vox_object*);
    auto* array = new (allocate(bytes)) vox_array_object(VOX_TYPE_ARRAY);
    array->inline_capacity = static_cast<std::uint16_t>(room);
    array->capacity = room;
    array->items = array->inline_items();
    return array;
}

void reserve(vox_array_object& array, std::uint32_t capacity) noexcept {
    if (capacity <= array.capacity)
        return;
    auto** items = static_cast<vox_object**>(allocate(capacity * sizeof(vox_object*)));
    if (array.count > 0)
        std::memcpy(items, array.items, array.count * sizeof(vox_object*));
    if (array.items != array.inline_items())
        deallocate(array.items);
    array.items = items;
    array.capacity = capacity;
}

void append(vox_array_object& array, vox_object* value) noexcept {
    if (array.count == array.capacity)
        reserve(array, grown_capacity(array.capacity));
    array.items[array.count++] = value;
}

}  // namespace vox_values

vox_object_t vox_array_create(void) {
    return make_array(kUsualRoom);
}

size_t vox_array_get_count(vox_object_t array) {
    const auto* list = as<vox_array_object>(array, VOX_TYPE_ARRAY);
    return list ? list->count : 0;
}

vox_object_t vox_array_get_value(vox_object_t array, size_t index) {
    const auto* list = as<vox_array_object>(array, VOX_TYPE_ARRAY);
    return list && index < list->count ? list->items[index] : nullptr;
}

void vox_array_append_value(vox_object_t array, vox_object_t value) {
    if (auto* list = as<vox_array_object>(array, VOX_TYPE_ARRAY))
        append(*list, retained(value));
}

void vox_array_set_value(vox_object_t array, size_t index, vox_object_t value) {
    auto* list = as<vox_array_object>(array, VOX_TYPE_ARRAY);
    if (!list || index >= list->count)
        return;
    vox_object* old = list->items[index];
    list->items[index] = retained(value);
    vox_release(old);
}
