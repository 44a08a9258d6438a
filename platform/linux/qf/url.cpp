// The grammar of RFC 3986, appendix A:
//
//   URI       = scheme ":" ["//" authority] path ["?" query] ["#" fragment]
//   scheme    = ALPHA *(ALPHA / DIGIT / "+" / "-" / ".")
//   authority = [userinfo "@"] host [":" *DIGIT]
//   userinfo  = *(unreserved / pct-encoded / sub-delims / ":")
//   host      = "[" (IPv6address / IPvFuture) "]" / *(unreserved / pct-encoded / sub-delims)
//   path      = *(pchar / "/"), beginning with "/" after an authority, not with "//" without
//   query, fragment = *(pchar / "/" / "?")
//   pchar     = unreserved / pct-encoded / sub-delims / ":" / "@"
#include <arpa/inet.h>

#include <string>
#include <string_view>

#include "platform/linux/qf/value.h"
#include "qf/error.h"

namespace {

using std::string_view;

constexpr string_view kSubDelimiters = "!$&'()*+,;=";

bool is_digit(char c) noexcept {
    return c >= '0' && c <= '9';
}
bool is_alpha(char c) noexcept {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z');
}
bool is_hex(char c) noexcept {
    return is_digit(c) || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}
bool is_plain(char c) noexcept {  // unreserved / sub-delims
    return is_alpha(c) || is_digit(c) || string_view("-._~").find(c) != string_view::npos ||
           kSubDelimiters.find(c) != string_view::npos;
}

template <class Test>
bool all(string_view text, Test test) noexcept {
    for (const char c : text)
        if (!test(c))
            return false;
    return true;
}

// Plain characters, escapes and those of `also`.
bool is_made_of(string_view text, string_view also) noexcept {
    for (std::size_t i = 0; i < text.size(); i++) {
        if (text[i] == '%') {
            if (text.size() - i < 3 || !is_hex(text[i + 1]) || !is_hex(text[i + 2]))
                return false;
            i += 2;
        } else if (!is_plain(text[i]) && also.find(text[i]) == string_view::npos) {
            return false;
        }
    }
    return true;
}

bool is_scheme(string_view text) noexcept {
    return !text.empty() && is_alpha(text[0]) && all(text, [](char c) {
        return is_alpha(c) || is_digit(c) || c == '+' || c == '-' || c == '.';
    });
}

bool is_address(string_view text) {
    if (!text.starts_with('v') && !text.starts_with('V')) {
        in6_addr address;
        return inet_pton(AF_INET6, std::string(text).c_str(), &address) == 1 &&
               text.find('\0') == string_view::npos;
    }
    const std::size_t point = text.find('.');
    return point != string_view::npos && point > 1 && all(text.substr(1, point - 1), is_hex) &&
           point + 1 < text.size() &&
           all(text.substr(point + 1), [](char c) { return is_plain(c) || c == ':'; });
}

bool is_host_and_port(string_view text) {
    const std::size_t bracket = text.starts_with('[') ? text.find(']') : 0;
    if (bracket == string_view::npos)
        return false;
    const std::size_t colon = text.find(':', bracket);
    const string_view host = text.substr(0, colon);
    const string_view port = colon == string_view::npos ? "" : text.substr(colon + 1);
    const bool good_host =
        bracket == 0 ? is_made_of(host, "")
                     : bracket == host.size() - 1 && is_address(host.substr(1, bracket - 1));
    return good_host && all(port, is_digit);
}

bool is_authority(string_view text) {
    const std::size_t at = text.find('@');
    if (at == string_view::npos)
        return is_host_and_port(text);
    return is_made_of(text.substr(0, at), ":") && is_host_and_port(text.substr(at + 1));
}

// Takes what follows the first of `mark` away from `text`; nothing when it has none.
string_view take_behind(string_view& text, char mark) noexcept {
    const std::size_t at = text.find(mark);
    const string_view behind = at == string_view::npos ? "" : text.substr(at + 1);
    text = text.substr(0, at);
    return behind;
}

// noexcept: out of memory ends the process.
bool is_uri(string_view text) noexcept {
    const string_view fragment = take_behind(text, '#');
    const string_view query = take_behind(text, '?');
    const std::size_t colon = text.find(':');
    if (colon == string_view::npos || !is_scheme(text.substr(0, colon)) ||
        !is_made_of(query, ":@/?") || !is_made_of(fragment, ":@/?"))
        return false;
    string_view path = text.substr(colon + 1);
    if (path.starts_with("//")) {
        const std::size_t slash = path.find('/', 2);
        if (!is_authority(path.substr(2, slash == string_view::npos ? slash : slash - 2)))
            return false;
        path = slash == string_view::npos ? "" : path.substr(slash);
    }
    return is_made_of(path, ":@/");
}

}  // namespace

extern "C" {

QfURLRef qf_url_create(QfStringRef text) {
    if (!is_uri(qf::checked(text)->view()))
        return nullptr;
    return qf::make<qf_url>(0, qf::retained(text));
}

QfStringRef qf_url_get_string(QfURLRef url) {
    return qf::checked(url)->text;
}

}  // extern "C"
