#include "qf/error.h"

#include <cinttypes>

#include "platform/linux/qf/value.h"
#include "qf/string.h"

extern "C" {

QfErrorRef qf_error_create(QfStringRef domain, int64_t code, QfStringRef description) {
    const QfStringRef text = description
                                 ? qf::retained(qf::checked(description))
                                 : qf_string_create_with_format(
                                       "%s error %" PRId64, qf_string_get_string_ptr(domain), code);
    return qf::make<qf_error>(0, qf::retained(qf::checked(domain)), code, text);
}

QfStringRef qf_error_get_domain(QfErrorRef error) {
    return qf::checked(error)->domain;
}
int64_t qf_error_get_code(QfErrorRef error) {
    return qf::checked(error)->code;
}
QfStringRef qf_error_copy_description(QfErrorRef error) {
    return qf::retained(qf::checked(error)->description);
}

}  // extern "C"
