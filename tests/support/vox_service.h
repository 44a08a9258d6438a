#pragma once

#include <memory>
#include <mutex>
#include <vector>

#include "support/vox_test.h"

// A service and its clients in this process.
namespace plr::test {

// Answers requests with their number, unless `answers` is false, and records the
// other events of each client.
class EchoService {
  public:
    explicit EchoService(vox_connection_t listener, bool answers = true)
        : answers_(answers), listener_(listener) {
        listener_.resume([this](vox_object_t event) { return take(event); });
    }

    [[nodiscard]] End& listener() { return listener_; }
    [[nodiscard]] vox_listener_statistics_t counts() const {
        vox_listener_statistics_t counts;
        vox_listener_get_statistics(listener_, &counts);
        return counts;
    }
    // The client that came as number `index`, waited for.
    [[nodiscard]] End& client(std::size_t index) {
        EXPECT_TRUE(eventually([&] {
            const std::lock_guard guard(lock_);
            return index < clients_.size();
        }));
        const std::lock_guard guard(lock_);
        return *clients_.at(index);
    }

  private:
    bool take(vox_object_t event) {
        if (vox_get_type(event) != VOX_TYPE_CONNECTION)
            return false;
        const std::lock_guard guard(lock_);
        clients_.push_back(std::make_unique<End>(vox_retain(event)));
        if (answers_)
            clients_.back()->resumeEcho();
        else
            clients_.back()->resume();
        return true;
    }

    const bool answers_;
    std::mutex lock_;
    std::vector<std::unique_ptr<End>> clients_;
    End listener_;  // the first to end
};

// A connection that is resumed at once.
class Client : public End {
  public:
    explicit Client(vox_connection_t adopted) : End(adopted) { resume(); }
};

}  // namespace plr::test
