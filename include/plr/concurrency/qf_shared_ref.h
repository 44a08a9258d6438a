#pragma once

#include "plr/concurrency/shared_ref.h"
#include "qf/qf.h"

// QfSharedRef<T> owns one reference of a Qf value, or is null. T is what the
// Qf reference type points to: qf::String, qf::Number.
namespace plr::qf {

using String = const ::qf_string;
using Number = const ::qf_number;

struct qfretain_functor {
    void operator()(const void* value) const { qf_retain(value); }
};
struct qfrelease_functor {
    void operator()(const void* value) const { qf_release(value); }
};

namespace detail {
template <class T>
QfTypeID typeIdOf();
template <>
inline QfTypeID typeIdOf<String>() {
    return qf_string_get_type_id();
}
template <>
inline QfTypeID typeIdOf<Number>() {
    return qf_number_get_type_id();
}
}  // namespace detail

template <class T>
class QfSharedRef : public SharedRef<T, qfretain_functor, qfrelease_functor> {
    using Base = SharedRef<T, qfretain_functor, qfrelease_functor>;

  public:
    using Base::Base;
    QfSharedRef() noexcept = default;

    // Adopts a created value of any type if it is a T; another one is released
    // at once and the holder stays null.
    explicit QfSharedRef(_Created<const void> created) : Base(checked(created.get())) {}

  private:
    static _Created<T> checked(const void* created) {
        if (!created)
            return _Created<T>(nullptr);
        if (qf_get_type_id(created) == detail::typeIdOf<T>())
            return _Created<T>(static_cast<T*>(created));
        qf_release(created);
        return _Created<T>(nullptr);
    }
};

// Any value: nothing to check.
template <>
class QfSharedRef<const void> : public SharedRef<const void, qfretain_functor, qfrelease_functor> {
  public:
    using SharedRef::SharedRef;
    QfSharedRef() noexcept = default;
};

}  // namespace plr::qf
