#include <utility>
#include <vector>

#include "platform/linux/vox/value_layout.h"

using namespace vox_values;

namespace {

using pair = std::pair<vox_object*, vox_object*>;

template <class Object>
const Object& ref(vox_object* object) noexcept {
    return *static_cast<const Object*>(object);
}

bool equal_errors(const vox_error_object& left, const vox_error_object& right) noexcept {
    return left.code == right.code && vox_equal(left.description, right.description);
}

// Whether two arrays may be equal; the elements to compare go to `open`.
bool open_arrays(const vox_array_object& left, const vox_array_object& right,
                 std::vector<pair>& open) {
    if (left.count != right.count)
        return false;
    for (std::uint32_t i = 0; i < left.count; i++)
        open.emplace_back(left.items[i], right.items[i]);
    return true;
}

bool open_dictionaries(const vox_dictionary_object& left, const vox_dictionary_object& right,
                       std::vector<pair>& open) {
    if (left.count != right.count)
        return false;
    for (std::uint32_t i = 0; i < left.count; i++) {
        const vox_dictionary_entry* other = find(right, left.entries[i].key_view());
        if (!other)
            return false;
        open.emplace_back(left.entries[i].value, other->value);
    }
    return true;
}

// Compares two objects; elements of containers that remain to be compared go to `open`.
bool equal_here(vox_object* left, vox_object* right, std::vector<pair>& open) {
    if (left == right)
        return true;
    const vox_type type = type_of(left);
    if (type != type_of(right))
        return false;
    switch (type) {
        case VOX_TYPE_NULL:
            return true;
        case VOX_TYPE_INT64:
        case VOX_TYPE_UINT64:
        case VOX_TYPE_DOUBLE:
        case VOX_TYPE_DATE:
            return ref<vox_number_object>(left).bits == ref<vox_number_object>(right).bits;
        case VOX_TYPE_DATA:
        case VOX_TYPE_STRING:
        case VOX_TYPE_UUID:
            return ref<vox_bytes_object>(left).view() == ref<vox_bytes_object>(right).view();
        case VOX_TYPE_ERROR:
            return equal_errors(ref<vox_error_object>(left), ref<vox_error_object>(right));
        case VOX_TYPE_ARRAY:
            return open_arrays(ref<vox_array_object>(left), ref<vox_array_object>(right), open);
        case VOX_TYPE_DICTIONARY:
            return open_dictionaries(ref<vox_dictionary_object>(left),
                                     ref<vox_dictionary_object>(right), open);
        case VOX_TYPE_BOOL:
        case VOX_TYPE_CONNECTION:
        case VOX_TYPE_ENDPOINT:
        case VOX_TYPE_FD:
            break;
    }
    return false;
}

}  // namespace

int vox_equal(vox_object_t left, vox_object_t right) {
    std::vector<pair> open;
    if (!equal_here(left, right, open))
        return 0;
    while (!open.empty()) {
        const auto [one, other] = open.back();
        open.pop_back();
        if (!equal_here(one, other, open))
            return 0;
    }
    return 1;
}
