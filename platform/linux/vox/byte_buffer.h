#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>
#include <utility>

#include "plr/base/assert.h"

namespace vox_wire {

// A growing run of bytes whose new room is left uninitialised, so that it is
// written once only. Out of memory ends the process.
class byte_buffer {
  public:
    byte_buffer() noexcept = default;
    byte_buffer(byte_buffer&& other) noexcept { swap(other); }
    byte_buffer& operator=(byte_buffer&& other) noexcept {
        byte_buffer(std::move(other)).swap(*this);
        return *this;
    }
    ~byte_buffer() { std::free(data_); }

    [[nodiscard]] std::uint8_t* data() noexcept { return data_; }
    [[nodiscard]] const std::uint8_t* data() const noexcept { return data_; }
    [[nodiscard]] std::size_t size() const noexcept { return size_; }
    [[nodiscard]] std::size_t capacity() const noexcept { return capacity_; }
    [[nodiscard]] bool empty() const noexcept { return size_ == 0; }
    [[nodiscard]] std::span<const std::uint8_t> view() const noexcept { return {data_, size_}; }

    // Room for `extra` bytes behind the end, to be written before set_size()
    // counts them. Earlier pointers into the buffer are void afterwards.
    [[nodiscard]] std::uint8_t* room(std::size_t extra) noexcept {
        if (extra > capacity_ - size_) [[unlikely]]
            grow(extra);
        return data_ + size_;
    }
    // Makes room for `capacity` bytes in all and no more.
    void reserve(std::size_t capacity) noexcept {
        if (capacity > capacity_)
            resize(capacity);
    }
    // At most capacity(). Shortens as well.
    void set_size(std::size_t size) noexcept { size_ = size; }
    void clear() noexcept { size_ = 0; }

    void append(std::span<const std::uint8_t> bytes) noexcept {
        if (bytes.empty())
            return;
        std::memcpy(room(bytes.size()), bytes.data(), bytes.size());
        size_ += bytes.size();
    }
    // Removes `count` bytes from the front; costs a move of the rest.
    void drop_front(std::size_t count) noexcept {
        size_ -= count;
        if (size_ > 0)
            std::memmove(data_, data_ + count, size_);
    }
    void swap(byte_buffer& other) noexcept {
        std::swap(data_, other.data_);
        std::swap(size_, other.size_);
        std::swap(capacity_, other.capacity_);
    }

  private:
    [[gnu::noinline]] void grow(std::size_t extra) noexcept {
        const std::size_t needed = size_ + extra;
        const std::size_t doubled = capacity_ < 256 ? 512 : 2 * capacity_;
        resize(needed > doubled ? needed : doubled);
    }
    void resize(std::size_t capacity) noexcept {
        void* moved = std::realloc(data_, capacity);
        PLR_ASSERT(moved, "out of memory");
        data_ = static_cast<std::uint8_t*>(moved);
        capacity_ = capacity;
    }

    std::uint8_t* data_ = nullptr;
    std::size_t size_ = 0;      // bytes that count
    std::size_t capacity_ = 0;  // bytes allocated
};

}  // namespace vox_wire
