#include "plr/rest/access_rules.h"

#include <algorithm>
#include <stdexcept>
#include <string_view>
#include <utility>

#include "plr/rest/path_map.h"

namespace plr::rest {

// The rules of one path, and what is below it.
struct AccessRules::Node {
    std::vector<AccessRule> rules;
    PathMap<std::unique_ptr<Node>> below;  // by segment

    [[nodiscard]] bool mentions(Operation operation) const;
    [[nodiscard]] bool allows(Operation operation, const vox::connection& sender) const;
    [[nodiscard]] bool allowsBelow(Operation operation, const vox::connection& sender) const;
};

namespace {

template <class Value>
bool contains(const std::vector<Value>& values, Value value) {
    return std::find(values.begin(), values.end(), value) != values.end();
}

bool names(const AccessRule& rule, Operation operation) {
    return rule.operations.empty() || contains(rule.operations, operation);
}

bool isIn(const std::vector<gid_t>& groups, const vox::connection& sender) {
    if (groups.empty())
        return false;
    if (contains(groups, sender.peer().gid))
        return true;
    const std::vector<gid_t> all = sender.peer_groups();
    return std::any_of(all.begin(), all.end(), [&](gid_t one) { return contains(groups, one); });
}

bool includes(const AccessRule& rule, const vox::connection& sender) {
    if (rule.everybody)
        return true;
    // All its numbers are -1 then, which is nobody's.
    if (sender.peer().pid == -1)
        return false;
    return contains(rule.users, sender.peer().uid) || isIn(rule.groups, sender);
}

// What a segment names: what follows an '@' is a part of a value. Words that mean
// something only when nothing follows ("_@" is a property of the name "_", which no
// rule's path is), and no name at all, are none.
std::string_view nameIn(std::string_view segment) {
    const std::size_t at = segment.find('@');
    if (at == std::string_view::npos)
        return segment;
    const std::string_view name = segment.substr(0, at);
    return name == "_" || name == "*" ? std::string_view() : name;
}

void checkPath(const AccessRule& rule) {
    bool isValid =
        rule.path.find('@') == std::string::npos && rule.path.find("//") == std::string::npos;
    for (PathView path(rule.path); path; path.advance(1))
        isValid = isValid && path.current() != "*";
    if (!isValid)
        throw std::invalid_argument("no message has the path of an access rule: " + rule.path);
}

}  // namespace

AccessRules::AccessRules(const std::vector<AccessRule>& rules) {
    auto root = std::make_shared<Node>();
    for (const AccessRule& rule : rules) {
        checkPath(rule);
        Node* node = root.get();
        for (PathView path(rule.path); path; path.advance(1)) {
            if (!node->below.find(path.current()))
                node->below.insert(path.current(), std::make_unique<Node>());
            node = node->below.find(path.current())->get();
        }
        node->rules.push_back(rule);
    }
    if (!rules.empty())
        root_ = std::move(root);
}

bool AccessRules::allows(Operation operation, const Reached& reached,
                         const vox::connection& sender) const {
    const Node* node = root_.get();
    const Node* deciding = nullptr;
    for (PathView path(reached.path); node; path.advance(1)) {
        if (node->mentions(operation))
            deciding = node;
        if (!path)
            break;
        const std::string_view name = nameIn(path.current());
        const bool isOtherName = name != path.current() && !reached.splitsNames;
        if (isOtherName && deciding && !deciding->allows(operation, sender))
            return false;
        const auto* found = node->below.find(name);
        node = found ? found->get() : nullptr;
    }
    if (deciding && !deciding->allows(operation, sender))
        return false;
    return !reached.everythingBelow || !node || node->allowsBelow(operation, sender);
}

bool AccessRules::Node::mentions(Operation operation) const {
    return std::any_of(rules.begin(), rules.end(),
                       [&](const AccessRule& rule) { return names(rule, operation); });
}

bool AccessRules::Node::allows(Operation operation, const vox::connection& sender) const {
    return std::any_of(rules.begin(), rules.end(), [&](const AccessRule& rule) {
        return names(rule, operation) && includes(rule, sender);
    });
}

bool AccessRules::Node::allowsBelow(Operation operation, const vox::connection& sender) const {
    return std::all_of(below.begin(), below.end(), [&](const auto& entry) {
        const Node& node = *entry.second;
        return (!node.mentions(operation) || node.allows(operation, sender)) &&
               node.allowsBelow(operation, sender);
    });
}

}  // namespace plr::rest
