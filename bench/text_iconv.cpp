// iconv of glibc, with one descriptor for all messages.

#include <iconv.h>

#include "bench/text_cases.h"

namespace {

using namespace bench::text_cases;

// UCS-2 is quicker than UTF-16 here, but has no characters outside the basic plane.
const char* utf16For(std::string_view text) {
    return text == "emoji" ? "UTF-16BE" : "UCS-2BE";
}

Convert conversion(const char* to, const char* from) {
    return [descriptor = ::iconv_open(to, from),
            buffer = std::vector<char>(4 << 20)](std::string_view text) mutable {
        char* in = const_cast<char*>(text.data());  // which iconv does not change
        char* out = buffer.data();
        std::size_t inLeft = text.size();
        std::size_t outLeft = buffer.size();
        expect(::iconv(descriptor, &in, &inLeft, &out, &outLeft) == 0);
        return std::string_view(buffer.data(), buffer.size() - outLeft);
    };
}

}  // namespace

int main(int argc, char** argv) {
    return run(argc, argv,
               {{"to_ucs2", [](auto text) { return conversion(utf16For(text), "UTF-8"); }},
                {"from_ucs2", [](auto text) { return conversion("UTF-8", utf16For(text)); }},
                {"from_euc_kr", [](auto text) { return conversion(utf16For(text), "EUC-KR"); }}});
}
