#include <iostream>
#include <semaphore>

#include "qf/qf.h"

// Reads a setting, follows its file, and changes it as an administrator might. Needs
// the right to write into the system's folder, or PELORIN_PREFERENCES_SYSTEM.
namespace {

void show(QfStringRef name, QfStringRef key) {
    QfTypeRef baud =
        qf_preferences_copy_value(key, name, kQfPreferencesCurrentUser, kQfPreferencesCurrentHost);
    if (!baud) {
        std::cout << "no baud\n";
        return;
    }
    QfStringRef text = qf_copy_description(baud);
    std::cout << "baud " << qf_string_get_string_ptr(text) << '\n';
    qf_release(text);
    qf_release(baud);
}

// Null or an error, which is the caller's.
QfErrorRef change(QfStringRef name, QfStringRef key, QfTypeRef value) {
    return qf_preferences_set_value(key, value, name, kQfPreferencesAnyUser, kQfPreferencesAnyHost);
}

}  // namespace

int main() {
    QfStringRef name = qf_string_create("preferences_example");
    QfStringRef key = qf_string_create("baud");
    QfTypeRef fast = qf_number_create_int64(460800);
    const auto queue = dispatch::queue::create("settings");
    std::binary_semaphore changed(0);

    const dispatch::block<void()> follow([&] {
        show(name, key);
        changed.release();
    });
    qf::preferences_observer observer(name, queue, follow);
    show(name, key);
    QfErrorRef error = change(name, key, fast);
    if (error) {
        QfStringRef text = qf_error_copy_description(error);
        std::cerr << qf_string_get_string_ptr(text) << '\n';
        return 1;
    }
    changed.acquire();
    queue.sync([&] { observer.cancel(); });
    qf_release(fast);
    qf_release(key);
    qf_release(name);
}
