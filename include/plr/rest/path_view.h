#pragma once

#include <string>
#include <string_view>

#include "plr/base/export.h"

// A PathView looks at a '/'-separated path and stands on one of its segments,
// or on none: the empty path, an empty segment, or past the last one.
//
//   path    = ["/"] segment *("/" segment) ["/"]      one '/' at the end is dropped
//   segment = any bytes but '/'
//
// Owner:   the viewed text's owner keeps it for the view's life; nothing is
//          copied.
// Threads: plain data.
namespace plr::rest {

class PLR_EXPORT PathView {
  public:
    PathView() noexcept = default;
    // Stands on the first segment.
    explicit PathView(std::string_view path) noexcept;

    // The whole path, without the '/' that was dropped at its end.
    [[nodiscard]] std::string_view full() const noexcept { return path_; }
    [[nodiscard]] std::string_view current() const noexcept {
        return path_.substr(begin_, end_ - begin_);
    }
    // Whether it stands on a segment.
    explicit operator bool() const noexcept { return begin_ != end_; }

    // What follows the current segment and its separator.
    [[nodiscard]] std::string_view tail() const noexcept;
    [[nodiscard]] bool hasTail() const noexcept;
    // What precedes it, without the separator between, except that a leading
    // '/' alone is kept. The whole path when it stands on no segment.
    [[nodiscard]] std::string_view head() const noexcept;
    // Whether a segment precedes the current one.
    [[nodiscard]] bool hasHead() const noexcept;

    // Moves `steps` segments on, at most to past the last, or back, at most to
    // the first. Deliberate: empty segments count, and the view may stand on
    // one, which looks like standing on none.
    void advance(long steps) noexcept;

    // Steps over the segments of `prefix`, one or several, if they are next;
    // one '/' at either end of it does not matter. Else false and nothing
    // moves.
    bool skip(std::string_view prefix) noexcept;

  private:
    void standAt(std::size_t begin) noexcept;
    void stepOver(std::size_t end) noexcept;
    [[nodiscard]] bool isFirst() const noexcept;

    std::string_view path_;
    std::size_t begin_ = 0;  // the current segment; begin_ == end_ when none
    std::size_t end_ = 0;
};

// Joins two paths with exactly one '/' where they meet; an empty one leaves the
// other as it is.
[[nodiscard]] PLR_EXPORT std::string path_join(std::string_view head, std::string_view tail);

}  // namespace plr::rest
