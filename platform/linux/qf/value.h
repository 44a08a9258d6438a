#pragma once

#include <locale.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <new>
#include <string_view>
#include <utility>

#include "plr/base/assert.h"
#include "qf/base.h"
#include "qf/scalar.h"

// How Qf values lie in memory, for the files of this port that make or walk them.
//
// Every value begins with a header: its count and its type. A value is one
// allocation, with its bytes or first elements behind it, but for memory that its
// maker asked for elsewhere.
//
// Owner:   the count; a value is made with one reference. Values made at compile
//          time (the singletons, constant strings) are never counted:
//
//              constinit const qf_string kText(qf::constant, "text");
//              constinit const QfStringRef kQfText = &kText;
//
// Threads: as in qf/base.h.
namespace qf {

enum class type : std::uint8_t {
    none,
    null,
    boolean,
    number,
    string,
    data,
    date,
    url,
    error,
    locale,
    date_formatter,
    array,
    dictionary,
};

struct constant_tag {};
inline constexpr constant_tag constant;

void count_alive(long change) noexcept;

struct header {
    explicit header(qf::type of) noexcept : kind(of) {}
    constexpr header(constant_tag /*unused*/, qf::type of) noexcept : kind(of), counted(false) {}
    header(const header&) = delete;
    header& operator=(const header&) = delete;

    mutable std::atomic<std::uint32_t> references{1};
    const qf::type kind;
    const bool counted = true;
    // Numbers: their QfNumberType. Strings, data: whether the bytes lie elsewhere.
    std::uint8_t detail = 0;
};
static_assert(sizeof(header) == 8);

// Memory for values and what belongs to them; ends the process when there is none.
[[nodiscard]] inline void* allocate(std::size_t bytes) noexcept {
    void* const memory = std::malloc(bytes);
    PLR_ASSERT(memory, "out of memory");
    return memory;
}

// A value of which `extra` bytes follow; free_value() is its end.
template <class Value, class... Arguments>
[[nodiscard]] Value* make(std::size_t extra, Arguments&&... arguments) noexcept {
    count_alive(1);
    return new (allocate(sizeof(Value) + extra)) Value(std::forward<Arguments>(arguments)...);
}
void free_value(const header* value) noexcept;

// Drops one reference of a counted value; true when it was the last.
[[nodiscard]] bool drop_reference(const header* value) noexcept;
// Frees a value whose count fell to zero. Collections are taken apart without
// recursion, however deep they are.
void destroy(const header* value) noexcept;

inline const header* header_of(QfTypeRef value) noexcept {
    PLR_ASSERT(value, "a null Qf value was used");
    return static_cast<const header*>(value);
}
// `value`, which must be of the type; ends the process for another one.
template <class Value>
Value* checked(Value* value) noexcept {
    PLR_ASSERT(value && value->kind == Value::kKind, "a Qf value is not of the type asked for");
    return value;
}
template <class Ref>
Ref retained(Ref value) noexcept {
    qf_retain(value);
    return value;
}

// The next capacity of a collection that is full; doubles, so that appending is
// cheap on average.
[[nodiscard]] inline std::uint32_t grown_capacity(std::uint32_t capacity) noexcept {
    PLR_ASSERT(capacity <= UINT32_MAX / 2, "a collection has too many elements");
    return capacity < 4 ? 8 : 2 * capacity;
}

}  // namespace qf

struct qf_null : qf::header {
    static constexpr auto kKind = qf::type::null;
    constexpr qf_null() noexcept : header(qf::constant, kKind) {}
};

struct qf_boolean : qf::header {
    static constexpr auto kKind = qf::type::boolean;
    constexpr explicit qf_boolean(bool of) noexcept : header(qf::constant, kKind), value(of) {}
    const bool value;
};

struct qf_number : qf::header {
    static constexpr auto kKind = qf::type::number;
    qf_number(QfNumberType as, std::uint64_t content) noexcept : header(kKind), bits(content) {
        detail = static_cast<std::uint8_t>(as);
    }
    const std::uint64_t bits;  // of an int64_t, an uint64_t or, for both floats, of a double
};

struct qf_string : qf::header {
    static constexpr auto kKind = qf::type::string;
    explicit qf_string(std::size_t size) noexcept
        : header(kKind), length(size), text(reinterpret_cast<char*>(this + 1)) {}
    constexpr qf_string(qf::constant_tag tag, std::string_view literal) noexcept
        : header(tag, kKind), length(literal.size()), text(literal.data()) {}

    [[nodiscard]] std::string_view view() const noexcept { return {text, length}; }
    [[nodiscard]] char* inline_text() noexcept { return reinterpret_cast<char*>(this + 1); }

    const std::size_t length;  // bytes, without the NUL
    const char* text;          // behind the string, or in `detail` strings elsewhere
    mutable std::atomic<std::uint32_t> hash{0};  // 0 until it was asked for
};

struct qf_data : qf::header {
    static constexpr auto kKind = qf::type::data;
    explicit qf_data(std::size_t size) noexcept : header(kKind), length(size), bytes(this + 1) {}
    [[nodiscard]] std::string_view view() const noexcept {
        return {static_cast<const char*>(bytes), length};
    }
    const std::size_t length;
    [[nodiscard]] void* inline_bytes() noexcept { return this + 1; }
    const void* bytes;  // behind the data, or in `detail` data elsewhere
};

namespace qf {

// A string or data whose bytes lie elsewhere.
template <class Value>
struct elsewhere : Value {
    elsewhere(std::size_t bytes_there, const void* memory, std::size_t memory_size,
              QfAllocatorRef from) noexcept
        : Value(bytes_there),
          size(memory_size),
          allocator(from ? *from : QfAllocator{nullptr, nullptr, nullptr}),
          place(memory) {
        this->detail = 1;
    }
    ~elsewhere() {
        if (allocator.deallocate)
            allocator.deallocate(const_cast<void*>(place), size, allocator.context);
    }
    const std::size_t size;  // of the memory
    const QfAllocator allocator;
    const void* const place;
};

// `length` bytes of memory of `allocator`, null when it has none.
[[nodiscard]] inline void* allocate_from(QfAllocatorRef allocator, std::size_t length) noexcept {
    return allocator->allocate(length, allocator->context);
}

// A string of `length` bytes that the caller fills in; the NUL is set.
[[nodiscard]] inline qf_string* make_string(std::size_t length) noexcept {
    auto* const made = make<qf_string>(length + 1, length);
    made->inline_text()[length] = '\0';
    return made;
}
[[nodiscard]] inline QfStringRef make_string(std::string_view text) noexcept {
    qf_string* const made = make_string(text.size());
    if (!text.empty())
        std::memcpy(made->inline_text(), text.data(), text.size());
    return made;
}
[[nodiscard]] std::uint32_t hash_of(QfStringRef string) noexcept;

}  // namespace qf

struct qf_date : qf::header {
    static constexpr auto kKind = qf::type::date;
    explicit qf_date(std::int64_t time) noexcept : header(kKind), nanoseconds(time) {}
    const std::int64_t nanoseconds;
};

struct qf_locale : qf::header {
    static constexpr auto kKind = qf::type::locale;
    qf_locale(locale_t of, QfStringRef named) noexcept : header(kKind), locale(of), name(named) {}
    ~qf_locale() {
        freelocale(locale);
        qf_release(name);
    }
    const locale_t locale;   // owned
    const QfStringRef name;  // owned
};

struct qf_date_formatter : qf::header {
    static constexpr auto kKind = qf::type::date_formatter;
    qf_date_formatter(QfLocaleRef of, QfStringRef how) noexcept
        : header(kKind), locale(of), format(how) {}
    ~qf_date_formatter() {
        qf_release(locale);
        qf_release(format);
    }
    const QfLocaleRef locale;  // owned
    const QfStringRef format;  // owned; of strftime
};

struct qf_url : qf::header {
    static constexpr auto kKind = qf::type::url;
    explicit qf_url(QfStringRef of) noexcept : header(kKind), text(of) {}
    ~qf_url() { qf_release(text); }
    const QfStringRef text;  // owned
};

struct qf_error : qf::header {
    static constexpr auto kKind = qf::type::error;
    qf_error(QfStringRef from, std::int64_t number, QfStringRef what) noexcept
        : header(kKind), code(number), domain(from), description(what) {}
    ~qf_error() {
        qf_release(domain);
        qf_release(description);
    }
    const std::int64_t code;
    const QfStringRef domain;       // owned
    const QfStringRef description;  // owned; made of the others when none was given
};

struct qf_array : qf::header {
    static constexpr auto kKind = qf::type::array;
    explicit qf_array(std::uint32_t room) noexcept
        : header(kKind), capacity(room), items(inline_items()) {}
    QfTypeRef* inline_items() noexcept { return reinterpret_cast<QfTypeRef*>(this + 1); }

    std::uint32_t count = 0;
    std::uint32_t capacity;
    QfTypeRef* items;  // owned references, never null
};

namespace qf {

struct dictionary_entry {
    QfStringRef key;      // owned
    QfTypeRef value;      // owned, never null
    std::uint32_t hash;   // of the key, once the dictionary has an index
    std::uint32_t brief;  // what a walk compares first: key_brief()
};

// Differs for most keys that differ, and costs nothing.
[[nodiscard]] inline std::uint32_t key_brief(std::string_view key) noexcept {
    const auto last = key.empty() ? 0u : static_cast<unsigned char>(key.back());
    return static_cast<std::uint32_t>(key.size()) << 8 | last;
}

}  // namespace qf

struct qf_dictionary : qf::header {
    static constexpr auto kKind = qf::type::dictionary;
    explicit qf_dictionary(std::uint32_t room) noexcept
        : header(kKind), capacity(room), entries(inline_entries()) {}
    qf::dictionary_entry* inline_entries() noexcept {
        return reinterpret_cast<qf::dictionary_entry*>(this + 1);
    }

    std::uint32_t count = 0;
    std::uint32_t capacity;
    qf::dictionary_entry* entries;   // in the order their keys first came
    std::uint32_t* index = nullptr;  // key_index of positions, once there are many
};

namespace qf {

// The entry of `key`, or null.
[[nodiscard]] dictionary_entry* find(const qf_dictionary* dictionary, QfStringRef key) noexcept;

}  // namespace qf
