#include "src/rest/property_path.h"

#include <algorithm>

namespace plr::rest {
namespace {

using Kind = PropertyPathKind;

// The next segment, empty at the end; the path moves behind it.
std::string_view take(PathView& path) noexcept {
    const std::string_view segment = path.current();
    path.advance(1);
    return segment;
}

Kind kindOfMeta(PathView path) noexcept {
    const std::string_view word = take(path);
    if (word.empty())
        return Kind::Meta;
    if (word == "watchers")
        return path ? Kind::Unknown : Kind::MetaWatchers;
    if (word != "watched")
        return Kind::Unknown;
    if (!path)
        return Kind::MetaWatched;
    const bool isWatchers = take(path) == "_" && take(path) == "watchers" && !path;
    return isWatchers ? Kind::MetaWatchedMetaWatchers : Kind::Unknown;
}

Kind kindOfResource(PathView path) noexcept {
    if (take(path) != "_")
        return Kind::Resource;
    const std::string_view word = take(path);
    if (word.empty())
        return Kind::ResourceMeta;
    // Anything else below the property means the property.
    return word == "watchers" && !path ? Kind::ResourceWatchers : Kind::Resource;
}

}  // namespace

PropertyPath parsePropertyPath(PathView path) noexcept {
    const std::string_view first = take(path);
    if (first.empty())
        return {Kind::Root};
    if (first == "_")
        return {kindOfMeta(path)};
    if (first == "*")
        return {path ? Kind::Unknown : Kind::DumpState};
    const std::size_t at = std::min(first.find('@'), first.size());
    return {kindOfResource(path), first.substr(0, at),
            first.substr(std::min(at + 1, first.size()))};
}

int segmentsOf(PropertyPathKind kind) noexcept {
    switch (kind) {
        case Kind::Root:
        case Kind::DumpState:
        case Kind::Unknown:
            return 0;
        case Kind::Meta:
        case Kind::Resource:
            return 1;
        case Kind::MetaWatchers:
        case Kind::MetaWatched:
        case Kind::ResourceMeta:
            return 2;
        case Kind::ResourceWatchers:
            return 3;
        case Kind::MetaWatchedMetaWatchers:
            return 4;
    }
    return 0;
}

}  // namespace plr::rest
