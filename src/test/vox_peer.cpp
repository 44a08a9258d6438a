#include "plr/test/vox_peer.h"

#include <tuple>
#include <utility>

#include "plr/test/waiting.h"

namespace plr::test {

VoxPeer::VoxPeer() {
    std::tie(mine_, tested_) = vox::connection::create_pair();
    mine_.set_event_handler([this](const vox::object& event) { handle(event); });
    mine_.set_target_queue(queue_);
    mine_.resume();
}

VoxPeer::~VoxPeer() {
    hangUp();
    resumeReading();
    // The error event is the last.
    static_cast<void>(waitForEnd());
    drain(queue_);
}

void VoxPeer::answerWith(Answer answer) {
    const std::lock_guard guard(mutex_);
    answer_ = std::move(answer);
}

bool VoxPeer::waitForMessages(std::size_t count) {
    std::unique_lock guard(mutex_);
    return changed_.wait_for(guard, kBound, [&] { return count_ >= count; });
}

std::vector<vox::dict> VoxPeer::takeMessages() {
    const std::lock_guard guard(mutex_);
    return std::exchange(messages_, {});
}

bool VoxPeer::waitForEnd() {
    std::unique_lock guard(mutex_);
    return changed_.wait_for(guard, kBound, [this] { return ended_; });
}

void VoxPeer::pauseReading() {
    if (!paused_.exchange(true))
        mine_.suspend();
}
void VoxPeer::resumeReading() {
    if (paused_.exchange(false))
        mine_.resume();
}

void VoxPeer::handle(const vox::object& event) {
    Answer answer;
    {
        const std::lock_guard guard(mutex_);
        if (const vox::dict message(event); message) {
            messages_.push_back(message);
            ++count_;
            answer = answer_;
        } else if (event.type() == VOX_TYPE_ERROR) {
            ended_ = true;
        }
        changed_.notify_all();
    }
    if (!answer)
        return;
    vox::dict reply(vox::object::adopt(vox_dictionary_create_reply(event.get())));
    if (reply && answer(vox::dict(event), reply))
        send(reply);
}

}  // namespace plr::test
