#include "platform/linux/vox/value_layout.h"

// Taking objects apart. While a container's last element is taken apart, that
// element's slot holds the container's own parent, so that neither the depth of
// a value nor its size costs stack or memory.
namespace vox_values {
namespace {

vox_object*& last_value(vox_container_object* container) noexcept {
    if (container->type == VOX_TYPE_ARRAY)
        return static_cast<vox_array_object*>(container)->items[container->count - 1];
    return static_cast<vox_dictionary_object*>(container)->entries[container->count - 1].value;
}

void drop_last(vox_container_object* container) noexcept {
    container->count--;
    if (container->type == VOX_TYPE_DICTIONARY)
        free_key(static_cast<vox_dictionary_object*>(container)->entries[container->count]);
}

void leave_remote(vox_dictionary_object& dictionary) noexcept {
    auto* remote = static_cast<vox_custom_object*>(dictionary.remote);
    if (remote && dictionary.reply_id != 0)
        remote->vtable->message_gone(remote, dictionary);
    vox_release(remote);
}

void free_container(vox_container_object* container) noexcept {
    if (container->type == VOX_TYPE_ARRAY) {
        auto* array = static_cast<vox_array_object*>(container);
        if (array->items != array->inline_items())
            deallocate(array->items);
    } else {
        auto* dictionary = static_cast<vox_dictionary_object*>(container);
        if (dictionary->entries != dictionary->inline_entries())
            deallocate(dictionary->entries);
        deallocate(dictionary->index);
        leave_remote(*dictionary);
    }
    deallocate(container);
}

void free_leaf(vox_object* object) noexcept {
    switch (object->type) {
        case VOX_TYPE_CONNECTION: {
            auto* custom = static_cast<vox_custom_object*>(object);
            custom->vtable->destroy(custom);
            return;
        }
        case VOX_TYPE_FD:
        case VOX_TYPE_ENDPOINT: {
            const auto* owner = static_cast<vox_descriptor_object*>(object);
            close_descriptor(owner->descriptor, owner->from);
            break;
        }
        case VOX_TYPE_ERROR:
            vox_release(static_cast<vox_error_object*>(object)->description);
            break;
        default:
            break;
    }
    deallocate(object);
}

}  // namespace

void destroy(vox_object* object) noexcept {
    if (!is_container(object))
        return free_leaf(object);
    auto* current = static_cast<vox_container_object*>(object);
    vox_container_object* parent = nullptr;
    while (current) {
        if (current->count == 0) {
            free_container(current);
            current = parent;
            if (current) {
                parent = static_cast<vox_container_object*>(last_value(current));
                drop_last(current);
            }
            continue;
        }
        vox_object* child = last_value(current);
        if (!is_counted(child) || !drop_reference(child)) {
            drop_last(current);
        } else if (!is_container(child)) {
            free_leaf(child);
            drop_last(current);
        } else {
            last_value(current) = parent;
            parent = current;
            current = static_cast<vox_container_object*>(child);
        }
    }
}

}  // namespace vox_values
