#include "src/text/stage_factory.h"

#include "src/text/euc_kr.h"
#include "src/text/gsm7_stages.h"
#include "src/text/hex_transforms.h"
#include "src/text/octet_transforms.h"
#include "src/text/plain_transforms.h"
#include "src/text/septet_stages.h"
#include "src/text/ucs2_to_utf8_transform.h"
#include "src/text/utf8_to_ucs2_transform.h"

namespace plr {

std::unique_ptr<TextTransform> makeStage(TextConverter::Conversion conversion, int p, int q) {
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
        case kSmsUnpack:
            return std::make_unique<SmsUnpacker>(p);
        case kSmsPack:
            return std::make_unique<SmsPacker>(p);
        case kUssdPack:
            return std::make_unique<UssdPacker>(p);
        case kUcs2ToGsm7:
            return std::make_unique<Ucs2ToGsm7Transform>(p);
        case kGsm7ToUcs2:
            return std::make_unique<Gsm7ToUcs2Transform>(p, q);
        case kOctetToUcs2:
            return std::make_unique<OctetToUcs2Transform>();
        case kUcs2ToOctet:
            return std::make_unique<Ucs2ToOctetTransform>();
        case kUcs2ToAdn8:
            return std::make_unique<Ucs2ToAdn8Transform>(p);
        case kAdn8ToUcs2:
            return std::make_unique<Adn8ToUcs2Transform>(p);
        case kOctetToGsm7:
            return std::make_unique<OctetToGsm7Transform>();
        case kEucKRToUcs2:
            return std::make_unique<EucKRToUcs2Transform>();
        case kC2KSmsPackedToUnpacked:
            return std::make_unique<C2KSmsPackedToUnpackedTransform>(p);
        case kC2KSmsUnpackedToPacked:
            return std::make_unique<C2KSmsUnpackedToPackedTransform>();
        case kUcs2ToAscii7:
            return std::make_unique<Ucs2ToAscii7Transform>();
        case kAscii7ToUcs2:
            return std::make_unique<Ascii7ToUcs2Transform>();
        case kISOLatin1ToUcs2:
            return std::make_unique<ISOLatin1ToUcs2Transform>();
    }
    return nullptr;
}

}  // namespace plr
