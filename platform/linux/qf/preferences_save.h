#pragma once

#include "platform/linux/qf/preferences_names.h"

namespace qf::preferences {

// Sets `values` and removes `removed` (either may be null) in the file, which
// holds the old content or the new one at any time:
//
//   1. flock() on ".lock" in the file's folder; folders are made when missing
//   2. the file is read, as it is now, and the text edited (preferences_edit.h)
//   3. ".NAME.new" is written, with owner and mode of the file, and fsync()
//   4. rename() over the file, fsync() of the folder
//
// A ".NAME.new" that a killed process left is removed in step 3. A symbolic link
// stays, and the file that it leads to is replaced, or made, in its own folder. Nothing is
// written when the file says everything already. Waits for other writers.
// Null, or an error after which the file is what it was; only after an error of
// the last fsync() it is the new one, which a power failure may undo.
[[nodiscard]] owned_error save(const target_file& target, QfDictionaryRef values,
                               QfArrayRef removed);

}  // namespace qf::preferences
