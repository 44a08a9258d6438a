#include "platform/linux/vox/read_memory.h"

namespace vox_link {
namespace {

struct thread_memory {
    std::unique_ptr<std::uint8_t[]> bytes;
    bool in_use = false;
};
thread_local thread_memory shared;

// Deliberate: not value-initialised, so that only what is read is touched.
std::unique_ptr<std::uint8_t[]> allocate() {
    return std::unique_ptr<std::uint8_t[]>(new std::uint8_t[read_memory::kBytes]);
}

}  // namespace

read_memory::read_memory() {
    if (shared.in_use) {
        own_ = allocate();
        bytes_ = {own_.get(), kBytes};
        return;
    }
    if (!shared.bytes)
        shared.bytes = allocate();
    shared.in_use = true;
    bytes_ = {shared.bytes.get(), kBytes};
}

read_memory::~read_memory() {
    if (!own_)
        shared.in_use = false;
}

}  // namespace vox_link
