#pragma once

#include <cstddef>
#include <string>
#include <string_view>

// Where named services live: rules for names and for the runtime directory.
namespace vox_link {

inline constexpr std::size_t kLongestName = 100;

// 1 to 100 characters of [A-Za-z0-9._-], the first not '.'.
[[nodiscard]] bool is_service_name(std::string_view name) noexcept;

// $VOX_RUNTIME_DIR, else $XDG_RUNTIME_DIR/vox, else /run/vox; read anew each time.
[[nodiscard]] std::string runtime_directory();

// Checks `directory`: absolute, no symbolic link, owned by this user or root,
// writable for its owner only. `create` makes a missing one first. Returns 0,
// ENOENT when it is missing, or another error number with the reason in `why`.
[[nodiscard]] int check_directory(const std::string& directory, bool create, std::string& why);

}  // namespace vox_link
