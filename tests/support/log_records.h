#pragma once

#include <string>
#include <utility>
#include <vector>

#include "plr/log/log_message.h"

namespace plr::test {

inline LogMessage logMessage(std::string text, LogLevel level = LogLevel::Info,
                             std::vector<std::string> metaData = {}, TimeStamp time = 0) {
    return {time, level, "d", std::move(text), std::move(metaData)};
}

// The texts of a text writer's records: what stands behind the domain's ": ".
// Lines that start with spaces belong to the record before.
inline std::vector<std::string> textsOfRecords(const std::string& records) {
    std::vector<std::string> texts;
    for (std::size_t at = 0; at < records.size();) {
        const std::size_t end = records.find('\n', at);
        std::string line = records.substr(at, end - at);
        at = end == std::string::npos ? records.size() : end + 1;
        if (line.starts_with("    ") && !texts.empty())
            texts.back() += "\n" + line;
        else
            texts.push_back(line.substr(line.find(": ") + 2));
        if (end == std::string::npos)
            texts.back() += "(no line feed)";
    }
    return texts;
}

}  // namespace plr::test
