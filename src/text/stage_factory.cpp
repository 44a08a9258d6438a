#include "src/text/stage_factory.h"

#include "plr/base/assert.h"
#include "src/text/hex_transforms.h"
#include "src/text/octet_transforms.h"
#include "src/text/plain_transforms.h"
#include "src/text/ucs2_to_utf8_transform.h"
#include "src/text/utf8_to_ucs2_transform.h"

namespace plr {

std::unique_ptr<TextTransform> makeStage(TextConverter::Conversion conversion,
                                         [[maybe_unused]] int p, [[maybe_unused]] int q) {
    using enum TextConverter::Conversion;
    // Without a default: the compiler tells of a conversion without a stage.
    switch (conversion) {
        case kBinaryToHex:
            return std::make_unique<BinaryToHexTransform>();
        case kHexToBinary:
            return std::make_unique<HexToBinaryTransform>();
        case kUtf8ToUcs2:
            return std::make_unique<Utf8ToUcs2Transform>();
        case kUcs2ToUtf8:
            return std::make_unique<Ucs2ToUtf8Transform>();
        case kOctetToUcs2:
            return std::make_unique<OctetToUcs2Transform>();
        case kUcs2ToOctet:
            return std::make_unique<Ucs2ToOctetTransform>();
        case kUcs2ToAscii7:
            return std::make_unique<Ucs2ToAscii7Transform>();
        case kAscii7ToUcs2:
            return std::make_unique<Ascii7ToUcs2Transform>();
        case kISOLatin1ToUcs2:
            return std::make_unique<ISOLatin1ToUcs2Transform>();
        // Each goes from here to above with its stage.
        case kSmsUnpack:
        case kSmsPack:
        case kUssdPack:
        case kUcs2ToGsm7:
        case kGsm7ToUcs2:
        case kUcs2ToAdn8:
        case kAdn8ToUcs2:
        case kOctetToGsm7:
        case kEucKRToUcs2:
        case kC2KSmsPackedToUnpacked:
        case kC2KSmsUnpackedToPacked:
            PLR_ASSERT(false, "This conversion has no stage yet");
    }
    return nullptr;
}

}  // namespace plr
