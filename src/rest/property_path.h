#pragma once

#include <cstdint>
#include <string_view>

#include "plr/rest/path_view.h"

// What a path below a property resource means:
//
//   rest = (nothing)                      Root: the list of properties
//        / "_"                            Meta
//        / "_/watchers"                   MetaWatchers: who watches the list
//        / "_/watched"                    MetaWatched: the properties that are watched
//        / "_/watched/_/watchers"         MetaWatchedMetaWatchers: who watches those
//        / "*"                            DumpState: all values
//        / name ["@" sub-path]            Resource: a property, or a part of its value
//        / name "/_"                      ResourceMeta
//        / name "/_/watchers"             ResourceWatchers
//        / name "/" anything else         Resource
//
// Everything else is Unknown.
namespace plr::rest {

enum class PropertyPathKind : std::uint8_t {
    Root,
    Meta,
    MetaWatchers,
    MetaWatched,
    MetaWatchedMetaWatchers,
    DumpState,
    Resource,
    ResourceMeta,
    ResourceWatchers,
    Unknown,
};

// The texts are lent by the path.
struct PropertyPath {
    PropertyPathKind kind;
    std::string_view name = {};     // of the property, up to the first '@'
    std::string_view subpath = {};  // behind it
};

[[nodiscard]] PropertyPath parsePropertyPath(PathView path) noexcept;

// How many segments say it; what follows them does not matter.
[[nodiscard]] int segmentsOf(PropertyPathKind kind) noexcept;

}  // namespace plr::rest
