#include "platform/linux/qf/preferences_edit.h"

#include <algorithm>
#include <optional>
#include <utility>
#include <vector>

#include "platform/linux/qf/preferences_parse.h"
#include "platform/linux/qf/preferences_scan.h"
#include "platform/linux/qf/preferences_write.h"

namespace qf::preferences {
namespace {

// Replaces `length` bytes at `at`.
struct replacement {
    std::size_t at = 0;
    std::size_t length = 0;
    std::string by;
    bool is_section = false;
};

bool is_within(const key_path& path, const key_path& outer) {
    return path.size() >= outer.size() && std::equal(outer.begin(), outer.end(), path.begin());
}

QfTypeRef lookup(QfDictionaryRef dictionary, QfStringRef key) noexcept {
    return qf_dictionary_get_value(dictionary, key);
}

class editor {
  public:
    editor(std::string_view text, const std::vector<statement>& statements)
        : text_(text), statements_(statements) {}

    // Changes what differs of root key by key; `anew`: not within their values.
    void change_root(QfDictionaryRef old, QfDictionaryRef wanted, bool anew) {
        for_each_key(old, wanted, [this, old, wanted, anew](QfStringRef key) {
            const key_path path{std::string(view(key))};
            QfTypeRef before = lookup(old, key);
            QfTypeRef after = lookup(wanted, key);
            const std::size_t done = replacements_.size();
            if ((before && after && qf_equal(before, after)) ||
                (!anew && change(path, before, after)))
                return;
            replacements_.resize(done);
            remove(path);
            if (after)
                add(path, after);
        });
    }

    [[nodiscard]] std::string result() {
        // At the text's end pairs come first: behind a new header they would be its.
        std::stable_sort(replacements_.begin(), replacements_.end(),
                         [](const replacement& left, const replacement& right) {
                             return std::pair(left.at, left.is_section) <
                                    std::pair(right.at, right.is_section);
                         });
        std::string out;
        std::size_t at = 0;
        for (const replacement& next : replacements_) {
            if (next.at > at)
                out += text_.substr(at, next.at - at);
            append_lines(out, next);
            at = std::max(at, next.at + next.length);
        }
        return out += text_.substr(std::min(at, text_.size()));
    }

  private:
    // New lines need an end of the line before, which the last one may lack. A
    // blank one before them is for when something stands there.
    static void append_lines(std::string& out, const replacement& next) {
        const bool is_new = next.length == 0;
        const bool is_first = out.empty() || out == kByteOrderMark;
        if (is_new && !is_first && out.back() != '\n')
            out += '\n';
        out += next.by.substr(is_new && is_first && next.by.starts_with('\n') ? 1 : 0);
    }

    // All keys of both, each once.
    template <class Function>
    static void for_each_key(QfDictionaryRef old, QfDictionaryRef wanted,
                             const Function& function) {
        for_each_entry(old, [&function](QfStringRef key, QfTypeRef) { function(key); });
        for_each_entry(wanted, [old, &function](QfStringRef key, QfTypeRef) {
            if (!lookup(old, key))
                function(key);
        });
    }

    // Whether it could be done in place.
    bool change(const key_path& path, QfTypeRef before, QfTypeRef after) {
        if (before && after && qf_equal(before, after))
            return true;
        if (!after) {
            remove(path);
            return true;
        }
        if (!before)
            return add(path, after);
        if (const statement* pair = find_pair(path)) {
            std::string value;
            append_value(value, after);
            replacements_.push_back(
                {pair->value_begin, pair->value_end - pair->value_begin, std::move(value)});
            return true;
        }
        QfDictionaryRef old = as_dictionary(before);
        QfDictionaryRef wanted = as_dictionary(after);
        return old && wanted && change_table(path, old, wanted);
    }

    bool change_table(const key_path& path, QfDictionaryRef old, QfDictionaryRef wanted) {
        bool done = true;
        for_each_key(old, wanted, [this, &path, old, wanted, &done](QfStringRef key) {
            key_path inner = path;
            inner.emplace_back(view(key));
            done = done && change(inner, lookup(old, key), lookup(wanted, key));
        });
        return done;
    }

    void remove(const key_path& path) {
        for (const statement& each : statements_) {
            if (is_within(each.path, path))
                replacements_.push_back({each.begin, each.end - each.begin, {}});
        }
    }

    bool add(const key_path& path, QfTypeRef value) {
        std::string lines;
        if (QfDictionaryRef table = as_dictionary(value)) {
            lines += '\n';
            append_section(lines, path, table);
            replacements_.push_back({text_.size(), 0, std::move(lines), true});
            return true;
        }
        const std::optional<std::size_t> place = place_for_pair(path);
        append_pair(lines, path.back(), value);
        if (place)
            replacements_.push_back({*place, 0, std::move(lines)});
        return place.has_value();
    }

    // Where a new pair of the table goes that `path` is in: nothing when the
    // table has no header.
    [[nodiscard]] std::optional<std::size_t> place_for_pair(const key_path& path) const {
        const key_path table(path.begin(), path.end() - 1);
        std::optional<std::size_t> place;
        if (table.empty())
            place = before_first_header();
        bool is_here = table.empty();
        for (const statement& each : statements_) {
            if (each.what != statement::kind::pair)
                is_here = each.what == statement::kind::table && each.path == table;
            if (is_here)
                place = each.end;
        }
        return place;
    }

    // Also before the comment lines that stand right above it.
    [[nodiscard]] std::size_t before_first_header() const {
        const auto header =
            std::find_if(statements_.begin(), statements_.end(),
                         [](const statement& each) { return each.what != statement::kind::pair; });
        if (header == statements_.end())
            return text_.size();
        std::size_t place = header->begin;
        while (place > 0) {
            const std::size_t line = place < 2 ? 0 : text_.rfind('\n', place - 2) + 1;
            const std::size_t first = text_.find_first_not_of(" \t", line);
            if (text_[first] != '#')
                break;
            place = line;
        }
        return place;
    }

    [[nodiscard]] const statement* find_pair(const key_path& path) const {
        const auto found =
            std::find_if(statements_.begin(), statements_.end(), [&path](const statement& each) {
                return each.what == statement::kind::pair && each.path == path;
            });
        return found == statements_.end() ? nullptr : &*found;
    }

    std::string_view text_;
    const std::vector<statement>& statements_;
    std::vector<replacement> replacements_;
};

bool says(const std::string& text, QfDictionaryRef wanted) {
    const parsed result = parse(text, "");
    return result.values && qf_equal(result.values.get(), wanted);
}

}  // namespace

std::string edit(std::string_view text, QfDictionaryRef old, QfDictionaryRef wanted) {
    if (qf_equal(old, wanted))
        return std::string(text);
    if (const std::optional<std::vector<statement>> statements = scan(text)) {
        for (const bool anew : {false, true}) {
            editor attempt(text, *statements);
            attempt.change_root(old, wanted, anew);
            if (std::string result = attempt.result(); says(result, wanted))
                return result;
        }
    }
    return write_file(wanted);
}

}  // namespace qf::preferences
