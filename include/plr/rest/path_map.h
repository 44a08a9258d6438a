#pragma once

#include <algorithm>
#include <cstddef>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

// A PathMap keeps values by path, each path once, in ascending bytewise order.
//
// Threads: as a standard container.
// Cost:    one block of memory; a look-up is a binary search without a copy.
namespace plr::rest {

template <class Value>
class PathMap {
  public:
    using Entry = std::pair<std::string, Value>;

    // Null when the path is not there. Valid until the map is changed.
    [[nodiscard]] Value* find(std::string_view path) {
        const auto place = lowerBound(path);
        return isAt(place, path) ? &place->second : nullptr;
    }
    [[nodiscard]] const Value* find(std::string_view path) const {
        return const_cast<PathMap&>(*this).find(path);
    }
    // Puts `value` at `path` unless there is one. The value that is there, and
    // whether it is the new one.
    std::pair<Value*, bool> insert(std::string_view path, Value value) {
        const auto place = lowerBound(path);
        if (isAt(place, path))
            return {&place->second, false};
        return {&entries_.emplace(place, path, std::move(value))->second, true};
    }
    // False when the path is not there.
    bool erase(std::string_view path) {
        const auto place = lowerBound(path);
        if (!isAt(place, path))
            return false;
        entries_.erase(place);
        return true;
    }

    [[nodiscard]] bool empty() const noexcept { return entries_.empty(); }
    [[nodiscard]] std::size_t size() const noexcept { return entries_.size(); }
    [[nodiscard]] auto begin() const noexcept { return entries_.begin(); }
    [[nodiscard]] auto end() const noexcept { return entries_.end(); }

  private:
    using Place = typename std::vector<Entry>::iterator;

    Place lowerBound(std::string_view path) {
        return std::lower_bound(
            entries_.begin(), entries_.end(), path,
            [](const Entry& entry, std::string_view sought) { return entry.first < sought; });
    }
    bool isAt(Place place, std::string_view path) const {
        return place != entries_.end() && place->first == path;
    }

    std::vector<Entry> entries_;
};

}  // namespace plr::rest
