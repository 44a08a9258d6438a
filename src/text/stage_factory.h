#pragma once

#include <memory>

#include "plr/text/text_converter.h"
#include "plr/text/text_transform.h"

namespace plr {

// The stage of `conversion`, with p and q of pushConversion(), without a source and with a
// count of 0. Null for a value that is no conversion.
[[nodiscard]] std::unique_ptr<TextTransform> makeStage(TextConverter::Conversion conversion, int p,
                                                       int q);

}  // namespace plr
