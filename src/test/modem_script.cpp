#include "plr/test/modem_script.h"

#include <strings.h>

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <stdexcept>
#include <system_error>
#include <utility>

namespace plr::test {
namespace {

constexpr std::string_view kBlanks = " \t\r";

bool startsWith(std::string_view text, const std::string& start) {
    return text.size() >= start.size() &&
           ::strncasecmp(text.data(), start.data(), start.size()) == 0;
}

bool isSame(std::string_view text, const std::string& other) {
    return text.size() == other.size() && startsWith(text, other);
}

std::string_view trimmed(std::string_view text) {
    const auto first = text.find_first_not_of(kBlanks);
    if (first == std::string_view::npos)
        return {};
    return text.substr(first, text.find_last_not_of(kBlanks) - first + 1);
}

[[noreturn]] void refuse(std::size_t line, const std::string& why) {
    throw std::invalid_argument("modem script, line " + std::to_string(line) + ": " + why);
}

}  // namespace

ModemScript ModemScript::fromText(std::string_view text) {
    if (text.size() > kMostBytes)
        throw std::invalid_argument("modem script: too long");
    ModemScript script;
    for (std::size_t number = 1; !text.empty(); ++number) {
        const std::string_view line = text.substr(0, text.find('\n'));
        text.remove_prefix(std::min(line.size() + 1, text.size()));
        const std::string_view content = trimmed(line);
        if (content.empty() || line.starts_with('#'))
            continue;
        if (kBlanks.find(line.front()) == std::string_view::npos) {
            const bool isStart = content.ends_with('*');
            const auto command = content.substr(0, content.size() - (isStart ? 1 : 0));
            script.add({std::string(command), isStart, {}}, number);
        } else if (script.rules_.empty()) {
            refuse(number, "an answer without its command");
        } else {
            script.rules_.back().answer.emplace_back(content);
        }
    }
    return script;
}

ModemScript ModemScript::fromFile(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    std::string text(kMostBytes + 1, '\0');  // one more than is allowed, so that it shows
    file.read(text.data(), static_cast<std::streamsize>(text.size()));
    if (!file.is_open() || file.bad())
        throw std::system_error(errno, std::generic_category(), path);
    text.resize(static_cast<std::size_t>(file.gcount()));
    return fromText(text);
}

void ModemScript::add(Rule&& rule, std::size_t line) {
    const bool known = std::ranges::any_of(rules_, [&rule](const Rule& other) {
        return isSame(other.command, rule.command) && other.isStart == rule.isStart;
    });
    if (known)
        refuse(line, rule.command + " stands there twice");
    rules_.push_back(std::move(rule));
}

const ModemScript::Answer* ModemScript::find(std::string_view command) const {
    const Rule* best = nullptr;
    for (const Rule& rule : rules_) {
        if (!rule.isStart && isSame(command, rule.command))
            return &rule.answer;
        const bool longer = !best || rule.command.size() > best->command.size();
        if (rule.isStart && longer && startsWith(command, rule.command))
            best = &rule;
    }
    return best ? &best->answer : nullptr;
}

}  // namespace plr::test
