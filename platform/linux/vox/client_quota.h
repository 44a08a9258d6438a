#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <unordered_map>
#include <utility>

#include "platform/linux/vox/lock.h"

// How many clients a listener has, in all and by user.
//
// Owner:   the listener and every ticket share it. A ticket is one client's
//          place, given back when it is destroyed.
// Threads: any.
namespace vox_link {

class client_quota : public std::enable_shared_from_this<client_quota> {
  public:
    class ticket {
      public:
        ticket() noexcept = default;
        ticket(ticket&& other) noexcept = default;
        ticket& operator=(ticket&& other) noexcept {
            ticket(std::move(other)).swap(*this);
            return *this;
        }
        ~ticket() {
            if (from_)
                from_->give_back(user_);
        }
        explicit operator bool() const noexcept { return from_ != nullptr; }
        void swap(ticket& other) noexcept {
            from_.swap(other.from_);
            std::swap(user_, other.user_);
        }

      private:
        friend class client_quota;
        ticket(std::shared_ptr<client_quota> from, uid_t user) noexcept
            : from_(std::move(from)), user_(user) {}
        std::shared_ptr<client_quota> from_;
        uid_t user_ = 0;
    };

    client_quota(std::uint32_t all, std::uint32_t per_user) noexcept
        : most_(all), most_per_user_(per_user) {}

    // A place for a client of `user`; a false ticket when there is none left.
    [[nodiscard]] ticket take(uid_t user);

  private:
    void give_back(uid_t user) noexcept;

    const std::uint32_t most_;
    const std::uint32_t most_per_user_;
    mutex lock_;
    std::uint32_t used_ PLR_GUARDED_BY(lock_) = 0;
    std::unordered_map<uid_t, std::uint32_t> by_user_ PLR_GUARDED_BY(lock_);
};

}  // namespace vox_link
