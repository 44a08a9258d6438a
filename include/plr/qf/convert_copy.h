#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "plr/base/export.h"
#include "plr/io/memory_mapped_file.h"
#include "qf/qf.h"

// convert_copy(out, …): native values made into Qf values, which the caller owns.
//
// Result: whether the value was made; `out` is written only then, and what it
//         held before is not released.
// Memory: allocators are lent, their contexts outlive the value; a null
//         allocator is malloc() and free(). One that has no memory fails the call.
// Threads: any.
namespace plr::qf {

// Text whose bytes are in `encoding`. Bytes that are not valid in it fail, as
// does a null `text`.
[[nodiscard]] PLR_EXPORT bool convert_copy(QfStringRef& out, const std::string& text,
                                           QfStringEncoding encoding = kQfStringEncodingUTF8,
                                           QfAllocatorRef allocator = nullptr);
// Up to the first NUL byte, in any encoding.
[[nodiscard]] PLR_EXPORT bool convert_copy(QfStringRef& out, const char* text,
                                           QfStringEncoding encoding = kQfStringEncodingUTF8,
                                           QfAllocatorRef allocator = nullptr);

[[nodiscard]] PLR_EXPORT bool convert_copy(QfDataRef& out, const std::vector<std::uint8_t>& bytes,
                                           QfAllocatorRef allocator = nullptr);

// The bytes of a mapped file. With `copy` they are copied into memory of
// `allocator`. Without, the data refers to the mapped bytes, and once it goes,
// `deallocator` is given them: one of the caller's that keeps the file mapped
// until then (by its context), or none (null) when `file` outlives the data.
// A file without a mapping fails.
[[nodiscard]] PLR_EXPORT bool convert_copy(QfDataRef& out, const MemoryMappedFile& file, bool copy,
                                           QfAllocatorRef allocator = nullptr,
                                           QfAllocatorRef deallocator = nullptr);
// Without copying; the data takes the mapping over, which ends with it. `file`
// has none afterwards.
[[nodiscard]] PLR_EXPORT bool convert_copy(QfDataRef& out, MemoryMappedFile&& file);

// The error's description. False for a null error.
[[nodiscard]] PLR_EXPORT bool copy(QfErrorRef error, QfStringRef& out);

}  // namespace plr::qf
