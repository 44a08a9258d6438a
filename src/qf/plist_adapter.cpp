#include "plr/qf/plist_adapter.h"

namespace plr::qf {

plist_adapter::plist_adapter(QfStringRef application, QfStringRef user)
    : application_(application), user_(user) {}

QfTypeRef plist_adapter::copyQfTypeRef(QfStringRef key) const {
    if (!application_)
        return nullptr;
    const QfStringRef user = user_ ? user_.get() : kQfPreferencesCurrentUser;
    return qf_preferences_copy_value(key, application_.get(), user, kQfPreferencesCurrentHost);
}

}  // namespace plr::qf
