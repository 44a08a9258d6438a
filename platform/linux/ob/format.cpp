// The format language:
//
//   conversion = "%" *("-" | "+" | " " | "#" | "0") [number | "*"]
//                ["." [number | "*"]] [length] type
//   length     = "hh" | "h" | "l" | "ll" | "q" | "j" | "z" | "t" | "L"
//   type       = one of "diouxXcspaAeEfFgGn%@"
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cwchar>
#include <string>
#include <string_view>
#include <utility>

#include "platform/linux/ob/object.h"

// Each conversion is put together from checked parts and gets one argument of
// its own type.
#pragma GCC diagnostic ignored "-Wformat-nonliteral"

namespace ob {
namespace {

constexpr std::string_view kFlags = "-+ #0";
constexpr std::string_view kDigits = "0123456789";

enum class size { none, hh, h, l, ll, j, z, t, big };

struct length_name {
    std::string_view text;
    size value;
};
constexpr length_name kLengths[] = {{"hh", size::hh}, {"h", size::h},  {"ll", size::ll},
                                    {"l", size::l},   {"q", size::ll}, {"j", size::j},
                                    {"z", size::z},   {"t", size::t},  {"L", size::big}};

class formatter {
  public:
    formatter(std::string_view pattern, va_list arguments) : rest_(pattern) {
        va_copy(arguments_, arguments);
    }
    ~formatter() { va_end(arguments_); }
    formatter(const formatter&) = delete;
    formatter& operator=(const formatter&) = delete;

    std::string run() {
        while (!rest_.empty()) {
            const std::size_t plain = rest_.find('%');
            out_ += rest_.substr(0, plain);
            rest_.remove_prefix(plain == std::string_view::npos ? rest_.size() : plain);
            if (!rest_.empty())
                convert();
        }
        return std::move(out_);
    }

  private:
    void convert();
    void read_flags();
    void read_width();
    void read_precision();
    size read_length();
    std::string take_digits();
    bool take(char wanted);

    bool convert_type(char type, size length);
    template <class Value>
    bool print(std::string_view length, char type, Value value);
    bool print_signed(char type, size length);
    bool print_unsigned(char type, size length);
    bool print_floating(char type, size length);
    bool print_text(size length);
    bool print_character(size length);

    std::string_view rest_;
    std::string out_;
    std::string spec_;  // "%", flags, width and precision of the conversion at hand
    va_list arguments_;
};

// Copies the conversion as it stands when it is none.
void formatter::convert() {
    const std::string_view whole = rest_;
    rest_.remove_prefix(1);
    spec_ = "%";
    read_flags();
    read_width();
    read_precision();
    const size length = read_length();
    const char type = rest_.empty() ? '\0' : rest_.front();
    const bool done = !rest_.empty() && convert_type(type, length);
    if (!rest_.empty() && (done || type == 'n'))
        rest_.remove_prefix(1);
    if (!done)
        out_ += whole.substr(0, whole.size() - rest_.size());
}

bool formatter::take(char wanted) {
    const bool found = !rest_.empty() && rest_.front() == wanted;
    if (found)
        rest_.remove_prefix(1);
    return found;
}

std::string formatter::take_digits() {
    const std::size_t count = std::min(rest_.find_first_not_of(kDigits), rest_.size());
    std::string digits(rest_.substr(0, count));
    rest_.remove_prefix(count);
    return digits;
}

void formatter::read_flags() {
    while (!rest_.empty() && kFlags.find(rest_.front()) != std::string_view::npos) {
        spec_ += rest_.front();
        rest_.remove_prefix(1);
    }
}

// A negative argument is the flag "-" and the width, as it is written.
void formatter::read_width() {
    spec_ += take('*') ? std::to_string(va_arg(arguments_, int)) : take_digits();
}

// A negative argument is no precision.
void formatter::read_precision() {
    if (!take('.'))
        return;
    if (!take('*')) {
        spec_ += "." + take_digits();
    } else if (const int precision = va_arg(arguments_, int); precision >= 0) {
        spec_ += "." + std::to_string(precision);
    }
}

size formatter::read_length() {
    for (const length_name& each : kLengths) {
        if (rest_.starts_with(each.text)) {
            rest_.remove_prefix(each.text.size());
            return each.value;
        }
    }
    return size::none;
}

bool formatter::convert_type(char type, size length) {
    switch (type) {
        case 'd':
        case 'i':
            return print_signed(type, length);
        case 'o':
        case 'u':
        case 'x':
        case 'X':
            return print_unsigned(type, length);
        case 'a':
        case 'A':
        case 'e':
        case 'E':
        case 'f':
        case 'F':
        case 'g':
        case 'G':
            return print_floating(type, length);
        case 'c':
            return print_character(length);
        case 's':
            return print_text(length);
        case 'p':
            return print("", type, va_arg(arguments_, void*));
        case '@':
            out_ += text_of(va_arg(arguments_, const object*));
            return true;
        case '%':
            out_ += '%';
            return true;
        case 'n':
            static_cast<void>(va_arg(arguments_, void*));
            return false;
        default:
            return false;
    }
}

// False when there is no such text: wide characters that the locale has not, or
// more than INT_MAX bytes.
template <class Value>
bool formatter::print(std::string_view length, char type, Value value) {
    spec_ += length;
    spec_ += type;
    const int count = std::snprintf(nullptr, 0, spec_.c_str(), value);
    if (count < 0)
        return false;
    const std::size_t begin = out_.size();
    const auto bytes = static_cast<std::size_t>(count);
    out_.resize(begin + bytes + 1);  // with the NUL
    std::snprintf(out_.data() + begin, bytes + 1, spec_.c_str(), value);
    out_.resize(begin + bytes);
    return true;
}

bool formatter::print_signed(char type, size length) {
    switch (length) {
        case size::none:
            return print("", type, va_arg(arguments_, int));
        case size::hh:
            return print("hh", type, va_arg(arguments_, int));
        case size::h:
            return print("h", type, va_arg(arguments_, int));
        case size::l:
            return print("l", type, va_arg(arguments_, long));
        case size::ll:
        case size::big:
            return print("ll", type, va_arg(arguments_, long long));
        case size::j:
            return print("j", type, va_arg(arguments_, std::intmax_t));
        case size::z:
            return print("z", type, va_arg(arguments_, ssize_t));
        case size::t:
            return print("t", type, va_arg(arguments_, std::ptrdiff_t));
    }
    return false;
}

bool formatter::print_unsigned(char type, size length) {
    switch (length) {
        case size::none:
            return print("", type, va_arg(arguments_, unsigned));
        case size::hh:
            return print("hh", type, va_arg(arguments_, unsigned));
        case size::h:
            return print("h", type, va_arg(arguments_, unsigned));
        case size::l:
            return print("l", type, va_arg(arguments_, unsigned long));
        case size::ll:
        case size::big:
            return print("ll", type, va_arg(arguments_, unsigned long long));
        case size::j:
            return print("j", type, va_arg(arguments_, std::uintmax_t));
        case size::z:
            return print("z", type, va_arg(arguments_, std::size_t));
        case size::t:
            return print("t", type, va_arg(arguments_, std::ptrdiff_t));
    }
    return false;
}

bool formatter::print_floating(char type, size length) {
    if (length == size::big)
        return print("L", type, va_arg(arguments_, long double));
    return print("", type, va_arg(arguments_, double));
}

bool formatter::print_text(size length) {
    if (length == size::l)
        return print("l", 's', va_arg(arguments_, const wchar_t*));
    const char* const text = va_arg(arguments_, const char*);
    return print("", 's', text ? text : "(null)");
}

bool formatter::print_character(size length) {
    if (length == size::l)
        return print("l", 'c', va_arg(arguments_, wint_t));
    return print("", 'c', va_arg(arguments_, int));
}

}  // namespace

std::string format(std::string_view pattern, va_list arguments) {
    return formatter(pattern, arguments).run();
}

}  // namespace ob
