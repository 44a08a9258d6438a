#pragma once

namespace plr {

class LogDelivery;

// What fork(2) has to know of this process's logs, so that the child can log.
namespace log_forks {

// Throws std::bad_alloc.
void add(LogDelivery& delivery);
void remove(LogDelivery& delivery) noexcept;

}  // namespace log_forks
}  // namespace plr
