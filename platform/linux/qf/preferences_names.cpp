#include "platform/linux/qf/preferences_names.h"

#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>

#include "platform/linux/qf/value.h"

namespace {

// No names: of characters that those do not have.
constinit const qf_string kCurrentUser(qf::constant, "*current user*");
constinit const qf_string kAnyUser(qf::constant, "*any user*");
constinit const qf_string kCurrentHost(qf::constant, "*current host*");
constinit const qf_string kAnyHost(qf::constant, "*any host*");

}  // namespace

constinit const QfStringRef kQfPreferencesCurrentUser = &kCurrentUser;
constinit const QfStringRef kQfPreferencesAnyUser = &kAnyUser;
constinit const QfStringRef kQfPreferencesCurrentHost = &kCurrentHost;
constinit const QfStringRef kQfPreferencesAnyHost = &kAnyHost;

namespace qf::preferences {
namespace {

constexpr std::size_t kLongestName = 128;
constexpr char kVendorFolder[] = "/usr/share/pelorin/preferences";
constexpr char kSystemFolder[] = "/etc/pelorin/preferences";
constexpr char kUserFolder[] = "/pelorin/preferences";  // in the folder for configuration

bool is_name_character(char c) noexcept {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
           c == '_' || c == '-';
}

// A folder that the environment names; relative ones do not count.
std::string from_environment(const char* variable) {
    const char* value = ::secure_getenv(variable);
    return value && value[0] == '/' ? value : "";
}

std::string folder_or(const char* variable, const char* otherwise) {
    std::string named = from_environment(variable);
    return named.empty() ? otherwise : named;
}

// An account by name, or by id when `name` is null. 0, or an error number.
struct account {
    uid_t uid = 0;
    std::string home;
};
int find_account(const char* name, uid_t uid, account& found) {
    std::vector<char> memory(1024);
    passwd entry{};
    passwd* result = nullptr;
    int error = ERANGE;
    while (error == ERANGE && memory.size() <= 1U << 20) {
        memory.resize(memory.size() * 2);
        error = name ? ::getpwnam_r(name, &entry, memory.data(), memory.size(), &result)
                     : ::getpwuid_r(uid, &entry, memory.data(), memory.size(), &result);
    }
    if (!result)
        return error != 0 ? error : ENOENT;
    found = {entry.pw_uid, entry.pw_dir};
    return 0;
}

bool is(QfStringRef argument, QfStringRef meaning) noexcept {
    return argument == meaning || view(argument) == view(meaning);
}

// The folder of the current user; empty for a user without a home.
std::string current_user_folder() {
    std::string named = from_environment("PELORIN_PREFERENCES_USER");
    if (!named.empty())
        return named;
    if (std::string config = from_environment("XDG_CONFIG_HOME"); !config.empty())
        return config + kUserFolder;
    std::string home = from_environment("HOME");
    account self;
    if (home.empty() && find_account(nullptr, ::geteuid(), self) == 0)
        home = self.home;
    return home.empty() ? home : home + "/.config" + kUserFolder;
}

// The folder of the user layer; empty for none.
struct user_folder {
    std::string path;
    uid_t owner = 0;
    owned_error error;
};
user_folder find_user_folder(QfStringRef user) {
    if (is(user, kQfPreferencesAnyUser))
        return {};
    if (is(user, kQfPreferencesCurrentUser))
        return {current_user_folder(), ::geteuid(), {}};
    const std::string name(view(user));
    if (!is_name(name))
        return {{}, 0, system_error(EINVAL, "'" + name + "' is no name of a user")};
    account found;
    if (const int error = find_account(name.c_str(), 0, found); error != 0)
        return {{}, 0, system_error(error, "user '" + name + "'")};
    return {found.home + "/.config" + kUserFolder, found.uid, {}};
}

// "" for any host. A host whose name is none has no files.
std::string host_name(QfStringRef host) {
    if (is(host, kQfPreferencesAnyHost))
        return {};
    if (!is(host, kQfPreferencesCurrentHost))
        return std::string(view(host));
    std::array<char, 256> name{};
    return ::gethostname(name.data(), name.size() - 1) == 0 ? name.data() : "";
}

owned_error check_application(QfStringRef application) {
    if (is_name(view(application)))
        return {};
    return system_error(EINVAL,
                        "'" + std::string(view(application)) + "' is no name of an application");
}

owned_error check_host(QfStringRef host) {
    if (is(host, kQfPreferencesAnyHost) || is(host, kQfPreferencesCurrentHost) ||
        is_name(view(host)))
        return {};
    return system_error(EINVAL, "'" + std::string(view(host)) + "' is no name of a host");
}

}  // namespace

bool is_name(std::string_view text) noexcept {
    return !text.empty() && text.size() <= kLongestName && text.front() != '.' &&
           std::all_of(text.begin(), text.end(), is_name_character);
}

file_list files_of(QfStringRef application, QfStringRef user, QfStringRef host) {
    user_folder of_user = find_user_folder(user);
    for (owned_error error : {check_application(application), check_host(host), of_user.error}) {
        if (error)
            return {{}, std::move(error)};
    }
    std::vector<std::string> folders = {folder_or("PELORIN_PREFERENCES_VENDOR", kVendorFolder),
                                        folder_or("PELORIN_PREFERENCES_SYSTEM", kSystemFolder)};
    if (!of_user.path.empty())
        folders.push_back(std::move(of_user.path));
    const std::string on = host_name(host);
    file_list result;
    for (const std::string& folder : folders) {
        std::string stem = folder + '/';
        stem += view(application);
        result.paths.push_back(stem + ".toml");
        if (is_name(on))
            result.paths.push_back(stem.append("@").append(on).append(".toml"));
    }
    return result;
}

target_file target_of(QfStringRef application, QfStringRef user, QfStringRef host) {
    const bool any_user = is(user, kQfPreferencesAnyUser);
    const user_folder of_user = find_user_folder(user);
    for (const owned_error& error :
         {check_application(application), check_host(host), of_user.error}) {
        if (error)
            return {{}, 0, 0, error};
    }
    // In another user's folder nobody can tell what a link there leads to.
    if (!any_user && of_user.owner != ::geteuid())
        return {{}, 0, 0, system_error(EPERM, "preferences of another user")};
    const std::string folder =
        any_user ? folder_or("PELORIN_PREFERENCES_SYSTEM", kSystemFolder) : of_user.path;
    const std::string on = host_name(host);
    const bool any_host = is(host, kQfPreferencesAnyHost);
    if (folder.empty() || (!any_host && !is_name(on)))
        return {{}, 0, 0, system_error(ENOENT, folder.empty() ? "home folder" : "host name")};
    std::string path = folder + "/";
    path += view(application);
    if (!any_host)
        path += "@" + on;
    path += ".toml";
    return any_user ? target_file{path, 0644, 0755, {}} : target_file{path, 0600, 0700, {}};
}

}  // namespace qf::preferences
