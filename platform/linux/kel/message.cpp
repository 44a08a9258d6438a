#include "platform/linux/kel/message.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <new>
#include <stdexcept>

const std::string* kel_message::find(std::string_view key) const noexcept {
    const auto found = std::find_if(fields.begin(), fields.end(),
                                    [key](const kel::field& each) { return each.key == key; });
    return found == fields.end() ? nullptr : &found->value;
}

void kel_message::set(std::string_view key, std::string_view value) {
    const auto found = std::find_if(fields.begin(), fields.end(),
                                    [key](const kel::field& each) { return each.key == key; });
    if (found == fields.end())
        fields.push_back({std::string(key), std::string(value)});
    else
        found->value.assign(value);
}

extern "C" {

kel_message_t kel_new(uint32_t type) {
    return type == 0 ? new (std::nothrow) kel_message : nullptr;
}

int kel_set(kel_message_t message, const char* key, const char* value) {
    return kel_set_bytes(message, key, value, value ? std::strlen(value) : 0);
}

int kel_set_bytes(kel_message_t message, const char* key, const void* value, size_t length) {
    if (!message)
        return 0;
    if (!key)
        return EINVAL;
    try {
        const auto* bytes = static_cast<const char*>(value);
        message->set(key, bytes ? std::string_view(bytes, length) : std::string_view());
        return 0;
    } catch (const std::bad_alloc&) {
        return ENOMEM;
    } catch (const std::length_error&) {
        return ENOMEM;
    }
}

void kel_free(kel_message_t message) {
    delete message;
}

}  // extern "C"
