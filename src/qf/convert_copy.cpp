#include "plr/qf/convert_copy.h"

#include <cstring>

namespace plr::qf {
namespace {

// A created value, or null.
template <class Reference>
bool handOver(Reference& out, Reference created) {
    if (!created)
        return false;
    out = created;
    return true;
}

void* allocateNothing(std::size_t /*size*/, void* /*context*/) {
    return nullptr;
}
void unmapFile(void* bytes, std::size_t size, void* /*context*/) {
    MemoryMappedFile::unmap(bytes, size);
}
constexpr QfAllocator kUnmapper{&allocateNothing, &unmapFile, nullptr};

}  // namespace

bool convert_copy(QfStringRef& out, const std::string& text, QfStringEncoding encoding,
                  QfAllocatorRef allocator) {
    return handOver(out,
                    qf_string_create_with_bytes(allocator, text.data(), text.size(), encoding));
}

bool convert_copy(QfStringRef& out, const char* text, QfStringEncoding encoding,
                  QfAllocatorRef allocator) {
    return text &&
           handOver(out, qf_string_create_with_bytes(allocator, text, std::strlen(text), encoding));
}

bool convert_copy(QfDataRef& out, const std::vector<std::uint8_t>& bytes,
                  QfAllocatorRef allocator) {
    return handOver(out, qf_data_create_with_allocator(allocator, bytes.data(), bytes.size()));
}

bool convert_copy(QfDataRef& out, const MemoryMappedFile& file, bool copy, QfAllocatorRef allocator,
                  QfAllocatorRef deallocator) {
    if (!file)
        return false;
    return handOver(out, copy ? qf_data_create_with_allocator(allocator, file.bytes(), file.size())
                              : qf_data_create_no_copy(file.bytes(), file.size(), deallocator));
}

bool convert_copy(QfDataRef& out, MemoryMappedFile&& file) {
    if (!convert_copy(out, file, false, nullptr, &kUnmapper))
        return false;
    file.release();
    return true;
}

bool copy(QfErrorRef error, QfStringRef& out) {
    return error && handOver(out, qf_error_copy_description(error));
}

}  // namespace plr::qf
