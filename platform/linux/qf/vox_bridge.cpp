#include "qf/vox_bridge.h"

#include <string_view>

#include "platform/linux/qf/value.h"
#include "qf/collection.h"
#include "qf/data.h"
#include "qf/date.h"
#include "qf/error.h"
#include "qf/scalar.h"
#include "qf/string.h"

// Values are walked by recursion of a bounded depth. One that goes deeper raises a
// flag, which ends the walk, and what was made so far goes.
namespace {

constexpr unsigned kMostDepth = 64;  // nested collections, as in messages
constexpr const char* kErrorDomain = "vox";

struct BoundedWalk {
    // Whether a collection may be entered from `depth`.
    bool enter(unsigned depth) {
        isTooDeep_ |= depth == kMostDepth;
        return !isTooDeep_;
    }
    bool isTooDeep_ = false;
};

QfStringRef qf_from(vox_object_t string) {
    return qf_string_create_with_length(vox_string_get_string_ptr(string),
                                        vox_string_get_length(string));
}

QfStringRef qf_from_uuid(const uint8_t* b) {
    return qf_string_create_with_format(
        "%02x%02x%02x%02x-%02x%02x-%02x%02x-%02x%02x-%02x%02x%02x%02x%02x%02x", b[0], b[1], b[2],
        b[3], b[4], b[5], b[6], b[7], b[8], b[9], b[10], b[11], b[12], b[13], b[14], b[15]);
}

QfErrorRef qf_from_error(vox_object_t error) {
    const QfStringRef domain = qf_string_create(kErrorDomain);
    const vox_object_t text = vox_error_get_value(error, vox_error_key_description);
    const QfStringRef description = text ? qf_from(text) : nullptr;
    const QfErrorRef made = qf_error_create(domain, vox_error_get_code(error), description);
    qf_release(domain);
    if (description)
        qf_release(description);
    return made;
}

class QfMaker : BoundedWalk {
  public:
    QfTypeRef make(vox_object_t object) {
        const QfTypeRef made = value(object, 0);
        if (!isTooDeep_)
            return made;
        if (made)
            qf_release(made);
        return nullptr;
    }

  private:
    QfTypeRef value(vox_object_t object, unsigned depth) {
        switch (vox_get_type(object)) {
            case VOX_TYPE_NULL:
                return kQfNull;
            case VOX_TYPE_BOOL:
                return vox_bool_get_value(object) ? kQfBooleanTrue : kQfBooleanFalse;
            case VOX_TYPE_INT64:
                return qf_number_create_int64(vox_int64_get_value(object));
            case VOX_TYPE_UINT64:
                return qf_number_create_uint64(vox_uint64_get_value(object));
            case VOX_TYPE_DOUBLE:
                return qf_number_create_double(vox_double_get_value(object));
            case VOX_TYPE_DATE:
                return qf_date_create(vox_date_get_value(object));
            case VOX_TYPE_DATA:
                return qf_data_create(vox_data_get_bytes_ptr(object), vox_data_get_length(object));
            case VOX_TYPE_STRING:
                return qf_from(object);
            case VOX_TYPE_UUID:
                return qf_from_uuid(vox_uuid_get_bytes(object));
            case VOX_TYPE_ARRAY:
                return enter(depth) ? array(object, depth + 1) : nullptr;
            case VOX_TYPE_DICTIONARY:
                return enter(depth) ? dictionary(object, depth + 1) : nullptr;
            case VOX_TYPE_ERROR:
                return qf_from_error(object);
            case VOX_TYPE_CONNECTION:
            case VOX_TYPE_ENDPOINT:
            case VOX_TYPE_FD:
                break;
        }
        return nullptr;
    }

    QfTypeRef array(vox_object_t object, unsigned depth) {
        const QfMutableArrayRef made = qf_array_create_mutable();
        const size_t count = vox_array_get_count(object);
        for (size_t i = 0; i < count && !isTooDeep_; i++) {
            const QfTypeRef item = value(vox_array_get_value(object, i), depth);
            qf_array_append_value(made, item ? item : kQfNull);
            if (item)
                qf_release(item);
        }
        return made;
    }

    QfTypeRef dictionary(vox_object_t object, unsigned depth) {
        const QfMutableDictionaryRef made = qf_dictionary_create_mutable();
        const char* key = nullptr;
        for (size_t i = 0; !isTooDeep_; i++) {
            const vox_object_t entry = vox_dictionary_get_entry(object, i, &key);
            if (!entry)
                break;
            if (const QfTypeRef item = value(entry, depth))
                put(made, key, item);
        }
        return made;
    }

    static void put(QfMutableDictionaryRef dictionary, const char* key, QfTypeRef owned) {
        const QfStringRef name = qf_string_create(key);
        qf_dictionary_set_value(dictionary, name, owned);
        qf_release(name);
        qf_release(owned);
    }
};

vox_object_t vox_from_number(QfNumberRef number) {
    if (qf_number_is_float(number)) {
        double value = 0;
        static_cast<void>(qf_number_get_value(number, kQfNumberDoubleType, &value));
        return vox_double_create(value);
    }
    switch (qf_number_get_type(number)) {
        case kQfNumberUInt8Type:
        case kQfNumberUInt16Type:
        case kQfNumberUInt32Type:
        case kQfNumberUInt64Type: {
            uint64_t value = 0;
            static_cast<void>(qf_number_get_value(number, kQfNumberUInt64Type, &value));
            return vox_uint64_create(value);
        }
        default: {
            int64_t value = 0;
            static_cast<void>(qf_number_get_value(number, kQfNumberSInt64Type, &value));
            return vox_int64_create(value);
        }
    }
}

vox_object_t vox_from(QfStringRef string) {
    return vox_string_create_with_length(qf_string_get_string_ptr(string),
                                         qf_string_get_length(string));
}

vox_object_t vox_from_data(QfDataRef data) {
    return vox_data_create(qf_data_get_bytes_ptr(data), qf_data_get_length(data));
}

vox_object_t vox_from_error(QfErrorRef error) {
    const QfStringRef text = qf_error_copy_description(error);
    const vox_object_t made =
        vox_error_create(qf_error_get_code(error), qf_string_get_string_ptr(text));
    qf_release(text);
    return made;
}

// `key` can be one of a Vox dictionary, whose keys end at a NUL.
bool isKey(std::string_view key) {
    return key.find('\0') == std::string_view::npos;
}

class VoxMaker : BoundedWalk {
  public:
    vox_object_t make(QfTypeRef object) {
        vox_object_t made = value(object, 0);
        if (!isTooDeep_)
            return made;
        vox_release(made);
        return nullptr;
    }

  private:
    vox_object_t value(QfTypeRef object, unsigned depth) {
        switch (qf::header_of(object)->kind) {
            case qf::type::null:
                return vox_null_create();
            case qf::type::boolean:
                return vox_bool_create(qf_boolean_get_value(static_cast<QfBooleanRef>(object)));
            case qf::type::number:
                return vox_from_number(static_cast<QfNumberRef>(object));
            case qf::type::string:
                return vox_from(static_cast<QfStringRef>(object));
            case qf::type::data:
                return vox_from_data(static_cast<QfDataRef>(object));
            case qf::type::date:
                return vox_date_create(qf_date_get_nanoseconds(static_cast<QfDateRef>(object)));
            case qf::type::url:
                return vox_from(qf_url_get_string(static_cast<QfURLRef>(object)));
            case qf::type::error:
                return vox_from_error(static_cast<QfErrorRef>(object));
            case qf::type::array:
                return enter(depth) ? array(static_cast<QfArrayRef>(object), depth + 1) : nullptr;
            case qf::type::dictionary:
                return enter(depth) ? dictionary(static_cast<QfDictionaryRef>(object), depth + 1)
                                    : nullptr;
            case qf::type::none:
            case qf::type::locale:
            case qf::type::date_formatter:
                break;
        }
        return nullptr;
    }

    vox_object_t array(QfArrayRef object, unsigned depth) {
        vox_object_t made = vox_array_create();
        const size_t count = qf_array_get_count(object);
        for (size_t i = 0; i < count && !isTooDeep_; i++) {
            vox_object_t item = value(qf_array_get_value(object, i), depth);
            vox_array_append_value(made, item);  // null: the null object
            vox_release(item);
        }
        return made;
    }

    vox_object_t dictionary(QfDictionaryRef object, unsigned depth) {
        vox_object_t made = vox_dictionary_create();
        QfStringRef key = nullptr;
        for (size_t i = 0; !isTooDeep_; i++) {
            const QfTypeRef entry = qf_dictionary_get_entry(object, i, &key);
            if (!entry)
                break;
            if (!isKey(key->view()))
                continue;
            if (vox_object_t item = value(entry, depth)) {
                vox_dictionary_set_value(made, qf_string_get_string_ptr(key), item);
                vox_release(item);
            }
        }
        return made;
    }
};

}  // namespace

QfTypeRef qf_create_from_vox(vox_object_t object) {
    return object ? QfMaker().make(object) : nullptr;
}

vox_object_t qf_create_vox(QfTypeRef value) {
    return value ? VoxMaker().make(value) : nullptr;
}
