#include "plr/rest/path_view.h"

#include <algorithm>

namespace plr::rest {
namespace {

std::string_view withoutSlashAtEnd(std::string_view path) {
    if (path.size() >= 2 && path.ends_with('/'))
        path.remove_suffix(1);
    return path;
}

}  // namespace

PathView::PathView(std::string_view path) noexcept : path_(withoutSlashAtEnd(path)) {
    standAt(path_.starts_with('/') ? 1 : 0);
}

std::string_view PathView::tail() const noexcept {
    if (!*this)
        return path_.substr(begin_, 0);
    return path_.substr(std::min(end_ + 1, path_.size()));
}

bool PathView::hasTail() const noexcept {
    return *this && path_.size() - end_ > 1;
}

std::string_view PathView::head() const noexcept {
    if (!*this)
        return path_;
    // At offset 1 only a leading '/' precedes, which is the head itself.
    return path_.substr(0, begin_ >= 2 ? begin_ - 1 : begin_);
}

bool PathView::hasHead() const noexcept {
    return begin_ >= 2 || (begin_ == 1 && path_.front() != '/');
}

void PathView::advance(long steps) noexcept {
    if (path_.empty())
        return;
    for (; steps > 0; --steps) {
        stepOver(end_);
        if (begin_ == path_.size())
            return;
    }
    for (; steps < 0 && !isFirst(); ++steps) {
        end_ = path_[begin_ - 1] == '/' ? begin_ - 1 : begin_;
        begin_ = end_ == 0 ? 0 : path_.rfind('/', end_ - 1) + 1;
    }
}

bool PathView::skip(std::string_view prefix) noexcept {
    if (!*this)
        return false;
    if (prefix.starts_with('/'))
        prefix.remove_prefix(1);
    if (prefix.ends_with('/'))
        prefix.remove_suffix(1);
    const std::string_view rest = path_.substr(begin_);
    if (prefix.empty() || !rest.starts_with(prefix))
        return false;
    if (rest.size() > prefix.size() && rest[prefix.size()] != '/')
        return false;
    stepOver(begin_ + prefix.size());
    return true;
}

// The segment that begins there.
void PathView::standAt(std::size_t begin) noexcept {
    begin_ = begin;
    end_ = std::min(path_.find('/', begin), path_.size());
}

// The segment behind the one that ends at `end`; past the last when it is the
// last.
void PathView::stepOver(std::size_t end) noexcept {
    standAt(std::min(end + 1, path_.size()));
}

bool PathView::isFirst() const noexcept {
    return begin_ == 0 || (begin_ == 1 && path_.front() == '/');
}

std::string path_join(std::string_view head, std::string_view tail) {
    if (head.empty() || tail.empty())
        return std::string(head.empty() ? tail : head);
    const std::string_view rest = tail.starts_with('/') ? tail.substr(1) : tail;
    std::string joined;
    joined.reserve(head.size() + 1 + rest.size());
    joined += head;
    if (!head.ends_with('/'))
        joined += '/';
    joined += rest;
    return joined;
}

}  // namespace plr::rest
