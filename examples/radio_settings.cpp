#include "examples/radio_settings.h"

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/assign.h"
#include "plr/qf/make_qf_string.h"
#include "plr/qf/plist_adapter.h"

namespace radio {
namespace {

using plr::qf::MakeQfString;

ModemSettings modemOf(const plr::qf::map_adapter& settings) {
    ModemSettings modem;
    modem.path = settings.getString(MakeQfString("modem"), "/dev/modem");
    if (const int baud = settings.getIntLoosely(MakeQfString("baud")); baud > 0)
        modem.baud = static_cast<std::uint32_t>(baud);
    modem.flowControl = settings.getBoolLoosely(MakeQfString("flow_control"), modem.flowControl);
    return modem;
}

}  // namespace

RadioSettings readSettings() {
    const plr::qf::plist_adapter settings{MakeQfString(kPreferences)};
    return {settings.getString(MakeQfString("service"), "net.example.radio"), modemOf(settings)};
}

std::vector<std::string> settingsErrors() {
    const auto errors = plr::qf::adopt(qf_preferences_copy_errors(
        MakeQfString(kPreferences), kQfPreferencesCurrentUser, kQfPreferencesCurrentHost));
    std::vector<std::string> texts(qf_array_get_count(errors.get()));
    for (std::size_t i = 0; i < texts.size(); i++)
        static_cast<void>(plr::qf::assign(texts[i], qf_array_get_value(errors.get(), i)));
    return texts;
}

}  // namespace radio
