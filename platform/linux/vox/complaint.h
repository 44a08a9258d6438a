#pragma once

#include <string>

// Lines through the report hook about peers, at most ten a second: peers must
// not be able to flood a log. What was left out is told by number.
namespace vox_link {

// Reports "vox: " and `line`. Any thread.
void complain(const std::string& line);

}  // namespace vox_link
