#include "platform/linux/qf/value.h"
#include "platform/linux/vox/codec.h"
#include "qf/string.h"

// Text of other encodings is walked twice: for the length of its UTF-8, then to
// write that.
namespace {

using octet = std::uint8_t;

class counter {
  public:
    void operator()(char32_t c) noexcept {
        length_ += c < 0x80 ? 1 : c < 0x800 ? 2 : c < 0x10000 ? 3 : 4;
    }
    [[nodiscard]] std::size_t length() const noexcept { return length_; }

  private:
    std::size_t length_ = 0;
};

class writer {
  public:
    explicit writer(char* to) noexcept : to_(to) {}
    void operator()(char32_t c) noexcept {
        if (c < 0x80)
            return put(c);
        if (c < 0x800) {
            put(0xc0 | c >> 6);
        } else {
            if (c < 0x10000) {
                put(0xe0 | c >> 12);
            } else {
                put(0xf0 | c >> 18);
                put(0x80 | (c >> 12 & 0x3f));
            }
            put(0x80 | (c >> 6 & 0x3f));
        }
        put(0x80 | (c & 0x3f));
    }

  private:
    void put(char32_t byte) noexcept { *to_++ = static_cast<char>(byte); }
    char* to_;
};

// Each gives the characters of `bytes` to `take`; false when they are not valid.

template <class Take>
bool walk_single_bytes(const octet* bytes, std::size_t length, octet last, Take& take) noexcept {
    for (std::size_t i = 0; i < length; i++) {
        if (bytes[i] > last)
            return false;
        take(bytes[i]);
    }
    return true;
}

template <class Take>
bool walk_utf16(const octet* bytes, std::size_t length, bool big, Take& take) noexcept {
    const auto unit = [bytes, big](std::size_t i) -> char32_t {
        return big ? static_cast<char32_t>(bytes[i] << 8 | bytes[i + 1])
                   : static_cast<char32_t>(bytes[i + 1] << 8 | bytes[i]);
    };
    if (length % 2 != 0)
        return false;
    for (std::size_t i = 0; i < length; i += 2) {
        const char32_t first = unit(i);
        if ((first & 0xf800) != 0xd800) {
            take(first);
            continue;
        }
        i += 2;
        if (first >= 0xdc00 || i == length || (unit(i) & 0xfc00) != 0xdc00)
            return false;  // half of a pair
        take(0x10000 + ((first & 0x3ff) << 10) + (unit(i) & 0x3ff));
    }
    return true;
}

template <class Take>
bool walk(const octet* bytes, std::size_t length, QfStringEncoding encoding, Take& take) noexcept {
    switch (encoding) {
        case kQfStringEncodingUTF8:
            break;
        case kQfStringEncodingASCII:
            return walk_single_bytes(bytes, length, 0x7f, take);
        case kQfStringEncodingISOLatin1:
            return walk_single_bytes(bytes, length, 0xff, take);
        case kQfStringEncodingUTF16BE:
        case kQfStringEncodingUTF16LE:
            return walk_utf16(bytes, length, encoding == kQfStringEncodingUTF16BE, take);
    }
    return false;
}

// An unfilled string whose text is memory of `allocator`; null when that has none.
qf_string* make_string_from(QfAllocatorRef allocator, std::size_t length, char*& text) noexcept {
    if (!allocator) {
        qf_string* const made = qf::make_string(length);
        text = made->inline_text();
        return made;
    }
    text = static_cast<char*>(qf::allocate_from(allocator, length + 1));
    if (!text)
        return nullptr;
    text[length] = '\0';
    auto* const made = qf::make<qf::elsewhere<qf_string>>(0, length, text, length + 1, allocator);
    made->text = text;
    return made;
}

}  // namespace

extern "C" QfStringRef qf_string_create_with_bytes(QfAllocatorRef allocator, const void* bytes,
                                                   size_t length, QfStringEncoding encoding) {
    const auto* const from = static_cast<const octet*>(bytes);
    const bool utf8 = encoding == kQfStringEncodingUTF8;
    counter counted;
    if (utf8 ? !vox_wire::is_utf8({from, length}) : !walk(from, length, encoding, counted))
        return nullptr;
    char* text = nullptr;
    qf_string* const made = make_string_from(allocator, utf8 ? length : counted.length(), text);
    if (!made)
        return nullptr;
    writer written(text);
    if (!utf8)
        walk(from, length, encoding, written);
    else if (length > 0)
        std::memcpy(text, bytes, length);
    return made;
}
