#include "plr/rest/typed_value.h"

#include "plr/ipc/read.h"

namespace plr::rest::detail {
namespace {

// The content of a value that has its type.
template <class T>
std::optional<T> as(vox_type_t type, const vox::object& value) {
    if (value.type() != type)
        return std::nullopt;
    return vox::dyn_cast_or_default(value, T());
}

}  // namespace

std::optional<bool> asBool(const vox::object& value) {
    return as<bool>(VOX_TYPE_BOOL, value);
}

std::optional<std::int64_t> asSigned(const vox::object& value, std::int64_t least,
                                     std::int64_t most) {
    if (value.type() != VOX_TYPE_INT64 && !asUnsigned(value, static_cast<std::uint64_t>(most)))
        return std::nullopt;
    const std::int64_t number = vox::dyn_cast_or_default(value, 0LL);
    return number >= least && number <= most ? std::optional(number) : std::nullopt;
}

std::optional<std::uint64_t> asUnsigned(const vox::object& value, std::uint64_t most) {
    std::uint64_t number = 0;
    if (value.type() == VOX_TYPE_UINT64)
        number = vox_uint64_get_value(value.get());
    else if (value.type() == VOX_TYPE_INT64 && vox_int64_get_value(value.get()) >= 0)
        number = static_cast<std::uint64_t>(vox_int64_get_value(value.get()));
    else
        return std::nullopt;
    return number <= most ? std::optional(number) : std::nullopt;
}

std::optional<double> asDouble(const vox::object& value) {
    if (value.type() == VOX_TYPE_INT64)
        return static_cast<double>(vox_int64_get_value(value.get()));
    if (value.type() == VOX_TYPE_UINT64)
        return static_cast<double>(vox_uint64_get_value(value.get()));
    return as<double>(VOX_TYPE_DOUBLE, value);
}

std::optional<std::string> asText(const vox::object& value) {
    return as<std::string>(VOX_TYPE_STRING, value);
}

std::optional<std::vector<std::uint8_t>> asData(const vox::object& value) {
    return as<std::vector<std::uint8_t>>(VOX_TYPE_DATA, value);
}

}  // namespace plr::rest::detail
