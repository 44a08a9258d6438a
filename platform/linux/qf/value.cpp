#include "platform/linux/qf/value.h"

#include "qf/qf.h"

namespace {

constinit const qf_null kNull;
constinit const qf_boolean kTrue(true);
constinit const qf_boolean kFalse(false);

#ifdef PELORIN_CHECKS
constinit std::atomic<long> alive{0};
#endif

QfTypeID id(qf::type of) noexcept {
    return static_cast<QfTypeID>(of);
}

}  // namespace

namespace qf {

#ifdef PELORIN_CHECKS
void count_alive(long change) noexcept {
    alive.fetch_add(change, std::memory_order_relaxed);
}
#else
void count_alive(long /*change*/) noexcept {}
#endif

void free_value(const header* value) noexcept {
    count_alive(-1);
    std::free(const_cast<header*>(value));
}

bool drop_reference(const header* value) noexcept {
    // The only owner needs no locked instruction; nobody else can have the value.
    if (value->references.load(std::memory_order_acquire) == 1) {
        value->references.store(0, std::memory_order_relaxed);
        return true;
    }
    const std::uint32_t before = value->references.fetch_sub(1, std::memory_order_acq_rel);
    PLR_ASSERT(before != 0, "a Qf value was released too often");
    return before == 1;
}

}  // namespace qf

extern "C" {

constinit const QfNullRef kQfNull = &kNull;
constinit const QfBooleanRef kQfBooleanTrue = &kTrue;
constinit const QfBooleanRef kQfBooleanFalse = &kFalse;

bool qf_boolean_get_value(QfBooleanRef boolean) {
    return qf::checked(boolean)->value;
}

QfTypeRef qf_retain(QfTypeRef value) {
    const qf::header* const header = qf::header_of(value);
    if (header->counted)
        header->references.fetch_add(1, std::memory_order_relaxed);
    return value;
}

void qf_release(QfTypeRef value) {
    const qf::header* const header = qf::header_of(value);
    if (header->counted && qf::drop_reference(header))
        qf::destroy(header);
}

long qf_get_retain_count(QfTypeRef value) {
    return qf::header_of(value)->references.load(std::memory_order_relaxed);
}

long qf_get_live_count(void) {
#ifdef PELORIN_CHECKS
    return alive.load();
#else
    return -1;
#endif
}

QfTypeID qf_get_type_id(QfTypeRef value) {
    return id(qf::header_of(value)->kind);
}
QfTypeID qf_null_get_type_id(void) {
    return id(qf::type::null);
}
QfTypeID qf_boolean_get_type_id(void) {
    return id(qf::type::boolean);
}
QfTypeID qf_number_get_type_id(void) {
    return id(qf::type::number);
}
QfTypeID qf_string_get_type_id(void) {
    return id(qf::type::string);
}
QfTypeID qf_data_get_type_id(void) {
    return id(qf::type::data);
}
QfTypeID qf_date_get_type_id(void) {
    return id(qf::type::date);
}
QfTypeID qf_url_get_type_id(void) {
    return id(qf::type::url);
}
QfTypeID qf_error_get_type_id(void) {
    return id(qf::type::error);
}
QfTypeID qf_locale_get_type_id(void) {
    return id(qf::type::locale);
}
QfTypeID qf_date_formatter_get_type_id(void) {
    return id(qf::type::date_formatter);
}
QfTypeID qf_array_get_type_id(void) {
    return id(qf::type::array);
}
QfTypeID qf_dictionary_get_type_id(void) {
    return id(qf::type::dictionary);
}

const char* qf_type_get_name(QfTypeID type) {
    static constexpr const char* kNames[] = {
        "?",     "QfNull",  "QfBoolean", "QfNumber",        "QfString", "QfData",      "QfDate",
        "QfURL", "QfError", "QfLocale",  "QfDateFormatter", "QfArray",  "QfDictionary"};
    return kNames[type < std::size(kNames) ? type : 0];
}

}  // extern "C"
