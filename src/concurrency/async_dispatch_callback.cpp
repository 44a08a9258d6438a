#include "plr/concurrency/async_dispatch_callback.h"

PelorinAsyncDispatchCallback::PelorinAsyncDispatchCallback(
    const dispatch::queue& queue, const dispatch::block<void(bool)>& block) noexcept
    : queue_(queue.get()), block_(block.get()) {}

PelorinAsyncDispatchCallback::~PelorinAsyncDispatchCallback() = default;

void PelorinAsyncDispatchCallback::invoke(bool value) {
    dispatch::queue::from_raw(queue_).async(
        [this, value] { dispatch::block<void(bool)>::from_raw(block_)(value); });
}
