#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <vector>

#include "dispatch/queue.h"
#include "plr/ipc/connection.h"
#include "plr/ipc/dict.h"

namespace plr::test {

// A VoxPeer is one end of a Vox connection inside the process, for tests of what has
// the other end: a client, or a server's side of one. It keeps what it is sent, says
// what it is told to, and fails on demand.
//
//   plr::test::VoxPeer peer;
//   client->connect(peer.tested());
//   peer.send(greeting);
//   peer.waitForMessages(1);
//
// Owner:   the test. Destruction hangs up and waits for the last handler.
// Queue:   one of its own, for what comes.
// Threads: any, for all members.
class VoxPeer {
  public:
    // Fills the reply to a request; false leaves the request unanswered.
    using Answer = std::function<bool(const vox::dict& request, vox::dict& reply)>;

    VoxPeer();
    VoxPeer(const VoxPeer&) = delete;
    VoxPeer& operator=(const VoxPeer&) = delete;
    ~VoxPeer();

    // The other end: suspended, with nothing set, as listeners hand them out.
    [[nodiscard]] const vox::connection& tested() const noexcept { return tested_; }

    // 0, or an error number.
    int send(const vox::dict& message) const { return mine_.send_message(message); }
    // From now on; nothing is answered at first. Runs on the peer's queue.
    void answerWith(Answer answer);

    // Whether `count` messages came, requests included, since the start; waits for
    // them, at most kBound (waiting.h).
    [[nodiscard]] bool waitForMessages(std::size_t count);
    // What came since the last call, oldest first.
    [[nodiscard]] std::vector<vox::dict> takeMessages();
    // Whether the other end went; waits for that, at most kBound.
    [[nodiscard]] bool waitForEnd();

    // ---- Faults ----

    // Dies, as far as the other end can tell.
    void hangUp() { mine_.cancel(); }
    // Reads nothing more, and again: a peer that hangs.
    void pauseReading();
    void resumeReading();

  private:
    void handle(const vox::object& event);

    const dispatch::queue queue_ = dispatch::queue::create("VoxPeer");
    vox::connection mine_;
    vox::connection tested_;

    std::atomic<bool> paused_{false};
    std::mutex mutex_;
    std::condition_variable changed_;
    Answer answer_;
    std::vector<vox::dict> messages_;  // not taken yet
    std::size_t count_ = 0;            // since the start
    bool ended_ = false;
};

}  // namespace plr::test
