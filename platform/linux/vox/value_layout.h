#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

#include "vox/value.h"

// How Vox values lie in memory, for the files of this port that make them,
// walk them or add a type of their own.
//
// Every object begins with a vox_object: its count and its type. Scalars are
// one allocation with their bytes behind the header. A type that lives elsewhere
// (connections) derives from vox_custom_object and brings its own destructor.
//
// Owner:   the count. An object is made with one reference; objects of the
//          types null and bool are static and never counted.
// Threads: as in vox/value.h.
struct vox_object {
    explicit constexpr vox_object(vox_type object_type) noexcept
        : type(static_cast<std::uint8_t>(object_type)) {}
    vox_object(const vox_object&) = delete;
    vox_object& operator=(const vox_object&) = delete;

    std::atomic<std::uint32_t> references{1};
    const std::uint8_t type;  // a vox_type
    // Strings: `kUtf8Known` once the text was found to be valid.
    // Dictionaries: free for whoever made it a message or a reply.
    std::atomic<std::uint8_t> flags{0};
    std::uint16_t inline_capacity = 0;  // arrays, dictionaries: elements that lie in the object
};
static_assert(sizeof(vox_object) == 8);

struct vox_number_object : vox_object {  // int64, uint64, double, date
    using vox_object::vox_object;
    std::uint64_t bits = 0;
};

// String, data and UUID: the bytes and, for the C interface, a NUL follow.
struct vox_bytes_object : vox_object {
    using vox_object::vox_object;
    std::size_t length = 0;  // bytes, without the NUL
    char* text() noexcept { return reinterpret_cast<char*>(this + 1); }
    const char* text() const noexcept { return reinterpret_cast<const char*>(this + 1); }
    std::string_view view() const noexcept { return {text(), length}; }
};

struct vox_error_object : vox_object {
    using vox_object::vox_object;
    std::int64_t code = 0;
    vox_object* description = nullptr;  // owned string, or null
};

struct vox_custom_object;

// A file descriptor; an endpoint is one as well: a socket that leads to its listener.
struct vox_descriptor_object : vox_object {
    using vox_object::vox_object;
    int descriptor = -1;                // owned, close-on-exec
    vox_custom_object* from = nullptr;  // who is told when it is closed; null: nobody
};

struct vox_container_object : vox_object {
    using vox_object::vox_object;
    std::uint32_t count = 0;
    std::uint32_t capacity = 0;
};

struct vox_array_object : vox_container_object {
    using vox_container_object::vox_container_object;
    vox_object** items = nullptr;  // owned references, never null
    vox_object** inline_items() noexcept { return reinterpret_cast<vox_object**>(this + 1); }
};

// Keys of at most 15 bytes lie in the entry, longer ones in memory of their own;
// both are followed by a NUL.
struct vox_dictionary_entry {
    static constexpr std::uint32_t kInlineKey = 15;

    vox_object* value;     // owned reference, never null
    std::uint32_t length;  // of the key, bytes
    std::uint32_t hash;    // of the key, once the dictionary has an index
    union {
        char small[kInlineKey + 1];
        char* large;
    };
    const char* key() const noexcept { return length <= kInlineKey ? small : large; }
    std::string_view key_view() const noexcept { return {key(), length}; }
};
static_assert(sizeof(vox_dictionary_entry) == 32);

struct vox_dictionary_object : vox_container_object {
    using vox_container_object::vox_container_object;
    vox_dictionary_entry* entries = nullptr;  // in the order their keys first came
    std::uint32_t* index = nullptr;           // hash table of positions, once there are many
    // For messages: the connection a received one came on, or a reply will go
    // to; an owned reference, null otherwise. Released with the dictionary.
    vox_object* remote = nullptr;
    std::uint64_t reply_id = 0;  // of a request, and of the reply made for it
    vox_dictionary_entry* inline_entries() noexcept {
        return reinterpret_cast<vox_dictionary_entry*>(this + 1);
    }
};

// An object whose type is implemented elsewhere. All on the thread that dropped a
// last reference:
//   `destroy` frees it, after its own count fell to zero;
//   `message_gone`: a dictionary that has it as `remote`, and a reply_id, is being freed;
//   `descriptor_gone`: a descriptor that is `from` it was closed.
// `describe` appends a description for logs.
struct vox_custom_vtable {
    void (*destroy)(vox_custom_object* object) noexcept;
    void (*message_gone)(vox_custom_object* remote, vox_dictionary_object& message) noexcept;
    void (*descriptor_gone)(vox_custom_object* from) noexcept;
    void (*describe)(const vox_custom_object* object, std::string& out);
};
struct vox_custom_object : vox_object {
    vox_custom_object(vox_type object_type, const vox_custom_vtable* table) noexcept
        : vox_object(object_type), vtable(table) {}
    const vox_custom_vtable* const vtable;
};

namespace vox_values {

inline constexpr std::uint8_t kUtf8Known = 1;

// The type of `object`; a null pointer is the null object.
inline vox_type type_of(const vox_object* object) noexcept {
    return object ? static_cast<vox_type>(object->type) : VOX_TYPE_NULL;
}
// `object` as its own type when it has `type`, else a null pointer.
template <class Object>
Object* as(vox_object* object, vox_type type) noexcept {
    return type_of(object) == type ? static_cast<Object*>(object) : nullptr;
}
inline vox_dictionary_object* as_dictionary(vox_object* object) noexcept {
    return as<vox_dictionary_object>(object, VOX_TYPE_DICTIONARY);
}

// Memory for an object; ends the process when there is none.
[[nodiscard]] void* allocate(std::size_t bytes) noexcept;
void deallocate(void* memory) noexcept;

// A bytes object of `type` whose `length` bytes the caller fills in; the NUL is set.
[[nodiscard]] vox_bytes_object* make_bytes(vox_type type, std::size_t length) noexcept;
// VOX_TYPE_FD or VOX_TYPE_ENDPOINT around `descriptor`, which it adopts; `from` is
// not retained.
[[nodiscard]] vox_object* adopt_descriptor(vox_type type, int descriptor,
                                           vox_custom_object* from = nullptr) noexcept;
// Closes `descriptor`, and tells `from` unless that is null.
void close_descriptor(int descriptor, vox_custom_object* from) noexcept;
// A close-on-exec duplicate of its descriptor for the caller to close; -1 with
// errno (EINVAL for other types).
[[nodiscard]] int duplicate_descriptor(vox_object* object) noexcept;

// An empty container with room for `room` elements, allocated with it. `room`
// is at most 65,535 here; more are found elsewhere as they come.
[[nodiscard]] vox_array_object* make_array(std::uint32_t room) noexcept;
[[nodiscard]] vox_dictionary_object* make_dictionary(std::uint32_t room) noexcept;
// Make room for `capacity` elements in all.
void reserve(vox_array_object& array, std::uint32_t capacity) noexcept;
void reserve(vox_dictionary_object& dictionary, std::uint32_t capacity) noexcept;
void free_key(vox_dictionary_entry& entry) noexcept;
// Append, taking over the caller's reference. `key` must be new.
void append(vox_array_object& array, vox_object* value) noexcept;
void append(vox_dictionary_object& dictionary, std::string_view key, vox_object* value) noexcept;
// The entry of `key`, or null.
[[nodiscard]] vox_dictionary_entry* find(const vox_dictionary_object& dictionary,
                                         std::string_view key) noexcept;

// The next capacity of a container that is full; doubles, so that appending is
// cheap on average.
[[nodiscard]] std::uint32_t grown_capacity(std::uint32_t capacity) noexcept;

inline bool is_counted(const vox_object* object) noexcept {
    return object->type > VOX_TYPE_BOOL;
}
inline bool is_container(const vox_object* object) noexcept {
    return object->type == VOX_TYPE_ARRAY || object->type == VOX_TYPE_DICTIONARY;
}
// Drops one reference; true when it was the last. Not for null and booleans.
[[nodiscard]] bool drop_reference(vox_object* object) noexcept;
// Frees an object whose count fell to zero. Containers are taken apart without
// recursion, however deep they are.
void destroy(vox_object* object) noexcept;

}  // namespace vox_values
