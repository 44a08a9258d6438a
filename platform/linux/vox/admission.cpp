#include "platform/linux/vox/admission.h"

#include <algorithm>

namespace vox_link {
namespace {

// What the kernel's answer begins as; nobody's number.
constexpr uid_t kUnknown = static_cast<uid_t>(-1);

bool contains(std::span<const unsigned> numbers, unsigned wanted) noexcept {
    return wanted != kUnknown && std::find(numbers.begin(), numbers.end(), wanted) != numbers.end();
}

template <class Number>
std::vector<Number> copy(const Number* numbers, std::size_t count) {
    return numbers ? std::vector<Number>(numbers, numbers + count) : std::vector<Number>();
}

}  // namespace

admission::admission(const vox_policy_t& policy)
    : users_(copy(policy.users, policy.user_count)),
      groups_(copy(policy.groups, policy.group_count)),
      everybody_(policy.everybody != 0) {}

admission admission::of_everybody() {
    admission open;
    open.everybody_ = true;
    return open;
}

bool admission::admits(uid_t self, uid_t user, gid_t group,
                       std::span<const gid_t> groups) const noexcept {
    return everybody_ || user == 0 || (user == self && user != kUnknown) ||
           contains(users_, user) || names(group) ||
           std::any_of(groups.begin(), groups.end(), [this](gid_t each) { return names(each); });
}

bool admission::names(gid_t group) const noexcept {
    return contains(groups_, group);
}

bool admission::lets_others_in() const noexcept {
    return everybody_ || !users_.empty() || !groups_.empty();
}

}  // namespace vox_link
