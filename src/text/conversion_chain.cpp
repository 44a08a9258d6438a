#include "src/text/conversion_chain.h"

namespace plr {

Converted convert(std::string_view source, std::initializer_list<Conversion> stages) {
    TextConverter converter;
    converter.setSource(source.data(), source.size());
    for (const Conversion& stage : stages)
        converter.pushConversion(stage.stage, stage.p, stage.limit, stage.q);
    Converted result;
    result.octets = converter.readChars(TextConverter::kNoLimit);
    result.hasReplacements = converter.exceptionOccurred();
    return result;
}

}  // namespace plr
