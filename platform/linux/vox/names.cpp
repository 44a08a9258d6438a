#include "platform/linux/vox/names.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace vox_link {
namespace {

constexpr const char* kSystemDirectory = "/run/vox";

bool is_name_character(char c) noexcept {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '.' ||
           c == '_' || c == '-';
}

const char* environment(const char* variable) noexcept {
    const char* value = std::getenv(variable);  // NOLINT(concurrency-mt-unsafe): only reads
    return value && *value ? value : nullptr;
}

int make_directory(const std::string& directory) noexcept {
    const mode_t mode = directory == kSystemDirectory ? 0755 : 0700;
    return ::mkdir(directory.c_str(), mode) == 0 || errno == EEXIST ? 0 : errno;
}

const char* refusal(const struct stat& found) noexcept {
    if (S_ISLNK(found.st_mode))
        return "is a symbolic link";
    if (!S_ISDIR(found.st_mode))
        return "is no directory";
    if (found.st_uid != ::geteuid() && found.st_uid != 0)
        return "belongs to another user";
    if ((found.st_mode & (S_IWGRP | S_IWOTH)) != 0)
        return "may be written to by others";
    return nullptr;
}

}  // namespace

bool is_service_name(std::string_view name) noexcept {
    return !name.empty() && name.size() <= kLongestName && name.front() != '.' &&
           std::all_of(name.begin(), name.end(), is_name_character);
}

std::string runtime_directory() {
    if (const char* chosen = environment("VOX_RUNTIME_DIR"))
        return chosen;
    if (const char* user = environment("XDG_RUNTIME_DIR"))
        return std::string(user) + "/vox";
    return kSystemDirectory;
}

int check_directory(const std::string& directory, bool create, std::string& why) {
    const std::string intro = "directory " + directory + " ";
    if (directory.front() != '/') {
        why = intro + "is not an absolute path";
        return EINVAL;
    }
    struct stat found {};
    int error = ::lstat(directory.c_str(), &found) == 0 ? 0 : errno;
    if (error == ENOENT && create) {
        error = make_directory(directory);
        if (error == 0)
            error = ::lstat(directory.c_str(), &found) == 0 ? 0 : errno;
    }
    if (error != 0) {
        why = intro + "cannot be used: " + ::strerrordesc_np(error);
        return error;
    }
    if (const char* reason = refusal(found)) {
        why = intro + reason;
        return EPERM;
    }
    return 0;
}

}  // namespace vox_link
