#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/linux/qf/preferences_values.h"

// Which files an application, a user and a host have.
namespace qf::preferences {

// Letters, digits, '.', '_' and '-', at most 128 bytes, not beginning with '.'.
[[nodiscard]] bool is_name(std::string_view text) noexcept;

// The files that answer, the weakest first. None, and why, when an argument is
// no name or there is no such user.
struct file_list {
    std::vector<std::string> paths;
    owned_error error;
};
[[nodiscard]] file_list files_of(QfStringRef application, QfStringRef user, QfStringRef host);

// The file that is written, and the mode that it and folders on the way to it
// get when they are made.
struct target_file {
    std::string path;
    unsigned file_mode = 0;
    unsigned folder_mode = 0;
    owned_error error;
};
[[nodiscard]] target_file target_of(QfStringRef application, QfStringRef user, QfStringRef host);

}  // namespace qf::preferences
