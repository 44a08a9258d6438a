#include "platform/linux/qf/value.h"

#include <string_view>
#include <utility>

#include "plr/base/assert.h"

namespace {

const qf::header* headerOf(QfTypeRef value) noexcept {
    PLR_ASSERT(value, "a null Qf value was used");
    return static_cast<const qf::header*>(value);
}

void destroy(const qf::header* value) noexcept {
    switch (value->type) {
        case qf::kString:
            delete static_cast<QfStringRef>(value);
            return;
        case qf::kNumber:
            delete static_cast<QfNumberRef>(value);
            return;
        default:
            PLR_ASSERT(false, "no Qf value");
    }
}

// noexcept: out of memory ends the process.
template <class Value, class... Arguments>
const Value* make(Arguments&&... arguments) noexcept {
    return new Value(std::forward<Arguments>(arguments)...);
}

}  // namespace

extern "C" {

QfTypeRef qf_retain(QfTypeRef value) {
    headerOf(value)->references.fetch_add(1, std::memory_order_relaxed);
    return value;
}

void qf_release(QfTypeRef value) {
    const qf::header* header = headerOf(value);
    const long before = header->references.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before > 0, "a Qf value was released too often");
    if (before == 1)
        destroy(header);
}

long qf_get_retain_count(QfTypeRef value) {
    return headerOf(value)->references.load(std::memory_order_relaxed);
}

QfTypeID qf_get_type_id(QfTypeRef value) {
    return headerOf(value)->type;
}
QfTypeID qf_string_get_type_id() {
    return qf::kString;
}
QfTypeID qf_number_get_type_id() {
    return qf::kNumber;
}

QfStringRef qf_string_create(const char* text) {
    return make<qf_string>(text);
}

QfStringRef qf_string_create_with_length(const char* text, size_t length) {
    return make<qf_string>(std::string_view(text, length));
}

const char* qf_string_get_string_ptr(QfStringRef string) {
    return string->text.c_str();
}
size_t qf_string_get_length(QfStringRef string) {
    return string->text.size();
}

QfNumberRef qf_number_create_int64(int64_t value) {
    return make<qf_number>(value);
}
int64_t qf_number_get_int64(QfNumberRef number) {
    return number->value;
}

}  // extern "C"
