#include "plr/qf/map_adapter.h"

#include "plr/concurrency/qf_shared_ref.h"
#include "plr/qf/assign.h"
#include "plr/qf/assign_loosely.h"

namespace plr::qf {
namespace {

// The value if it is a T.
template <class T>
QfSharedRef<T> find(const map_adapter& map, QfStringRef key) {
    return QfSharedRef<T>(_Created<const void>(map.copyQfTypeRef(key)));
}

// The same, for a caller who releases it.
template <class T>
T* copyTyped(const map_adapter& map, QfStringRef key) {
    return find<T>(map, key).detach();
}

// What assign() makes of a T, or the fallback.
template <class T, class Native>
Native get(const map_adapter& map, QfStringRef key, Native result) {
    static_cast<void>(assign(result, find<T>(map, key).get()));
    return result;
}

template <class Native>
Native getLoosely(const map_adapter& map, QfStringRef key, Native result) {
    static_cast<void>(assign_loosely(result, find<const void>(map, key).get()));
    return result;
}

}  // namespace

map_adapter::~map_adapter() = default;

QfStringRef map_adapter::copyQfStringRef(QfStringRef key) const {
    return copyTyped<String>(*this, key);
}
QfBooleanRef map_adapter::copyQfBooleanRef(QfStringRef key) const {
    return copyTyped<Boolean>(*this, key);
}
QfNumberRef map_adapter::copyQfNumberRef(QfStringRef key) const {
    return copyTyped<Number>(*this, key);
}
QfArrayRef map_adapter::copyQfArrayRef(QfStringRef key) const {
    return copyTyped<Array>(*this, key);
}
QfDictionaryRef map_adapter::copyQfDictionaryRef(QfStringRef key) const {
    return copyTyped<Dictionary>(*this, key);
}
QfDataRef map_adapter::copyQfDataRef(QfStringRef key) const {
    return copyTyped<Data>(*this, key);
}

std::string map_adapter::getString(QfStringRef key, const std::string& fallback) const {
    return get<const void>(*this, key, fallback);
}
bool map_adapter::getBool(QfStringRef key, bool fallback) const {
    return get<Boolean>(*this, key, fallback);
}
int map_adapter::getInt(QfStringRef key, int fallback) const {
    return get<Number>(*this, key, fallback);
}
double map_adapter::getDouble(QfStringRef key, double fallback) const {
    return get<Number>(*this, key, fallback);
}

bool map_adapter::getBoolLoosely(QfStringRef key, bool fallback) const {
    return getLoosely(*this, key, fallback);
}
int map_adapter::getIntLoosely(QfStringRef key) const {
    return getLoosely(*this, key, 0);
}
double map_adapter::getDoubleLoosely(QfStringRef key) const {
    return getLoosely(*this, key, 0.0);
}

}  // namespace plr::qf
