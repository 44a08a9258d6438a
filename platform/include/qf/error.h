#pragma once

#include "qf/base.h"

// Errors and URLs.
#ifdef __cplusplus
extern "C" {
#endif

// An error of `domain` ("errno", "preferences", …) with a text for people;
// without one (null) the description tells domain and code.
PLR_EXPORT QfErrorRef qf_error_create(QfStringRef domain, int64_t code, QfStringRef description);
PLR_EXPORT QfStringRef qf_error_get_domain(QfErrorRef error);
PLR_EXPORT int64_t qf_error_get_code(QfErrorRef error);
PLR_EXPORT QfStringRef qf_error_copy_description(QfErrorRef error);

// A URI (RFC 3986), kept as given. Null when `text` is none: no well-formed
// scheme, a character outside of the RFC's set, or a bad percent escape.
PLR_EXPORT QfURLRef qf_url_create(QfStringRef text);
PLR_EXPORT QfStringRef qf_url_get_string(QfURLRef url);

#ifdef __cplusplus
}
#endif
