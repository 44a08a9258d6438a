#include <array>
#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <memory>
#include <string>
#include <vector>

#include "plr/ipc/object.h"

namespace vox {
namespace {

constexpr char kHexDigits[] = "0123456789abcdef";
constexpr std::size_t kMaximumDateText = 29;
constexpr std::int64_t kNanosecondsPerSecond = 1'000'000'000;

void appendHexByte(std::string& out, std::uint8_t byte) {
    out += kHexDigits[byte >> 4];
    out += kHexDigits[byte & 15];
}

void appendData(std::string& out, vox_object_t data) {
    const auto* bytes = static_cast<const std::uint8_t*>(vox_data_get_bytes_ptr(data));
    const std::size_t length = vox_data_get_length(data);
    out += '[' + std::to_string(length) + " bytes]";
    for (std::size_t i = 0; i < length; ++i) {
        out += ' ';
        appendHexByte(out, bytes[i]);
    }
}

void appendUuid(std::string& out, vox_object_t uuid) {
    const std::uint8_t* bytes = vox_uuid_get_bytes(uuid);
    for (std::size_t i = 0; i < 16; ++i) {
        if (i == 4 || i == 6 || i == 8 || i == 10)
            out += '-';
        appendHexByte(out, bytes[i]);
    }
}

void appendDate(std::string& out, vox_object_t date) {
    const std::time_t seconds = vox_date_get_value(date) / kNanosecondsPerSecond;
    std::tm local{};
    std::array<char, 128> text{};
    if (!localtime_r(&seconds, &local))
        return;
    const std::size_t length = std::strftime(text.data(), text.size(), "%F %T %Z", &local);
    out.append(text.data(), length < kMaximumDateText ? length : kMaximumDateText);
}

void appendError(std::string& out, vox_object_t error) {
    out += "VOX_ERROR(";
    out += object::retain(vox_error_get_value(error, vox_error_key_description)).text();
    out += ')';
}

void appendPlatformDescription(std::string& out, vox_object_t value) {
    const std::unique_ptr<char, void (*)(void*)> text(vox_copy_description(value), &std::free);
    if (text)
        out += text.get();
}

void appendScalar(std::string& out, const object& value) {
    switch (value.type()) {
        case VOX_TYPE_STRING:
            out += '"';
            out += value.text();
            out += '"';
            return;
        case VOX_TYPE_INT64:
            out += std::to_string(vox_int64_get_value(value.get()));
            return;
        case VOX_TYPE_UINT64:
            out += std::to_string(vox_uint64_get_value(value.get())) + 'u';
            return;
        case VOX_TYPE_DOUBLE:
            out += std::to_string(vox_double_get_value(value.get()));
            return;
        case VOX_TYPE_BOOL:
            out += vox_bool_get_value(value.get()) ? "true" : "false";
            return;
        case VOX_TYPE_NULL:
            out += "null";
            return;
        case VOX_TYPE_DATA:
            return appendData(out, value.get());
        case VOX_TYPE_DATE:
            return appendDate(out, value.get());
        case VOX_TYPE_UUID:
            return appendUuid(out, value.get());
        case VOX_TYPE_ERROR:
            return appendError(out, value.get());
        default:
            return appendPlatformDescription(out, value.get());
    }
}

// Writes a value depth first. The containers under way stand on a stack of
// its own instead of the thread's, so that no depth overflows it.
class Describer {
  public:
    std::string describe(const object& root) {
        begin(root);
        while (!open_.empty())
            advance();
        return std::move(out_);
    }

  private:
    struct Container {
        object value;
        std::size_t count;
        std::size_t next = 0;  // the entry to write next
    };

    // Writes a scalar, or opens a container.
    void begin(const object& value) {
        switch (value.type()) {
            case VOX_TYPE_DICTIONARY:
                out_ += '{';
                open_.push_back({value, vox_dictionary_get_count(value.get())});
                return;
            case VOX_TYPE_ARRAY:
                out_ += '[';
                open_.push_back({value, vox_array_get_count(value.get())});
                return;
            default:
                appendScalar(out_, value);
        }
    }

    // Writes the next entry of the innermost container, or closes it.
    void advance() {
        Container& innermost = open_.back();
        const bool isArray = innermost.value.type() == VOX_TYPE_ARRAY;
        if (innermost.next == innermost.count)
            return close(isArray ? ']' : '}', innermost.count != 0);
        const std::size_t index = innermost.next++;
        if (index != 0)
            out_ += ',';
        newLine();
        // begin() may move `innermost`.
        isArray ? beginElement(innermost.value, index) : beginEntry(innermost.value, index);
    }

    void beginElement(const object& array, std::size_t index) {
        out_ += std::to_string(index) + ": ";
        begin(object::retain(vox_array_get_value(array.get(), index)));
    }

    void beginEntry(const object& dictionary, std::size_t index) {
        const char* key = "";
        const object value =
            object::retain(vox_dictionary_get_entry(dictionary.get(), index, &key));
        out_ += '"';
        out_ += key;
        out_ += "\": ";
        begin(value);
    }

    void close(char bracket, bool onItsOwnLine) {
        open_.pop_back();
        if (onItsOwnLine)
            newLine();
        out_ += bracket;
    }

    void newLine() {
        out_ += '\n';
        out_.append(open_.size(), '\t');
    }

    std::string out_;
    std::vector<Container> open_;  // outermost first; its size is the depth
};

}  // namespace

std::string object::to_string() const {
    return Describer().describe(*this);
}

}  // namespace vox
