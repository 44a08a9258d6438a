// Boost: hex text of its Algorithm library, circular_buffer, and the lock-free
// queue for one producer and one consumer, here on one thread.

#include <boost/algorithm/hex.hpp>
#include <boost/circular_buffer.hpp>
#include <boost/lockfree/spsc_queue.hpp>

#include "bench/bytes_cases.h"

namespace {

using namespace bench::bytes_cases;

void encode(char* out, std::size_t /*size*/, const std::uint8_t* data, std::size_t bytes) {
    *boost::algorithm::hex_lower(data, data + bytes, out) = '\0';
}

void decode(std::uint8_t* out, std::size_t /*bytes*/, const char* text, std::size_t length) {
    boost::algorithm::unhex(text, text + length, out);
}

// Copying the two pieces is quicker than iterators are.
class Circular {
  public:
    explicit Circular(std::size_t capacity) : ring_(capacity) {}
    void insert(const char* bytes, std::size_t count) {
        ring_.insert(ring_.end(), bytes, bytes + count);
    }
    void extract(char* bytes, std::size_t count) {
        const auto [first, length] = ring_.array_one();
        const std::size_t front = std::min(count, length);
        std::memcpy(bytes, first, front);
        std::memcpy(bytes + front, ring_.array_two().first, count - front);
        ring_.erase_begin(count);
    }

  private:
    boost::circular_buffer<char> ring_;
};

class Queue {
  public:
    explicit Queue(std::size_t /*capacity*/) {}
    void insert(const char* bytes, std::size_t count) { queue_.push(bytes, count); }
    void extract(char* bytes, std::size_t count) { queue_.pop(bytes, count); }

  private:
    boost::lockfree::spsc_queue<char, boost::lockfree::capacity<kRing>> queue_;
};

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv,
               {{"to_hex", toHex(encode)},
                {"from_hex", fromHex(decode)},
                {"ring", ring<Circular>()},
                {"ring_queue", ring<Queue>()}});
}
