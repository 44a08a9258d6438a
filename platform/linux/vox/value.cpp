#include <time.h>

#include <bit>
#include <cstdlib>
#include <new>

#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

using namespace vox_values;

namespace {

struct singletons {
    vox_object null{VOX_TYPE_NULL};
    vox_number_object no{VOX_TYPE_BOOL};
    vox_number_object yes{VOX_TYPE_BOOL};
    constexpr singletons() noexcept { yes.bits = 1; }
};
constinit singletons the;

vox_object* make_number(vox_type type, std::uint64_t bits) noexcept {
    auto* number = new (allocate(sizeof(vox_number_object))) vox_number_object(type);
    number->bits = bits;
    return number;
}

std::uint64_t number_bits(vox_object* object, vox_type type) noexcept {
    const auto* number = as<vox_number_object>(object, type);
    return number ? number->bits : 0;
}

}  // namespace

namespace vox_values {

void* allocate(std::size_t bytes) noexcept {
    void* memory = std::malloc(bytes);
    PLR_ASSERT(memory, "out of memory");
    return memory;
}

void deallocate(void* memory) noexcept {
    std::free(memory);
}

std::uint32_t grown_capacity(std::uint32_t capacity) noexcept {
    PLR_ASSERT(capacity <= UINT32_MAX / 2, "a container has too many elements");
    return capacity < 4 ? 8 : 2 * capacity;
}

bool drop_reference(vox_object* object) noexcept {
    const std::uint32_t before = object->references.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before != 0, "a Vox object was released too often");
    return before == 1;
}

}  // namespace vox_values

vox_object_t vox_retain(vox_object_t object) {
    if (object && is_counted(object))
        object->references.fetch_add(1, std::memory_order_relaxed);
    return object;
}

void vox_release(vox_object_t object) {
    if (object && is_counted(object) && drop_reference(object))
        destroy(object);
}

vox_type_t vox_get_type(vox_object_t object) {
    return type_of(object);
}

const char* vox_type_get_name(vox_type_t type) {
    switch (type) {
        case VOX_TYPE_NULL:
            return "null";
        case VOX_TYPE_BOOL:
            return "bool";
        case VOX_TYPE_INT64:
            return "int64";
        case VOX_TYPE_UINT64:
            return "uint64";
        case VOX_TYPE_DOUBLE:
            return "double";
        case VOX_TYPE_DATE:
            return "date";
        case VOX_TYPE_DATA:
            return "data";
        case VOX_TYPE_STRING:
            return "string";
        case VOX_TYPE_UUID:
            return "uuid";
        case VOX_TYPE_ARRAY:
            return "array";
        case VOX_TYPE_DICTIONARY:
            return "dictionary";
        case VOX_TYPE_ERROR:
            return "error";
        case VOX_TYPE_CONNECTION:
            return "connection";
        case VOX_TYPE_ENDPOINT:
            return "endpoint";
        case VOX_TYPE_FD:
            return "fd";
    }
    return "unknown";
}

vox_object_t vox_null_create(void) {
    return &the.null;
}

vox_object_t vox_bool_create(int value) {
    return value ? &the.yes : &the.no;
}
int vox_bool_get_value(vox_object_t boolean) {
    return boolean == &the.yes;
}

vox_object_t vox_int64_create(int64_t value) {
    return make_number(VOX_TYPE_INT64, static_cast<std::uint64_t>(value));
}
int64_t vox_int64_get_value(vox_object_t number) {
    return static_cast<std::int64_t>(number_bits(number, VOX_TYPE_INT64));
}

vox_object_t vox_uint64_create(uint64_t value) {
    return make_number(VOX_TYPE_UINT64, value);
}
uint64_t vox_uint64_get_value(vox_object_t number) {
    return number_bits(number, VOX_TYPE_UINT64);
}

vox_object_t vox_double_create(double value) {
    return make_number(VOX_TYPE_DOUBLE, std::bit_cast<std::uint64_t>(value));
}
double vox_double_get_value(vox_object_t number) {
    return std::bit_cast<double>(number_bits(number, VOX_TYPE_DOUBLE));
}

vox_object_t vox_date_create(int64_t nanoseconds) {
    return make_number(VOX_TYPE_DATE, static_cast<std::uint64_t>(nanoseconds));
}
vox_object_t vox_date_create_from_current(void) {
    timespec now;
    clock_gettime(CLOCK_REALTIME, &now);
    return vox_date_create(now.tv_sec * 1'000'000'000 + now.tv_nsec);
}
int64_t vox_date_get_value(vox_object_t date) {
    return static_cast<std::int64_t>(number_bits(date, VOX_TYPE_DATE));
}
