#include "qf/date.h"

#include <langinfo.h>
#include <locale.h>

#include "platform/linux/qf/value.h"
#include "qf/string.h"

namespace {

bool writes_utf8(locale_t locale) noexcept {
    const std::string_view charset = nl_langinfo_l(CODESET, locale);
    return charset == "UTF-8" || charset == "ANSI_X3.4-1968";
}

}  // namespace

extern "C" {

QfDateRef qf_date_create(int64_t nanoseconds) {
    return qf::make<qf_date>(0, nanoseconds);
}
int64_t qf_date_get_nanoseconds(QfDateRef date) {
    return qf::checked(date)->nanoseconds;
}

QfLocaleRef qf_locale_create(const char* name) {
    PLR_ASSERT(name, "a locale of no name");
    const locale_t locale = newlocale(LC_ALL_MASK, name, nullptr);
    if (!locale)
        return nullptr;
    if (!writes_utf8(locale)) {
        freelocale(locale);
        return nullptr;
    }
    const bool environments = *name == '\0';
    const char* const known = environments ? nl_langinfo_l(_NL_LOCALE_NAME(LC_TIME), locale) : name;
    return qf::make<qf_locale>(0, locale, qf_string_create(known));
}
const char* qf_locale_get_name(QfLocaleRef locale) {
    return qf::checked(locale)->name->text;
}

}  // extern "C"
