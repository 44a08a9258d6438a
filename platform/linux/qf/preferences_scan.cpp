#include "platform/linux/qf/preferences_scan.h"

#include <algorithm>
#include <utility>

#include "platform/linux/qf/preferences_parse.h"

namespace qf::preferences {
namespace {

bool is_blank(char c) noexcept {
    return c == ' ' || c == '\t' || c == '\r';
}

bool is_bare(char c) noexcept {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
           c == '-';
}

// Behind the line feed of the line in which `at` stands.
std::size_t behind_line(std::string_view text, std::size_t at) noexcept {
    const std::size_t feed = text.find('\n', at);
    return feed == std::string_view::npos ? text.size() : feed + 1;
}

// Behind the string that begins at `at`; one that is not closed ends with its
// line, or with the text when it may have several.
std::size_t behind_string(std::string_view text, std::size_t at) noexcept {
    const char quote = text[at];
    const std::string_view three = quote == '"' ? R"(""")" : "'''";
    const bool is_long = text.substr(at, 3) == three;
    for (at += is_long ? 3 : 1; at < text.size(); ++at) {
        if (quote == '"' && text[at] == '\\')
            ++at;
        else if (is_long && text.substr(at, 3) == three) {
            at += 3;
            // Up to two more belong to the text before the closing ones.
            for (int more = 0; more < 2 && at < text.size() && text[at] == quote; ++more)
                ++at;
            return at;
        } else if (!is_long && text[at] == quote)
            return at + 1;
        else if (!is_long && text[at] == '\n')
            return at;
    }
    return text.size();
}

class scanner {
  public:
    explicit scanner(std::string_view text) : text_(text) {
        if (text.starts_with(kByteOrderMark))
            at_ = kByteOrderMark.size();
    }

    bool read_all() {
        while (at_ < text_.size()) {
            const std::size_t line = at_;
            skip_blanks();
            if (at_ == text_.size() || text_[at_] == '\n' || text_[at_] == '#')
                at_ = behind_line(text_, at_);
            else if (!read_statement(line))
                return false;
        }
        return true;
    }
    std::vector<statement> take() { return std::move(found_); }

  private:
    void skip_blanks() {
        while (at_ < text_.size() && is_blank(text_[at_]))
            ++at_;
    }
    bool take_character(char wanted) {
        if (at_ == text_.size() || text_[at_] != wanted)
            return false;
        ++at_;
        return true;
    }

    bool read_statement(std::size_t line) {
        statement next;
        next.begin = line;
        if (!(text_[at_] == '[' ? read_header(next) : read_pair(next)))
            return false;
        skip_blanks();
        if (at_ < text_.size() && text_[at_] != '\n' && text_[at_] != '#')
            return false;
        next.end = at_ = behind_line(text_, at_);
        found_.push_back(std::move(next));
        return true;
    }

    bool read_header(statement& header) {
        const bool is_element = text_.substr(at_, 2) == "[[";
        header.what = is_element ? statement::kind::array_element : statement::kind::table;
        at_ += is_element ? 2 : 1;
        if (!read_path(header.path) || !take_character(']') || (is_element && !take_character(']')))
            return false;
        table_ = header.path;
        return true;
    }

    bool read_pair(statement& pair) {
        pair.path = table_;
        if (!read_path(pair.path) || !take_character('='))
            return false;
        skip_blanks();
        pair.value_begin = at_;
        return skip_value(pair.value_end);
    }

    // Appends the parts of a dotted key.
    bool read_path(key_path& path) {
        do {
            skip_blanks();
            if (!read_key(path))
                return false;
            skip_blanks();
        } while (take_character('.'));
        return true;
    }

    bool read_key(key_path& path) {
        const std::size_t begin = at_;
        if (at_ < text_.size() && (text_[at_] == '"' || text_[at_] == '\'')) {
            at_ = behind_string(text_, at_);
            path.push_back(unquote(text_.substr(begin, at_ - begin)));
            return true;
        }
        while (at_ < text_.size() && is_bare(text_[at_]))
            ++at_;
        path.emplace_back(text_.substr(begin, at_ - begin));
        return at_ != begin;
    }

    // To the end of a value, which may go over several lines within brackets.
    bool skip_value(std::size_t& value_end) {
        int open = 0;
        value_end = at_;
        while (at_ < text_.size()) {
            const char c = text_[at_];
            if (open == 0 && (c == '\n' || c == '#'))
                break;
            if (c == '#') {
                at_ = behind_line(text_, at_);
                continue;
            }
            open += c == '[' || c == '{' ? 1 : c == ']' || c == '}' ? -1 : 0;
            at_ = c == '"' || c == '\'' ? behind_string(text_, at_) : at_ + 1;
            if (!is_blank(c))
                value_end = at_;
        }
        return open == 0;
    }

    std::string_view text_;
    std::size_t at_ = 0;
    key_path table_;  // of the header read last
    std::vector<statement> found_;
};

}  // namespace

std::optional<std::vector<statement>> scan(std::string_view text) {
    scanner reader(text);
    if (!reader.read_all())
        return {};
    return reader.take();
}

std::size_t find_deep_nesting(std::string_view text) noexcept {
    unsigned open = 0;
    unsigned dots = 0;
    for (std::size_t at = 0; at < text.size();) {
        const char c = text[at];
        if (c == '[' || c == '{')
            ++open;
        else if ((c == ']' || c == '}') && open > 0)
            --open;
        dots = c == '.' ? dots + 1 : c == '\n' || c == ',' || c == '=' ? 0 : dots;
        if (open > kMaximumDepth || dots > kMaximumDepth)
            return at;
        at = c == '#'                ? behind_line(text, at)
             : c == '"' || c == '\'' ? behind_string(text, at)
                                     : at + 1;
    }
    return std::string_view::npos;
}

}  // namespace qf::preferences
