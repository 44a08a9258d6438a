#include "platform/linux/common/key_index.h"
#include "platform/linux/qf/value.h"
#include "qf/collection.h"

// Hot paths: bench/values_cases.h.
namespace {

using qf::dictionary_entry;

constexpr std::uint32_t kUsualRoom = 4;

qf_dictionary* make_dictionary(std::uint32_t room) noexcept {
    return qf::make<qf_dictionary>(room * sizeof(dictionary_entry), room);
}

void rebuild_index(qf_dictionary* dictionary) noexcept {
    key_index::rebuild(dictionary->index, dictionary->entries, dictionary->count,
                       dictionary->capacity);
}

void start_index(qf_dictionary* dictionary) noexcept {
    for (std::uint32_t i = 0; i < dictionary->count; i++)
        dictionary->entries[i].hash = qf::hash_of(dictionary->entries[i].key);
    rebuild_index(dictionary);
}

void grow(qf_dictionary* dictionary) noexcept {
    const std::uint32_t capacity = qf::grown_capacity(dictionary->capacity);
    auto* const entries =
        static_cast<dictionary_entry*>(qf::allocate(capacity * sizeof(dictionary_entry)));
    if (dictionary->count > 0)
        std::memcpy(entries, dictionary->entries, dictionary->count * sizeof *entries);
    if (dictionary->entries != dictionary->inline_entries())
        std::free(dictionary->entries);
    dictionary->entries = entries;
    dictionary->capacity = capacity;
    if (dictionary->index)
        rebuild_index(dictionary);
}

// `key` must be new.
void append(qf_dictionary* dictionary, QfStringRef key, QfTypeRef value) noexcept {
    if (dictionary->count == dictionary->capacity)
        grow(dictionary);
    dictionary_entry& entry = dictionary->entries[dictionary->count++];
    entry.key = qf::retained(key);
    entry.value = qf::retained(value);
    entry.brief = qf::key_brief(key->view());
    if (dictionary->index) {
        entry.hash = qf::hash_of(key);
        key_index::add(dictionary->index, entry.hash, dictionary->count - 1);
    } else if (dictionary->count > key_index::kUnindexedEntries) {
        start_index(dictionary);
    }
}

void replace(dictionary_entry& entry, QfTypeRef value) noexcept {
    const QfTypeRef old = entry.value;
    entry.value = qf::retained(value);
    qf_release(old);
}

void set(qf_dictionary* dictionary, QfStringRef key, QfTypeRef value) noexcept {
    if (dictionary_entry* const entry = qf::find(dictionary, qf::checked(key)))
        replace(*entry, value);
    else
        append(dictionary, key, value);
}

void remove(qf_dictionary* dictionary, dictionary_entry* entry) noexcept {
    const dictionary_entry removed = *entry;
    dictionary->count--;
    const dictionary_entry* const end = dictionary->entries + dictionary->count;
    std::memmove(entry, entry + 1, static_cast<std::size_t>(end - entry) * sizeof *entry);
    if (dictionary->index)
        rebuild_index(dictionary);
    qf_release(removed.key);
    qf_release(removed.value);
}

// `hash` gives that of the key, if it is needed.
template <class Hash>
dictionary_entry* find(const qf_dictionary* dictionary, std::string_view key, Hash hash) noexcept {
    dictionary_entry* const entries = dictionary->entries;
    if (dictionary->index) {
        const std::uint32_t at = key_index::find(
            dictionary->index, entries, hash(),
            [key](const dictionary_entry& entry) { return entry.key->view() == key; });
        return at == key_index::kNowhere ? nullptr : entries + at;
    }
    const std::uint32_t brief = qf::key_brief(key);
    for (dictionary_entry* entry = entries; entry != entries + dictionary->count; entry++)
        if (entry->brief == brief && entry->key->view() == key)
            return entry;
    return nullptr;
}

QfTypeRef value_of(const dictionary_entry* entry) noexcept {
    return entry ? entry->value : nullptr;
}

}  // namespace

namespace qf {

dictionary_entry* find(const qf_dictionary* dictionary, QfStringRef key) noexcept {
    return ::find(dictionary, key->view(), [key] { return hash_of(key); });
}

}  // namespace qf

extern "C" {

QfDictionaryRef qf_dictionary_create(const QfStringRef* keys, const QfTypeRef* values,
                                     size_t count) {
    PLR_ASSERT(count < UINT32_MAX, "a collection has too many elements");
    qf_dictionary* const dictionary = make_dictionary(static_cast<std::uint32_t>(count));
    for (std::size_t i = 0; i < count; i++)
        set(dictionary, keys[i], values[i]);
    return dictionary;
}

QfMutableDictionaryRef qf_dictionary_create_mutable(void) {
    return make_dictionary(kUsualRoom);
}

size_t qf_dictionary_get_count(QfDictionaryRef dictionary) {
    return qf::checked(dictionary)->count;
}

QfTypeRef qf_dictionary_get_value(QfDictionaryRef dictionary, QfStringRef key) {
    return value_of(qf::find(qf::checked(dictionary), qf::checked(key)));
}

QfTypeRef qf_dictionary_get_value_for_utf8(QfDictionaryRef dictionary, const char* key,
                                           size_t length) {
    const std::string_view text(key, length);
    return value_of(
        find(qf::checked(dictionary), text, [text] { return key_index::hash_of(text); }));
}

QfTypeRef qf_dictionary_get_entry(QfDictionaryRef dictionary, size_t position, QfStringRef* key) {
    if (position >= qf::checked(dictionary)->count)
        return nullptr;
    const dictionary_entry& entry = dictionary->entries[position];
    if (key)
        *key = entry.key;
    return entry.value;
}

void qf_dictionary_set_value(QfMutableDictionaryRef dictionary, QfStringRef key, QfTypeRef value) {
    set(qf::checked(dictionary), key, value);
}

void qf_dictionary_remove_value(QfMutableDictionaryRef dictionary, QfStringRef key) {
    if (dictionary_entry* const entry = qf::find(qf::checked(dictionary), qf::checked(key)))
        remove(dictionary, entry);
}

}  // extern "C"
