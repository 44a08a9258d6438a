#pragma once

#include "plr/concurrency/shared_ref.h"
#include "qf/qf.h"

// QfSharedRef<T> owns one reference of a Qf value, or is null. T is what the
// Qf reference type points to; the names below stand for them:
//
//   const auto text = plr::qf::adopt(qf_copy_description(value));
//   QfSharedRef<plr::qf::Number> number(_Created<const void>(answer));  // null if it is none
namespace plr::qf {

using Boolean = const ::qf_boolean;
using Number = const ::qf_number;
using String = const ::qf_string;
using Data = const ::qf_data;
using Date = const ::qf_date;
using URL = const ::qf_url;
using Error = const ::qf_error;
using Locale = const ::qf_locale;
using DateFormatter = const ::qf_date_formatter;
using Array = const ::qf_array;
using MutableArray = ::qf_array;
using Dictionary = const ::qf_dictionary;
using MutableDictionary = ::qf_dictionary;

struct qfretain_functor {
    void operator()(const void* value) const { qf_retain(value); }
};
struct qfrelease_functor {
    void operator()(const void* value) const { qf_release(value); }
};

namespace detail {
// The platform's question for the type of T. A mutable collection has the type
// of the constant one.
template <class T>
inline constexpr QfTypeID (*typeIdOf)() = typeIdOf<const T>;
template <>
inline constexpr auto typeIdOf<Boolean> = &qf_boolean_get_type_id;
template <>
inline constexpr auto typeIdOf<Number> = &qf_number_get_type_id;
template <>
inline constexpr auto typeIdOf<String> = &qf_string_get_type_id;
template <>
inline constexpr auto typeIdOf<Data> = &qf_data_get_type_id;
template <>
inline constexpr auto typeIdOf<Date> = &qf_date_get_type_id;
template <>
inline constexpr auto typeIdOf<URL> = &qf_url_get_type_id;
template <>
inline constexpr auto typeIdOf<Error> = &qf_error_get_type_id;
template <>
inline constexpr auto typeIdOf<Locale> = &qf_locale_get_type_id;
template <>
inline constexpr auto typeIdOf<DateFormatter> = &qf_date_formatter_get_type_id;
template <>
inline constexpr auto typeIdOf<Array> = &qf_array_get_type_id;
template <>
inline constexpr auto typeIdOf<Dictionary> = &qf_dictionary_get_type_id;
}  // namespace detail

// `value` if it is a T, else null; null for null. A loan.
template <class T>
[[nodiscard]] T* typed(const void* value) {
    if (!value || qf_get_type_id(value) != detail::typeIdOf<T>())
        return nullptr;
    return static_cast<T*>(const_cast<void*>(value));
}

template <class T>
class QfSharedRef : public SharedRef<T, qfretain_functor, qfrelease_functor> {
    using Base = SharedRef<T, qfretain_functor, qfrelease_functor>;

  public:
    using Base::Base;
    QfSharedRef() noexcept = default;

    // Adopts a created value of any type if it is a T; another one is released
    // at once and the holder stays null. A constant collection passes for a
    // mutable one, which have one type.
    explicit QfSharedRef(_Created<const void> created) : Base(checked(created.get())) {}

  private:
    static _Created<T> checked(const void* created) {
        T* const match = typed<T>(created);
        if (created && !match)
            qf_release(created);
        return _Created<T>(match);
    }
};

// Any value: nothing to check.
template <>
class QfSharedRef<const void> : public SharedRef<const void, qfretain_functor, qfrelease_functor> {
  public:
    using SharedRef::SharedRef;
    QfSharedRef() noexcept = default;
};

// Owns what a function of the platform named *_create or *_copy returned.
template <class T>
[[nodiscard]] QfSharedRef<T> adopt(T* created) noexcept {
    return QfSharedRef<T>(_Created<T>(created));
}

}  // namespace plr::qf
