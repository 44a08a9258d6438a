#pragma once

#include <cstddef>
#include <vector>

#include "bench/fanout_cases.h"

// What the raw relay and the hand-written MQTT clients have in common.
namespace bench::fanout_sockets {

// Writes all of it; the socket blocks.
void sendAll(int fd, const void* bytes, std::size_t length);
// Reads exactly so many bytes.
void receiveAll(int fd, void* bytes, std::size_t length);

// Counts messages of `frameBytes` on the watchers' sockets for ever, waiting in
// epoll.
[[noreturn]] void watch(const std::vector<int>& sockets, std::size_t frameBytes,
                        fanout_cases::Board& board);

}  // namespace bench::fanout_sockets
