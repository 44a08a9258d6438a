#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "platform/linux/qf/preferences_cache.h"
#include "platform/linux/qf/preferences_parse.h"
#include "support/scratch_folder.h"

namespace plr::test {

using namespace qf::preferences;

// The layers in a scratch folder; nothing is known of any application.
class Preferences : public testing::Test {
  protected:
    Preferences() {
        for (const char* layer : {"VENDOR", "SYSTEM", "USER"})
            ::setenv(("PELORIN_PREFERENCES_" + std::string(layer)).c_str(),
                     folder_.at(layer).c_str(), 1);
    }
    ~Preferences() override {
        store::instance().forget();
        forget_cached();
    }

    // `file`: "SYSTEM/app.toml". Folders are made.
    void write(const std::string& file, const std::string& text) const {
        std::filesystem::create_directories(folder_of(folder_.at(file)));
        std::ofstream(folder_.at(file), std::ios::binary) << text;
    }
    [[nodiscard]] std::string read(const std::string& file) const { return folder_.read(file); }
    [[nodiscard]] std::string at(const std::string& file) const { return folder_.at(file); }

  private:
    const ScratchFolder folder_;
};

// What TOML text says, as a value: toml("= 3").
inline owned_value toml(const std::string& text) {
    const parsed result = parse("value " + text, "test");
    EXPECT_TRUE(result.values) << text;
    return owned_value::retain(qf_dictionary_get_value_for_utf8(result.values.get(), "value", 5));
}

inline owned_value value_of(const char* key, QfStringRef user = kQfPreferencesCurrentUser,
                            QfStringRef host = kQfPreferencesCurrentHost,
                            const char* application = "app") {
    return owned_value::adopt(qf_preferences_copy_value(
        make_string(key).get(), make_string(application).get(), user, host));
}

inline std::string describe(QfTypeRef value) {
    return value ? std::string(view(owned_string::adopt(qf_copy_description(value)).get()))
                 : "nothing";
}

// Sets a value given as TOML; none removes.
inline owned_error set(const char* key, const owned_value& value,
                       QfStringRef user = kQfPreferencesCurrentUser,
                       QfStringRef host = kQfPreferencesAnyHost, const char* application = "app") {
    return owned_error::adopt(qf_preferences_set_value(make_string(key).get(), value.get(),
                                                       make_string(application).get(), user, host));
}

inline std::string text_of(const owned_error& error) {
    return error ? std::string(
                       view(owned_string::adopt(qf_error_copy_description(error.get())).get()))
                 : "";
}

// What is wrong with the files of "app".
inline std::vector<std::string> errors() {
    const auto found = owned_array::adopt(qf_preferences_copy_errors(
        make_string("app").get(), kQfPreferencesCurrentUser, kQfPreferencesCurrentHost));
    std::vector<std::string> texts;
    for (std::size_t i = 0; i < qf_array_get_count(found.get()); ++i) {
        texts.push_back(text_of(
            owned_error::retain(static_cast<QfErrorRef>(qf_array_get_value(found.get(), i)))));
    }
    return texts;
}

}  // namespace plr::test
