#include <unistd.h>

#include <algorithm>
#include <cstring>

#include "platform/linux/vox/cbor.h"
#include "platform/linux/vox/codec.h"
#include "platform/linux/vox/value_layout.h"

namespace vox_wire {
namespace {

using namespace vox_values;

// One call of decode(). Everything read hangs on the root from the moment it
// is made, so that a failure has one thing to release.
//
// `owed_` is what bounds memory: the bytes that elements declared and not yet
// read will take at least. A container or a text is made only when what it
// declares and all that is owed besides fits into the bytes that are left.
class decoder {
  public:
    decoder(std::span<const std::uint8_t> bytes, std::span<const int> descriptors,
            const codec_limits& limits, vox_custom_object* from,
            bool descriptors_absent = false) noexcept
        : at_(bytes.data()),
          end_(bytes.data() + bytes.size()),
          descriptors_(descriptors),
          from_(from),
          descriptors_absent_(descriptors_absent),
          descriptor_limit_(std::min<std::size_t>(limits.descriptors, kMostDescriptors)),
          depth_limit_(std::min(limits.depth, kMostDepth)),
          byte_limit_(limits.bytes),
          elements_left_(limits.elements()) {}

    vox_object* run(const char*& why) noexcept {
        vox_object* root = read_root();
        if (!why_)
            return root;
        why = why_;
        vox_release(root);
        for (const int descriptor : descriptors_.subspan(adopted_))
            close_descriptor(descriptor, from_);
        return nullptr;
    }

  private:
    struct container {
        vox_container_object* object;
        std::uint32_t left;  // elements still to be read
    };

    vox_object* read_root() noexcept {
        if (left() > byte_limit_)
            return fail("the body is larger than this end accepts");
        if (descriptors_.size() > descriptor_limit_)
            return fail("more descriptors than this end accepts");
        if (left() == 0)
            return fail("the body is empty");
        owed_ = 1;
        vox_object* root = read_value();
        while (!why_ && depth_ > 0)
            read_elements(open_[depth_ - 1]);
        if (!why_ && at_ != end_)
            refuse("bytes follow the value");
        if (!why_ && adopted_ != descriptors_.size())
            refuse("a descriptor came that no value names");
        return root;
    }

    // Goes on with the innermost container up to its end or its next container.
    void read_elements(container& top) noexcept {
        if (top.object->type == VOX_TYPE_ARRAY)
            read_items(top);
        else
            read_entries(top);
    }

    void read_items(container& top) noexcept {
        auto& array = *static_cast<vox_array_object*>(top.object);
        const unsigned depth = depth_;
        while (top.left > 0) {
            top.left--;
            vox_object* value = read_value();
            if (!value)
                return;
            append(array, value);
            if (depth_ != depth)
                return;
        }
        depth_--;
    }

    void read_entries(container& top) noexcept {
        auto& dictionary = *static_cast<vox_dictionary_object*>(top.object);
        const unsigned depth = depth_;
        while (top.left > 0) {
            top.left--;
            std::string_view key;
            if (!read_key(dictionary, key))
                return;
            vox_object* value = read_value();
            if (!value)
                return;
            append(dictionary, key, value);
            if (depth_ != depth)
                return;
        }
        depth_--;
    }

    bool read_key(const vox_dictionary_object& dictionary, std::string_view& key) noexcept {
        std::uint64_t length = 0;
        if (!read_head_of(major::text, length, "a dictionary key is not a string") ||
            !read_text(length, key))
            return false;
        if (std::memchr(key.data(), 0, key.size()))
            return refuse("a dictionary key contains NUL");
        if (find(dictionary, key))
            return refuse("a dictionary names a key twice");
        return true;
    }

    // A new value, or null after fail(). Of a container only the head is read,
    // and it is opened.
    vox_object* read_value() noexcept {
        if (at_ == end_)
            return fail("the body ends inside the value");
        if (*at_ >= 0xe0)
            return read_simple();
        major kind{};
        std::uint64_t argument = 0;
        if (!read_head(kind, argument))
            return nullptr;
        switch (kind) {
            case major::unsigned_int:
            case major::negative_int:
                return read_int(kind, argument, vox_int64_create);
            case major::bytes:
                return read_data(argument);
            case major::text:
                return read_string(argument);
            case major::array:
                return open_array(argument);
            case major::map:
                return open_dictionary(argument);
            case major::tag:
                return read_tagged(argument);
            case major::simple:
                break;
        }
        return nullptr;
    }

    // ---- Heads -------------------------------------------------------------------

    bool read_head(major& kind, std::uint64_t& argument) noexcept {
        if (at_ == end_)
            return refuse("the body ends inside the value");
        owed_--;
        const std::uint8_t first = *at_++;
        kind = static_cast<major>(first >> 5);
        argument = first & 0x1f;
        return argument < 24 || read_argument(argument);
    }

    // `argument` holds the five low bits of the head's first byte.
    [[gnu::noinline]] bool read_argument(std::uint64_t& argument) noexcept {
        if (argument == 31)
            return refuse("a length is indefinite");
        if (argument > 27)
            return refuse("a head is malformed");
        const std::size_t bytes = std::size_t{1} << (argument - 24);
        if (left() < bytes)
            return refuse("the body ends inside the value");
        std::uint64_t value = 0;
        for (std::size_t i = 0; i < bytes; i++)
            value = value << 8 | *at_++;
        argument = value;
        const bool shortest = bytes == 1 ? value >= 24 : value >> (4 * bytes) != 0;
        return shortest || refuse("a number is not in its shortest form");
    }

    bool read_head_of(major wanted, std::uint64_t& argument, const char* otherwise) noexcept {
        major kind{};
        if (!read_head(kind, argument))
            return false;
        return kind == wanted || refuse(otherwise);
    }

    // Whether `bytes` more fit beside what is owed.
    bool fits(std::uint64_t bytes) noexcept {
        // Unowed bytes may be negative: then elements are missing already.
        return (owed_ <= left() && bytes <= left() - owed_) ||
               refuse("the body is shorter than its values declare");
    }

    // ---- Scalars -----------------------------------------------------------------

    vox_object* read_simple() noexcept {
        owed_--;
        switch (*at_++) {
            case kByteNull:
                return vox_null_create();
            case kByteTrue:
                return vox_bool_create(1);
            case kByteFalse:
                return vox_bool_create(0);
            case kByteDouble:
                return read_double();
            default:
                return fail("a simple value or a float of another width than 64 bits");
        }
    }

    vox_object* read_double() noexcept {
        std::uint64_t bits;
        if (!fits(sizeof bits))
            return nullptr;
        std::memcpy(&bits, at_, sizeof bits);
        at_ += sizeof bits;
        bits = to_big_endian(bits);
        double value;
        std::memcpy(&value, &bits, sizeof value);
        return vox_double_create(value);
    }

    vox_object* read_int(major kind, std::uint64_t argument,
                         vox_object_t (*create)(std::int64_t)) noexcept {
        if (argument > INT64_MAX)
            return fail("an integer does not fit into 64 bits with a sign");
        const auto value = static_cast<std::int64_t>(argument);
        return create(kind == major::negative_int ? ~value : value);
    }

    bool read_text(std::uint64_t length, std::string_view& text) noexcept {
        if (!fits(length))
            return false;
        if (!is_utf8({at_, static_cast<std::size_t>(length)}))
            return refuse("text is not UTF-8");
        text = {reinterpret_cast<const char*>(at_), static_cast<std::size_t>(length)};
        at_ += length;
        return true;
    }

    vox_object* read_string(std::uint64_t length) noexcept {
        std::string_view text;
        if (!read_text(length, text))
            return nullptr;
        vox_bytes_object* string = make_bytes(VOX_TYPE_STRING, text.size());
        string->flags.store(kUtf8Known, std::memory_order_relaxed);
        std::memcpy(string->text(), text.data(), text.size());
        return string;
    }

    vox_object* read_data(std::uint64_t length) noexcept {
        if (!fits(length))
            return nullptr;
        vox_object* data = vox_data_create(at_, static_cast<std::size_t>(length));
        at_ += length;
        return data;
    }

    // ---- Containers --------------------------------------------------------------

    vox_object* open_array(std::uint64_t count) noexcept {
        if (!admits(count, count))
            return nullptr;
        vox_array_object* array = make_array(inline_room(count));
        reserve(*array, static_cast<std::uint32_t>(count));
        return open(array, count, count);
    }

    vox_object* open_dictionary(std::uint64_t count) noexcept {
        if (!admits(count, 2 * count))
            return nullptr;
        vox_dictionary_object* dictionary = make_dictionary(inline_room(count));
        reserve(*dictionary, static_cast<std::uint32_t>(count));
        return open(dictionary, count, 2 * count);
    }

    // Whether a container of `count` elements may be made.
    bool admits(std::uint64_t count, std::uint64_t least_bytes) noexcept {
        if (count > UINT32_MAX)
            return refuse("the body is shorter than its values declare");
        if (!fits(least_bytes))
            return false;
        if (count > elements_left_)
            return refuse("more values than this end accepts");
        elements_left_ -= static_cast<std::size_t>(count);
        return true;
    }

    // Small containers lie in one piece; see make_array().
    static std::uint32_t inline_room(std::uint64_t count) noexcept {
        return count <= 64 ? static_cast<std::uint32_t>(count) : 0;
    }

    vox_object* open(vox_container_object* object, std::uint64_t count,
                     std::uint64_t least_bytes) noexcept {
        if (depth_ == depth_limit_) {
            vox_release(object);
            return fail("values are nested deeper than this end accepts");
        }
        owed_ += least_bytes;
        open_[depth_++] = {object, static_cast<std::uint32_t>(count)};
        return object;
    }

    // ---- Tagged values -----------------------------------------------------------

    vox_object* read_tagged(std::uint64_t tag) noexcept {
        owed_++;  // the content; one byte more than was declared, and no memory for it
        switch (tag) {
            case kTagUuid:
                return read_uuid();
            case kTagUint64:
                return read_uint64();
            case kTagDate:
                return read_date();
            case kTagError:
                return read_error();
            case kTagFd:
                return read_descriptor(VOX_TYPE_FD);
            case kTagEndpoint:
                return read_descriptor(VOX_TYPE_ENDPOINT);
            default:
                return fail("a tag is unknown");
        }
    }

    vox_object* read_uuid() noexcept {
        std::uint64_t length = 0;
        if (!read_head_of(major::bytes, length, "a UUID is not a byte string"))
            return nullptr;
        if (length != kUuidBytes)
            return fail("a UUID has not 16 bytes");
        if (!fits(length))
            return nullptr;
        at_ += kUuidBytes;
        return vox_uuid_create(at_ - kUuidBytes);
    }

    vox_object* read_uint64() noexcept {
        std::uint64_t value = 0;
        if (!read_head_of(major::unsigned_int, value, "a uint64 is not an unsigned integer"))
            return nullptr;
        return vox_uint64_create(value);
    }

    bool read_int_head(major& kind, std::uint64_t& argument, const char* otherwise) noexcept {
        if (!read_head(kind, argument))
            return false;
        return kind == major::unsigned_int || kind == major::negative_int || refuse(otherwise);
    }

    vox_object* read_date() noexcept {
        major kind{};
        std::uint64_t argument = 0;
        if (!read_int_head(kind, argument, "a date is not an integer"))
            return nullptr;
        return read_int(kind, argument, vox_date_create);
    }

    vox_object* read_error() noexcept {
        std::uint64_t parts = 0;
        if (!read_head_of(major::array, parts, "an error is not an array"))
            return nullptr;
        if (parts != 1 && parts != 2)
            return fail("an error has not one or two parts");
        owed_ += parts;
        major kind{};
        std::uint64_t argument = 0;
        if (!read_int_head(kind, argument, "an error's code is not an integer"))
            return nullptr;
        vox_object* error = read_int(
            kind, argument, [](std::int64_t code) { return vox_error_create(code, nullptr); });
        if (error && parts == 2 &&
            !read_error_description(*static_cast<vox_error_object*>(error))) {
            vox_release(error);
            return nullptr;
        }
        return error;
    }

    bool read_error_description(vox_error_object& error) noexcept {
        std::uint64_t length = 0;
        if (!read_head_of(major::text, length, "an error's description is not a string"))
            return false;
        error.description = read_string(length);
        return error.description != nullptr;
    }

    vox_object* read_descriptor(vox_type type) noexcept {
        std::uint64_t index = 0;
        if (!read_head_of(major::unsigned_int, index, "a descriptor's index is not a number"))
            return nullptr;
        if (descriptors_absent_)
            return vox_null_create();
        if (index < adopted_)
            return fail("a descriptor is named twice");
        if (index >= descriptors_.size())
            return fail("a descriptor is named that did not come");
        if (index > adopted_)
            return fail("descriptors are not named in order");
        return adopt_descriptor(type, descriptors_[adopted_++], from_);
    }

    // ---- State -------------------------------------------------------------------

    std::size_t left() const noexcept { return static_cast<std::size_t>(end_ - at_); }

    // Both note the first reason; what they return is for the caller to return.
    bool refuse(const char* reason) noexcept {
        if (!why_)
            why_ = reason;
        return false;
    }
    vox_object* fail(const char* reason) noexcept {
        refuse(reason);
        return nullptr;
    }

    const std::uint8_t* at_;
    const std::uint8_t* const end_;
    const std::span<const int> descriptors_;
    vox_custom_object* const from_;  // of the descriptors
    const bool descriptors_absent_;  // each stands for null
    const std::size_t descriptor_limit_;
    const unsigned depth_limit_;
    const std::size_t byte_limit_;
    std::size_t elements_left_;  // that containers may still declare
    const char* why_ = nullptr;  // null while all is well
    std::size_t adopted_ = 0;    // descriptors that values own by now, the first ones
    std::size_t owed_ = 0;       // bytes
    unsigned depth_ = 0;
    container open_[kMostDepth];  // containers begun and not ended, outermost first
};

}  // namespace

vox_object_t decode(std::span<const std::uint8_t> bytes, std::span<const int> descriptors,
                    const codec_limits& limits, const char*& why,
                    vox_custom_object* from) noexcept {
    return decoder(bytes, descriptors, limits, from).run(why);
}

vox_object_t decode_without_descriptors(std::span<const std::uint8_t> bytes,
                                        const codec_limits& limits, const char*& why) noexcept {
    return decoder(bytes, {}, limits, nullptr, true).run(why);
}

}  // namespace vox_wire
