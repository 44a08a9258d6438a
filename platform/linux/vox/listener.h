#pragma once

#include <sys/socket.h>

#include <cstdint>
#include <deque>
#include <list>
#include <memory>
#include <optional>
#include <string>

#include "platform/linux/vox/admission.h"
#include "platform/linux/vox/connection.h"
#include "platform/linux/vox/idle_exit.h"
#include "platform/linux/vox/service_account.h"
#include "platform/linux/vox/service_socket.h"
#include "platform/linux/vox/tap_hub.h"

// A listener: takes the clients of a name, or of the endpoints made for it,
// and hands them as connection events to its handler.
//
// Owner:   as connection. Clients outlive their listener.
// Refusal: clients that the policy does not let in, or that are too many, in all or
//          of their user, are closed at once. Out of descriptors, a reserve one
//          lets waiting clients be refused instead of being left waiting, some
//          hundred a second; without it accepting pauses for a while.
namespace vox_link {

class listener final : public connection, private idle_participant {
  public:
    // Anonymous without a name.
    listener(std::string name, bool anonymous, const vox_limits_t& limits);

    // Before the first resume.
    void set_policy(const vox_policy_t* policy);
    // A new endpoint value; the null object when none can be made.
    [[nodiscard]] vox_object_t make_endpoint();
    // What its clients cost.
    [[nodiscard]] service_account& account() const noexcept { return *account_; }
    [[nodiscard]] bool is_listener() const noexcept override { return true; }
    [[nodiscard]] tap_hub& taps() const noexcept { return *taps_; }

  protected:
    void start() override;
    void turn() PLR_REQUIRES(queue_role_) override;
    void cut_off() PLR_REQUIRES(lock_) override;
    void wind_up(vox_object_t error) PLR_REQUIRES(queue_role_) override;
    [[nodiscard]] std::string title() override;

  private:
    // What clients come from: the listening socket or one endpoint's pair. It
    // holds the listener while it is watched.
    struct gate : dispatch::detail::io_watch {
        gate(listener* of, int adopted, bool accepts) noexcept;
        ~gate();
        listener* owner;
        int fd;
        bool listening;        // for accept(2); else an endpoint
        bool watched = false;  // under lock_
        bool ready = false;    // on the queue: it is in ready_
        bool over = false;     // on the queue: closed, but one call still comes
    };
    enum class taken : std::uint8_t { client, nothing, pause, gone };

    ~listener() override = default;
    [[nodiscard]] int add_gate(int fd, bool listening) PLR_REQUIRES(lock_);
    [[nodiscard]] int open_gate(gate& opened) PLR_REQUIRES(lock_);
    void close_gate(gate* closed) PLR_ON(queue_role_);
    void gate_called(gate* called);
    void take_clients() PLR_ON(queue_role_);
    [[nodiscard]] bool may_take() const noexcept { return !is_ending() && !is_suspended(); }
    [[nodiscard]] taken take_one(const gate& from) PLR_ON(queue_role_);
    [[nodiscard]] taken accept_one(int listening) PLR_ON(queue_role_);
    [[nodiscard]] taken refuse_one(int listening) PLR_ON(queue_role_);
    [[nodiscard]] taken take_from_endpoint(int pair) PLR_ON(queue_role_);
    [[nodiscard]] taken refused_one() PLR_ON(queue_role_);
    [[nodiscard]] taken cannot_take(int error) PLR_ON(queue_role_);
    void note_shortage(const std::string& what) PLR_ON(queue_role_);
    void note_relief() PLR_ON(queue_role_);
    void welcome(int fd) PLR_ON(queue_role_);
    [[nodiscard]] bool is_admitted(int fd, const ucred& client) const;
    void turn_away(int fd, const ucred& client, const std::string& why) PLR_ON(queue_role_);
    void pause() PLR_ON(queue_role_);

    // listener_idle.cpp
    [[nodiscard]] sight look() override;
    [[nodiscard]] bool leave(leaving_stage now) override;
    void take_last() PLR_ON(queue_role_);

    const vox_limits_t limits_;
    const bool anonymous_;
    const std::shared_ptr<service_account> account_;
    const std::shared_ptr<tap_hub> taps_ = std::make_shared<tap_hub>();
    admission admission_;  // fixed from the first resume on
    std::optional<service_socket> service_ PLR_GUARDED_BY(lock_);
    std::list<std::unique_ptr<gate>> gates_ PLR_GUARDED_BY(lock_);
    bool opened_ PLR_GUARDED_BY(lock_) = false;
    bool closed_ PLR_GUARDED_BY(lock_) = false;
    bool leaving_ PLR_GUARDED_BY(lock_) = false;  // with the process
    bool left_ PLR_GUARDED_BY(lock_) = false;     // no client comes any more
    std::deque<gate*> ready_ PLR_GUARDED_BY(queue_role_);
    bool paused_ PLR_GUARDED_BY(queue_role_) = false;
    int reserve_ PLR_GUARDED_BY(queue_role_) = -1;
    bool short_ PLR_GUARDED_BY(queue_role_) = false;  // of descriptors or memory, and said so
    std::uint64_t refused_ PLR_GUARDED_BY(queue_role_) = 0;  // clients, since then
};

}  // namespace vox_link
