#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "bench/support/process.h"

// The mosquitto broker on a Unix socket of its own, and clients that speak MQTT
// 3.1.1 (OASIS standard, 2014) by hand: QoS 0. Packets are shorter than 128 bytes,
// so that their length is one byte. What is unexpected ends the program.
namespace bench::mqtt {

// Killed at the end.
class Broker {
  public:
    // Returns when it accepts clients.
    Broker();
    // A new client's socket.
    [[nodiscard]] int connectClient(const std::string& name) const;
    [[nodiscard]] pid_t pid() const noexcept { return process_.pid(); }

  private:
    const TemporaryFolder folder_;
    const std::string socket_;
    const Child process_;
};

// To be retained, as properties keep their values; as long as what subscribers
// get, which lacks that bit.
[[nodiscard]] std::string publishPacket(std::string_view topic, std::string_view value);

// Return when the broker has acknowledged it.
void subscribe(int client, std::string_view topic);
void ping(int client);

}  // namespace bench::mqtt
