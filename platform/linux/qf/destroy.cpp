#include "platform/linux/qf/value.h"

// Taking values apart. While a collection's last value is taken apart, that
// value's place holds the collection's own parent, so that neither the depth of a
// value nor its size costs stack or memory.
namespace qf {
namespace {

template <class Value>
void end(const header* value) noexcept {
    static_cast<const Value*>(value)->~Value();
    free_value(value);
}

void free_leaf(const header* value) noexcept {
    switch (value->kind) {
        case type::string:
            return value->detail ? end<elsewhere<qf_string>>(value) : free_value(value);
        case type::data:
            return value->detail ? end<elsewhere<qf_data>>(value) : free_value(value);
        case type::url:
            return end<qf_url>(value);
        case type::error:
            return end<qf_error>(value);
        case type::locale:
            return end<qf_locale>(value);
        case type::date_formatter:
            return end<qf_date_formatter>(value);
        default:
            return free_value(value);
    }
}

bool is_collection(const header* value) noexcept {
    return value->kind == type::array || value->kind == type::dictionary;
}

// A collection of either kind that nobody else has any more.
class remains {
  public:
    explicit remains(const header* value) noexcept : value_(const_cast<header*>(value)) {}
    [[nodiscard]] bool empty() const noexcept {
        return (is_array() ? array()->count : dictionary()->count) == 0;
    }
    [[nodiscard]] QfTypeRef& last() const noexcept {
        return is_array() ? array()->items[array()->count - 1]
                          : dictionary()->entries[dictionary()->count - 1].value;
    }
    void drop_last() const noexcept {
        if (is_array())
            array()->count--;
        else
            qf_release(dictionary()->entries[--dictionary()->count].key);
    }
    void free() const noexcept {
        if (is_array()) {
            if (array()->items != array()->inline_items())
                std::free(array()->items);
        } else {
            if (dictionary()->entries != dictionary()->inline_entries())
                std::free(dictionary()->entries);
            std::free(dictionary()->index);
        }
        free_value(value_);
    }

  private:
    [[nodiscard]] bool is_array() const noexcept { return value_->kind == type::array; }
    [[nodiscard]] qf_array* array() const noexcept { return static_cast<qf_array*>(value_); }
    [[nodiscard]] qf_dictionary* dictionary() const noexcept {
        return static_cast<qf_dictionary*>(value_);
    }
    header* value_;
};

}  // namespace

void destroy(const header* value) noexcept {
    if (!is_collection(value))
        return free_leaf(value);
    const header* current = value;
    const header* parent = nullptr;
    while (current) {
        const remains collection(current);
        if (collection.empty()) {
            collection.free();
            current = parent;
            if (current) {
                parent = static_cast<const header*>(remains(current).last());
                remains(current).drop_last();
            }
            continue;
        }
        const auto* const child = static_cast<const header*>(collection.last());
        if (!child->counted || !drop_reference(child)) {
            collection.drop_last();
        } else if (!is_collection(child)) {
            free_leaf(child);
            collection.drop_last();
        } else {
            collection.last() = parent;
            parent = current;
            current = child;
        }
    }
}

}  // namespace qf
