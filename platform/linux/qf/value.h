#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <string_view>

#include "qf/qf.h"

// How Qf values lie in memory: a counted header, then the type's own content.
namespace qf {

enum type : QfTypeID { kString = 1, kNumber = 2 };

struct header {
    explicit header(QfTypeID kind) noexcept : type(kind) {}
    const QfTypeID type;
    mutable std::atomic<long> references{1};
};

}  // namespace qf

struct qf_string : qf::header {
    explicit qf_string(std::string_view content) : header(qf::kString), text(content) {}
    const std::string text;
};

struct qf_number : qf::header {
    explicit qf_number(std::int64_t content) noexcept : header(qf::kNumber), value(content) {}
    const std::int64_t value;
};
