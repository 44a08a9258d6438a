#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "platform/linux/qf/preferences_edit.h"
#include "platform/linux/qf/preferences_parse.h"
#include "platform/linux/qf/preferences_scan.h"
#include "platform/linux/qf/preferences_write.h"

// Two TOML texts, parted by a line "#=": both are read; what the first says is
// written and read again; and it is edited to say what the second does.
namespace {

using namespace qf::preferences;

constexpr std::string_view kParting = "#=\n";

void check(bool holds) {
    if (!holds)
        std::abort();
}

bool can_be_written(QfDictionaryRef values) {
    bool can = true;
    for_each_entry(values, [&can](QfStringRef key, QfTypeRef value) {
        can = can && !why_unwritable(view(key), value);
    });
    return can;
}

void check_says(const std::string& text, QfDictionaryRef values) {
    const parsed again = parse(text, "again");
    check(again.values && qf_equal(again.values.get(), values));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string_view both(reinterpret_cast<const char*>(data), size);
    const std::size_t parting = both.find(kParting);
    const std::string_view text = both.substr(0, parting);
    const parsed values = parse(text, "text");
    check(static_cast<bool>(values.values) != static_cast<bool>(values.error));
    if (!values.values)
        return 0;
    check(scan(text).has_value());  // whatever the parser takes
    if (!can_be_written(values.values.get()))
        return 0;
    check_says(write_file(values.values.get()), values.values.get());
    if (parting == std::string_view::npos)
        return 0;
    const parsed wanted = parse(both.substr(parting + kParting.size()), "wanted");
    if (wanted.values && can_be_written(wanted.values.get()))
        check_says(edit(text, values.values.get(), wanted.values.get()), wanted.values.get());
    return 0;
}
