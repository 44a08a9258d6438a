#include <cstring>
#include <new>

#include "platform/linux/common/key_index.h"
#include "platform/linux/vox/value_layout.h"
#include "plr/base/assert.h"

using namespace vox_values;

namespace {

constexpr std::uint32_t kUsualRoom = 4;

void store_key(vox_dictionary_entry& entry, std::string_view key) noexcept {
    PLR_ASSERT(key.size() < UINT32_MAX, "a dictionary key is too long");
    entry.length = static_cast<std::uint32_t>(key.size());
    if (key.size() > vox_dictionary_entry::kInlineKey)
        entry.large = static_cast<char*>(allocate(key.size() + 1));
    char* text = key.size() > vox_dictionary_entry::kInlineKey ? entry.large : entry.small;
    if (!key.empty())
        std::memcpy(text, key.data(), key.size());
    text[key.size()] = '\0';
}

void rebuild_index(vox_dictionary_object& dictionary) noexcept {
    key_index::rebuild(dictionary.index, dictionary.entries, dictionary.count, dictionary.capacity);
}

void start_index(vox_dictionary_object& dictionary) noexcept {
    for (std::uint32_t i = 0; i < dictionary.count; i++)
        dictionary.entries[i].hash = key_index::hash_of(dictionary.entries[i].key_view());
    rebuild_index(dictionary);
}

vox_dictionary_entry* find_in_index(const vox_dictionary_object& dictionary,
                                    std::string_view key) noexcept {
    const std::uint32_t position = key_index::find(
        dictionary.index, dictionary.entries, key_index::hash_of(key),
        [key](const vox_dictionary_entry& entry) { return entry.key_view() == key; });
    return position == key_index::kNowhere ? nullptr : dictionary.entries + position;
}

void remove(vox_dictionary_object& dictionary, vox_dictionary_entry* entry) noexcept {
    vox_object* value = entry->value;
    free_key(*entry);
    dictionary.count--;
    const auto position = static_cast<std::uint32_t>(entry - dictionary.entries);
    std::memmove(entry, entry + 1, (dictionary.count - position) * sizeof *entry);
    if (dictionary.index)
        rebuild_index(dictionary);
    vox_release(value);
}

void replace(vox_dictionary_entry& entry, vox_object* value) noexcept {
    vox_object* old = entry.value;
    entry.value = vox_retain(value);
    vox_release(old);
}

}  // namespace

namespace vox_values {

vox_dictionary_object* make_dictionary(std::uint32_t room) noexcept {
    const std::size_t bytes = sizeof(vox_dictionary_object) + room * sizeof(vox_dictionary_entry);
    auto* dictionary = new (allocate(bytes)) vox_dictionary_object(VOX_TYPE_DICTIONARY);
    dictionary->inline_capacity = static_cast<std::uint16_t>(room);
    dictionary->capacity = room;
    dictionary->entries = dictionary->inline_entries();
    return dictionary;
}

void reserve(vox_dictionary_object& dictionary, std::uint32_t capacity) noexcept {
    if (capacity <= dictionary.capacity)
        return;
    auto* entries =
        static_cast<vox_dictionary_entry*>(allocate(capacity * sizeof(vox_dictionary_entry)));
    if (dictionary.entries)
        std::memcpy(entries, dictionary.entries, dictionary.count * sizeof *entries);
    if (dictionary.entries != dictionary.inline_entries())
        deallocate(dictionary.entries);
    dictionary.entries = entries;
    dictionary.capacity = capacity;
    if (dictionary.index)
        rebuild_index(dictionary);
}

void free_key(vox_dictionary_entry& entry) noexcept {
    if (entry.length > vox_dictionary_entry::kInlineKey)
        deallocate(entry.large);
}

void append(vox_dictionary_object& dictionary, std::string_view key, vox_object* value) noexcept {
    if (dictionary.count == dictionary.capacity)
        reserve(dictionary, grown_capacity(dictionary.capacity));
    vox_dictionary_entry& entry = dictionary.entries[dictionary.count++];
    entry.value = value;
    store_key(entry, key);
    if (dictionary.index) {
        entry.hash = key_index::hash_of(key);
        key_index::add(dictionary.index, entry.hash, dictionary.count - 1);
    } else if (dictionary.count > key_index::kUnindexedEntries) {
        start_index(dictionary);
    }
}

vox_dictionary_entry* find(const vox_dictionary_object& dictionary, std::string_view key) noexcept {
    if (dictionary.index)
        return find_in_index(dictionary, key);
    vox_dictionary_entry* end = dictionary.entries + dictionary.count;
    for (vox_dictionary_entry* entry = dictionary.entries; entry != end; entry++)
        if (entry->length == key.size() && entry->key_view() == key)
            return entry;
    return nullptr;
}

}  // namespace vox_values

vox_object_t vox_dictionary_create(void) {
    return make_dictionary(kUsualRoom);
}

size_t vox_dictionary_get_count(vox_object_t dictionary) {
    const auto* object = as_dictionary(dictionary);
    return object ? object->count : 0;
}

vox_object_t vox_dictionary_get_value(vox_object_t dictionary, const char* key) {
    const auto* object = as_dictionary(dictionary);
    const vox_dictionary_entry* entry = object && key ? find(*object, key) : nullptr;
    return entry ? entry->value : nullptr;
}

void vox_dictionary_set_value(vox_object_t dictionary, const char* key, vox_object_t value) {
    auto* object = as_dictionary(dictionary);
    if (!object || !key)
        return;
    vox_dictionary_entry* entry = find(*object, key);
    if (entry && value)
        replace(*entry, value);
    else if (entry)
        remove(*object, entry);
    else if (value)
        append(*object, key, vox_retain(value));
}

vox_object_t vox_dictionary_get_entry(vox_object_t dictionary, size_t position, const char** key) {
    const auto* object = as_dictionary(dictionary);
    if (!object || position >= object->count)
        return nullptr;
    const vox_dictionary_entry& entry = object->entries[position];
    if (key)
        *key = entry.key();
    return entry.value;
}
