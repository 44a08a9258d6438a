#include "platform/linux/ob/object.h"

#include <algorithm>
#include <charconv>
#include <vector>

#include "plr/base/assert.h"

namespace {

void destroy(ob::object* unused) noexcept {
    if (unused->kind == ob::type::string)
        delete static_cast<ObString*>(unused);
    else
        delete static_cast<ObNumber*>(unused);
}

std::string toText(bool value) {
    return value ? "true" : "false";
}

template <class Number>
std::string toText(Number value) {
    char text[32];
    const auto end = std::to_chars(text, text + sizeof text, value).ptr;
    return {text, end};
}

// This thread's pools, which are numbered from 1 as they are pushed, and what
// they have to release.
class pools {
  public:
    ~pools() { release_from(0); }
    void add(void* object) { objects_.push_back(object); }

    std::size_t push() {
        open_.push_back({++last_, objects_.size()});
        return last_;
    }
    [[nodiscard]] bool was_pushed(std::size_t number) const noexcept { return number - 1 < last_; }
    [[nodiscard]] bool is_open(std::size_t number) const noexcept {
        const auto at = find(number);
        return at != open_.end() && at->number == number;
    }
    void pop(std::size_t number) noexcept {
        if (!is_open(number))
            return;
        const auto at = find(number);
        const std::size_t first = at->first;
        open_.erase(at, open_.end());
        release_from(first);
    }

  private:
    struct pool {
        std::size_t number;
        std::size_t first;  // index of its first object
    };

    // The first one not older than `number`.
    [[nodiscard]] std::vector<pool>::const_iterator find(std::size_t number) const noexcept {
        return std::lower_bound(
            open_.begin(), open_.end(), number,
            [](const pool& one, std::size_t than) { return one.number < than; });
    }
    void release_from(std::size_t first) noexcept {
        while (objects_.size() > first) {
            void* const last = objects_.back();
            objects_.pop_back();
            ob_release(last);
        }
    }

    std::vector<pool> open_;  // in the order of their numbers
    std::vector<void*> objects_;
    std::size_t last_ = 0;  // number of the pool pushed last
};

pools& threadsPools() {
    static thread_local pools own;
    return own;
}

// noexcept: out of memory ends the process.
ObString* makeString(std::string_view text) noexcept {
    return new ObString(std::string(text));
}
ObNumber* makeNumber(ObNumber::content value) noexcept {
    return new ObNumber(value);
}
ObString* makeFormatted(const ObString* format, va_list arguments) noexcept {
    return new ObString(ob::format(format->text, arguments));
}

}  // namespace

std::string ob::text_of(const object* any) {
    if (!any)
        return "(null)";
    if (any->kind == type::string)
        return static_cast<const ObString*>(any)->text;
    return std::visit([](auto value) { return toText(value); },
                      static_cast<const ObNumber*>(any)->value);
}

extern "C" {

void* ob_retain(void* object) {
    if (object)
        static_cast<ob::object*>(object)->references.fetch_add(1, std::memory_order_relaxed);
    return object;
}

void ob_release(void* object) {
    if (!object)
        return;
    auto* const counted = static_cast<ob::object*>(object);
    const long before = counted->references.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before > 0, "an Ob object was released too often");
    if (before == 1)
        destroy(counted);
}

long ob_get_reference_count(const void* object) {
    return object ? static_cast<const ob::object*>(object)->references.load() : 0;
}

void* ob_autorelease(void* object) {
    if (object)
        threadsPools().add(object);
    return object;
}

// A pool is its number.
void* ob_autorelease_pool_push() {
    return reinterpret_cast<void*>(threadsPools().push());
}

void ob_autorelease_pool_pop(void* pool) {
    const auto number = reinterpret_cast<std::size_t>(pool);
    PLR_ASSERT(threadsPools().was_pushed(number), "an autorelease pool that this thread has not");
    threadsPools().pop(number);
}

bool ob_autorelease_pool_is_open(const void* pool) {
    return threadsPools().is_open(reinterpret_cast<std::size_t>(pool));
}

ObString* ob_string_create(const char* utf8) {
    return makeString(utf8);
}
ObString* ob_string_create_with_length(const char* utf8, size_t length) {
    return makeString({utf8, length});
}
const char* ob_string_get_utf8(const ObString* string) {
    return string->text.c_str();
}
size_t ob_string_get_length(const ObString* string) {
    return string->text.size();
}

ObString* ob_string_create_with_format(const ObString* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    ObString* const made = makeFormatted(format, arguments);
    va_end(arguments);
    return made;
}
ObString* ob_string_create_with_format_arguments(const ObString* format, va_list arguments) {
    return makeFormatted(format, arguments);
}

ObNumber* ob_number_create_bool(bool value) {
    return makeNumber(value);
}
ObNumber* ob_number_create_int64(int64_t value) {
    return makeNumber(value);
}
ObNumber* ob_number_create_uint64(uint64_t value) {
    return makeNumber(value);
}
ObNumber* ob_number_create_double(double value) {
    return makeNumber(value);
}

ObString* ob_number_copy_string_value(const ObNumber* number) {
    return makeString(ob::text_of(number));
}
ObString* ob_number_get_string_value(const ObNumber* number) {
    return static_cast<ObString*>(ob_autorelease(ob_number_copy_string_value(number)));
}

}  // extern "C"
