#include "platform/linux/qf/preferences_values.h"

#include <cstring>

namespace qf::preferences {

owned_error system_error(int code, std::string_view what) {
    const char* text = ::strerrordesc_np(code);
    const owned_string domain = make_string("errno");
    const owned_string description =
        make_string(std::string(what) + ": " + (text ? text : "unknown error"));
    return owned_error::adopt(qf_error_create(domain.get(), code, description.get()));
}

owned_error make_error(QfPreferencesError code, std::string_view text) {
    const owned_string domain = make_string("preferences");
    const owned_string description = make_string(text);
    return owned_error::adopt(qf_error_create(domain.get(), code, description.get()));
}

}  // namespace qf::preferences
