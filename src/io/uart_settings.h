#pragma once

#include <cstdint>

// The settings that every serial transport makes of its port. Each says by the debug
// print, under the name of `function`, why it failed.
namespace plr::io {

[[nodiscard]] bool setFlowControl(const char* function, int port, bool on);
[[nodiscard]] bool setBaud(const char* function, int port, std::uint32_t baud);
[[nodiscard]] bool setReadMinimum(const char* function, int port, std::uint32_t bytes);
[[nodiscard]] bool setReceiveQueue(const char* function, int port, std::uint32_t bytes);

// The text of an error number, for messages.
[[nodiscard]] const char* errorText(int error) noexcept;

}  // namespace plr::io
