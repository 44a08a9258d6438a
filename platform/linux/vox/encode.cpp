#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "platform/linux/vox/cbor.h"
#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/value_layout.h"

namespace vox_wire {
namespace {

using namespace vox_values;

// One call of encode(): appends to `out`, fails with an error number.
class encoder {
  public:
    encoder(const codec_limits& limits, encoded& out) noexcept
        : limits_(limits),
          depth_limit_(std::min(limits.depth, kMostDepth)),
          out_(out),
          first_byte_(out.bytes.size()),
          first_descriptor_(out.descriptors.size()) {}

    int run(vox_object* value) {
        int error = put_value(value);
        while (!error && depth_ > 0)
            error = put_next(open_[depth_ - 1]);
        if (!error && out_.bytes.size() - first_byte_ > limits_.bytes)
            error = EMSGSIZE;
        if (error)
            undo();
        return error;
    }

  private:
    struct container {
        vox_container_object* object;
        std::uint32_t position;
    };

    // Goes on with the innermost container up to its end or its next container.
    int put_next(container& top) {
        return top.object->type == VOX_TYPE_ARRAY ? put_items(top) : put_entries(top);
    }

    int put_items(container& top) {
        const auto& array = *static_cast<vox_array_object*>(top.object);
        const unsigned depth = depth_;
        while (top.position < array.count) {
            if (const int error = put_value(array.items[top.position++]))
                return error;
            if (depth_ != depth)
                return 0;
        }
        depth_--;
        return 0;
    }

    int put_entries(container& top) {
        const auto& dictionary = *static_cast<vox_dictionary_object*>(top.object);
        const unsigned depth = depth_;
        while (top.position < dictionary.count) {
            const vox_dictionary_entry& entry = dictionary.entries[top.position++];
            if (!is_utf8({reinterpret_cast<const std::uint8_t*>(entry.key()), entry.length}))
                return EILSEQ;
            if (const int error = put_bytes(major::text, entry.key_view()))
                return error;
            if (const int error = put_value(entry.value))
                return error;
            if (depth_ != depth)
                return 0;
        }
        depth_--;
        return 0;
    }

    // Scalars are put as they are; of a container only the head, and it is opened.
    int put_value(vox_object* value) {
        switch (type_of(value)) {
            case VOX_TYPE_NULL:
                return put_byte(kByteNull);
            case VOX_TYPE_BOOL:
                return put_byte(vox_bool_get_value(value) ? kByteTrue : kByteFalse);
            case VOX_TYPE_STRING:
                return put_string(*static_cast<vox_bytes_object*>(value));
            case VOX_TYPE_INT64:
                return put_int(vox_int64_get_value(value));
            case VOX_TYPE_UINT64:
                put_head(major::tag, kTagUint64);
                return put_head(major::unsigned_int, vox_uint64_get_value(value));
            case VOX_TYPE_DOUBLE:
                return put_double(static_cast<vox_number_object*>(value)->bits);
            case VOX_TYPE_DATE:
                put_head(major::tag, kTagDate);
                return put_int(vox_date_get_value(value));
            case VOX_TYPE_DATA:
                return put_bytes(major::bytes, static_cast<vox_bytes_object*>(value)->view());
            case VOX_TYPE_UUID:
                put_head(major::tag, kTagUuid);
                return put_bytes(major::bytes, static_cast<vox_bytes_object*>(value)->view());
            case VOX_TYPE_ARRAY:
                return open(major::array, static_cast<vox_container_object*>(value));
            case VOX_TYPE_DICTIONARY:
                return open(major::map, static_cast<vox_container_object*>(value));
            case VOX_TYPE_ERROR:
                return put_error(*static_cast<vox_error_object*>(value));
            case VOX_TYPE_FD:
                return put_descriptor(kTagFd, value);
            case VOX_TYPE_ENDPOINT:
                return put_descriptor(kTagEndpoint, value);
            case VOX_TYPE_CONNECTION:
                break;
        }
        return EINVAL;
    }

    // An element takes a byte at least. Checked at every container, since one
    // that stands in a value many times may swell it beyond all bounds.
    int open(major kind, vox_container_object* object) {
        elements_ += object->count;
        if (depth_ == depth_limit_ || elements_ > limits_.elements() ||
            out_.bytes.size() - first_byte_ + object->count > limits_.bytes)
            return EMSGSIZE;
        open_[depth_++] = {object, 0};
        return put_head(kind, object->count);
    }

    int put_byte(std::uint8_t byte) {
        *out_.bytes.room(1) = byte;
        out_.bytes.set_size(out_.bytes.size() + 1);
        return 0;
    }

    int put_head(major kind, std::uint64_t argument) {
        std::uint8_t* start = out_.bytes.room(kMostHeadBytes);
        const std::uint8_t* end = vox_wire::put_head(start, kind, argument);
        out_.bytes.set_size(out_.bytes.size() + static_cast<std::size_t>(end - start));
        return 0;
    }

    int put_int(std::int64_t value) {
        // The argument of a negative number n is -1 - n, which is ~n.
        return value < 0 ? put_head(major::negative_int, static_cast<std::uint64_t>(~value))
                         : put_head(major::unsigned_int, static_cast<std::uint64_t>(value));
    }

    int put_double(std::uint64_t bits) {
        std::uint8_t* start = out_.bytes.room(kMostHeadBytes);
        const std::uint64_t wire = to_big_endian(bits);
        *start = kByteDouble;
        std::memcpy(start + 1, &wire, sizeof wire);
        out_.bytes.set_size(out_.bytes.size() + kMostHeadBytes);
        return 0;
    }

    // The limit is checked here, so that a value of any size takes no more memory than it.
    int put_bytes(major kind, std::string_view bytes) {
        if (out_.bytes.size() - first_byte_ + bytes.size() > limits_.bytes)
            return EMSGSIZE;
        std::uint8_t* start = out_.bytes.room(kMostHeadBytes + bytes.size());
        std::uint8_t* text = vox_wire::put_head(start, kind, bytes.size());
        std::memcpy(text, bytes.data(), bytes.size());
        const auto head = static_cast<std::size_t>(text - start);
        out_.bytes.set_size(out_.bytes.size() + head + bytes.size());
        return 0;
    }

    int put_string(vox_bytes_object& string) {
        if (!(string.flags.load(std::memory_order_relaxed) & kUtf8Known)) {
            if (!is_utf8({reinterpret_cast<const std::uint8_t*>(string.text()), string.length}))
                return EILSEQ;
            string.flags.store(kUtf8Known, std::memory_order_relaxed);
        }
        return put_bytes(major::text, string.view());
    }

    int put_error(const vox_error_object& error) {
        put_head(major::tag, kTagError);
        put_head(major::array, error.description ? 2 : 1);
        put_int(error.code);
        if (!error.description)
            return 0;
        return put_string(*static_cast<vox_bytes_object*>(error.description));
    }

    int put_descriptor(std::uint64_t tag, vox_object* value) {
        const std::size_t place = out_.descriptors.size() - first_descriptor_;
        if (place >= limits_.descriptors || place >= kMostDescriptors)
            return EMSGSIZE;
        const int copy = duplicate_descriptor(value);
        if (copy < 0)
            return errno;
        out_.descriptors.push_back(copy);
        put_head(major::tag, tag);
        return put_head(major::unsigned_int, place);
    }

    void undo() {
        out_.bytes.set_size(first_byte_);
        while (out_.descriptors.size() > first_descriptor_) {
            close(out_.descriptors.back());
            out_.descriptors.pop_back();
        }
    }

    const codec_limits& limits_;
    const unsigned depth_limit_;
    encoded& out_;
    const std::size_t first_byte_;        // where this value begins in `out_`
    const std::size_t first_descriptor_;  // the same for descriptors
    std::size_t elements_ = 0;            // of all containers begun
    unsigned depth_ = 0;
    container open_[kMostDepth];  // containers begun and not ended, outermost first
};

}  // namespace

int encode(vox_object_t value, const codec_limits& limits, encoded& out) {
    return encoder(limits, out).run(value);
}

}  // namespace vox_wire
