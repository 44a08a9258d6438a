#include "plr/text/text_converter.h"

#include <memory>
#include <utility>

#include "plr/text/octet_source_buffer.h"
#include "src/text/stage_factory.h"

namespace plr {
namespace {

// Numbers that count as signed 32-bit ones, whatever their bits above.
int asCount(unsigned long number) {
    return static_cast<int>(static_cast<std::uint32_t>(number));
}

}  // namespace

TextConverter::TextConverter() : top(new OctetSourceBuffer), sourceBuffer(top->asOctetSource()) {}

TextConverter::~TextConverter() {
    while (top != nullptr)
        delete std::exchange(top, top->getSource());
}

void TextConverter::setSource(const char* data, unsigned long length) {
    sourceBuffer->setSource(data, asCount(length));
    for (TextTransform* stage = top; stage != nullptr; stage = stage->getSource())
        stage->reset();
}

void TextConverter::pushConversion(Conversion conversion, int p, unsigned long limit, int q) {
    if (auto stage = makeStage(conversion, p, q)) {
        stage->setSource(top);
        top = stage.release();
    }
    top->setCount(asCount(limit));
}

void TextConverter::popConversion() noexcept {
    if (top != sourceBuffer)
        delete std::exchange(top, top->getSource());
}

std::uint32_t TextConverter::nextCode() {
    return top->nextCode();
}

bool TextConverter::exceptionOccurred() const noexcept {
    return top->getExceptionStatus();
}

std::uint64_t TextConverter::getSourceCount() const noexcept {
    return sourceBuffer->getCount();
}

std::uint64_t TextConverter::getSourceAvailableCount() const noexcept {
    return sourceBuffer->getAvailable();
}

std::string TextConverter::getBytesToCurrentOffset(unsigned long n) const {
    const std::uint64_t offset = getSourceCount();
    return n > offset ? std::string() : std::string(sourceBuffer->getData() + offset - n, n);
}

std::string TextConverter::getBytesFromCurrentOffset(unsigned long n) const {
    if (n >= getSourceAvailableCount())
        return {};
    return {sourceBuffer->getData() + getSourceCount(), n};
}

const char* asString(TextConverter::MessageEncoding encoding) noexcept {
    using enum TextConverter::MessageEncoding;
    switch (encoding) {
        case kGSM7:
            return "kGSM7";
        case k8BitData:
            return "k8BitData";
        case kUCS2:
            return "kUCS2";
        case kKSC5601:
            return "kKSC5601";
    }
    return "Unknown";
}

const char* asString(TextConverter::NationalLanguageId language) noexcept {
    using enum TextConverter::NationalLanguageId;
    switch (language) {
        case kNone:
            return "None";
        case kTurkish:
            return "Turkish";
        case kSpanish:
            return "Spanish";
        case kPortuguese:
            return "Portuguese";
    }
    return "Unknown";
}

}  // namespace plr
