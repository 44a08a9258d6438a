#pragma once

#include "qf/base.h"

// Dates, and their rendering for people.
#ifdef __cplusplus
extern "C" {
#endif

// Nanoseconds since 1970-01-01T00:00:00Z, without leap seconds (POSIX time).
PLR_EXPORT QfDateRef qf_date_create(int64_t nanoseconds);
PLR_EXPORT int64_t qf_date_get_nanoseconds(QfDateRef date);

// A locale by its POSIX name ("de_DE.UTF-8", "C"); "" is that of the
// environment. Null when the system does not have it, or it writes other
// characters than UTF-8 or ASCII.
PLR_EXPORT QfLocaleRef qf_locale_create(const char* name);
PLR_EXPORT const char* qf_locale_get_name(QfLocaleRef locale);

typedef enum QfDateFormatterStyle {
    kQfDateFormatterNoStyle,      // leaves this part out
    kQfDateFormatterShortStyle,   // the locale's digits
    kQfDateFormatterMediumStyle,  // with abbreviated names; time with seconds
    kQfDateFormatterLongStyle,    // with full names; time with zone
    kQfDateFormatterFullStyle,    // with the day of the week as well
} QfDateFormatterStyle;

// Renders in local time; a null locale is "C". Any thread.
PLR_EXPORT QfDateFormatterRef qf_date_formatter_create(QfLocaleRef locale,
                                                       QfDateFormatterStyle date,
                                                       QfDateFormatterStyle time);
// `seconds` since 1970-01-01T00:00:00Z. Null when they are no time (NaN) or out
// of the calendar's range.
PLR_EXPORT QfStringRef qf_date_formatter_copy_string(QfDateFormatterRef formatter, double seconds);

#ifdef __cplusplus
}
#endif
