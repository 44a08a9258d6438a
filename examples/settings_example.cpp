#include <cstdint>
#include <iostream>
#include <string>
#include <vector>

#include "plr/ipc.h"
#include "plr/qf.h"

using plr::qf::MakeQfString;

// What a device told of itself. The caller owns it.
QfDictionaryRef createAnswer() {
    const QfMutableDictionaryRef answer = qf_dictionary_create_mutable();
    const auto put = [answer](const char* key, QfTypeRef created) {
        qf_dictionary_set_value(answer, MakeQfString(key), created);
        qf_release(created);
    };
    put("bars", qf_number_create_int64(3));
    put("volts", qf_number_create_double(3.75));
    put("roaming", qf_string_create("yes"));
    put("cell", qf_data_create("\x0C\x3D", 2));
    return answer;
}

// By key, whatever keeps the values. Strictly: only the type that is asked for, and
// nothing of it lost; else the default.
void readStrictly(const plr::qf::map_adapter& values) {
    std::cout << values.getInt(MakeQfString("bars"), -1) << ' '           // 3
              << values.getInt(MakeQfString("volts"), -1) << ' '          // -1: no int
              << values.getDouble(MakeQfString("volts"), 0) << ' '        // 3.75
              << values.getBool(MakeQfString("roaming"), false) << ' '    // 0: no boolean
              << values.getString(MakeQfString("name"), "none") << '\n';  // none: no such key
}

// Loosely: numbers, texts and booleans for one another, as people write them.
void readLoosely(const plr::qf::map_adapter& values) {
    std::cout << values.getIntLoosely(MakeQfString("volts")) << ' '              // 3
              << values.getBoolLoosely(MakeQfString("roaming"), false) << '\n';  // 1
}

// One value without an adapter: `out` is written when the result is true.
void readOne(QfDictionaryRef answer) {
    const QfTypeRef cell = qf_dictionary_get_value(answer, MakeQfString("cell"));
    std::vector<std::uint8_t> bytes;
    if (plr::qf::assign(bytes, plr::qf::typed<plr::qf::Data>(cell)))
        std::cout << plr::qf::show(false, cell) << " begins with " << unsigned{bytes[0]} << '\n';
}

// Settings come from files that an administrator edits, and change while the program
// runs; ~/.config/pelorin/preferences/settings_example.toml for instance: volume = 7
void readPreferences() {
    const plr::qf::plist_adapter settings{MakeQfString("settings_example")};
    std::cout << "volume " << settings.getInt(MakeQfString("volume"), 5) << '\n';
}

// Into a message, and out of one.
void sendAndReceive(QfDictionaryRef answer) {
    const vox::dict message(vox::qf_to_vox(answer));
    std::cout << vox::dyn_cast_or_default(message["bars"], 0) << " bars in a message\n";
    const auto received = vox::bridge(message);
    std::cout << (qf_equal(received.get(), answer) ? "the same" : "another") << ": "
              << plr::qf::show(false, received.get()) << '\n';
}

int main() {
    const auto answer = plr::qf::adopt(createAnswer());
    const plr::qf::dict_adapter values(answer.get());
    readStrictly(values);
    readLoosely(values);
    readOne(answer.get());
    readPreferences();
    sendAndReceive(answer.get());
}
