#include <utility>

#include "platform/linux/qf/preferences_cache.h"
#include "platform/linux/qf/preferences_names.h"
#include "platform/linux/qf/preferences_save.h"
#include "qf/qf.h"

using namespace qf::preferences;

extern "C" {

QfTypeRef qf_preferences_copy_value(QfStringRef key, QfStringRef application, QfStringRef user,
                                    QfStringRef host) {
    return with_current(application, user, host, [key](const snapshot& now) {
        QfTypeRef value = qf_dictionary_get_value(now.values.get(), key);
        return value ? qf_retain(value) : nullptr;
    });
}

QfDictionaryRef qf_preferences_copy_all(QfStringRef application, QfStringRef user,
                                        QfStringRef host) {
    return with_current(application, user, host,
                        [](const snapshot& now) { return owned_dictionary(now.values).release(); });
}

QfArrayRef qf_preferences_copy_errors(QfStringRef application, QfStringRef user, QfStringRef host) {
    return with_current(application, user, host,
                        [](const snapshot& now) { return owned_array(now.errors).release(); });
}

QfErrorRef qf_preferences_set_value(QfStringRef key, QfTypeRef value, QfStringRef application,
                                    QfStringRef user, QfStringRef host) {
    if (!value) {
        QfTypeRef removed = key;
        const auto keys = owned_array::adopt(qf_array_create(&removed, 1));
        return qf_preferences_set_multiple(nullptr, keys.get(), application, user, host);
    }
    const auto values = owned_dictionary::adopt(qf_dictionary_create(&key, &value, 1));
    return qf_preferences_set_multiple(values.get(), nullptr, application, user, host);
}

QfErrorRef qf_preferences_set_multiple(QfDictionaryRef values, QfArrayRef removed,
                                       QfStringRef application, QfStringRef user,
                                       QfStringRef host) {
    target_file target = target_of(application, user, host);
    if (target.error)
        return target.error.release();
    owned_error error = save(target, values, removed);
    store::instance().reread(target.path);
    return error.release();
}

}  // extern "C"

namespace qf {

struct preferences_observer::state {
    selection what;
    std::shared_ptr<observation> shared;
};

preferences_observer::preferences_observer(QfStringRef application, const dispatch::queue& queue,
                                           dispatch::block<void()> handler)
    : state_(
          new state{{std::string(view(application)), std::string(view(kQfPreferencesCurrentUser)),
                     std::string(view(kQfPreferencesCurrentHost))},
                    std::make_shared<observation>(queue, std::move(handler))}) {
    store::instance().add(state_->what, state_->shared);
}

preferences_observer::preferences_observer(preferences_observer&& other) noexcept
    : state_(std::exchange(other.state_, nullptr)) {}

preferences_observer& preferences_observer::operator=(preferences_observer&& other) noexcept {
    if (this != &other) {
        cancel();
        state_ = std::exchange(other.state_, nullptr);
    }
    return *this;
}

preferences_observer::~preferences_observer() {
    cancel();
}

void preferences_observer::cancel() noexcept {
    if (!state_)
        return;
    state_->shared->cancel();
    store::instance().remove(state_->what, state_->shared.get());
    delete std::exchange(state_, nullptr);
}

}  // namespace qf
