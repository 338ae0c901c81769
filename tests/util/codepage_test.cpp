#include <gtest/gtest.h>

#include <cstdint>
#include <string>

#include "util/codepage.h"

using namespace varnel::detail;

namespace {

std::string decoded(std::uint8_t b) { return DecodeMeterText(std::span<const std::uint8_t>(&b, 1)); }

}  // namespace

TEST(MeterText, EveryByteDecodesToACharacterADocumentCanCarry) {
    for (int b = 1; b < 256; ++b) {
        const bool control = b < 0x20 && b != '\t' && b != '\n' && b != '\r';
        SCOPED_TRACE(b);
        if (control) {
            EXPECT_EQ(decoded(std::uint8_t(b)), "\xEF\xBF\xBD");  // U+FFFD
            continue;
        }
        // Everything else comes back as the very byte, the code page's five gaps included.
        EXPECT_EQ(EncodeMeterText(decoded(std::uint8_t(b))), std::string(1, char(b)));
    }
    for (auto [byte, text] :
         {std::pair{0x80, "\xE2\x82\xAC"}, {0x81, "\xC2\x81"}, {0x9F, "\xC5\xB8"}, {0xFF, "\xC3\xBF"}})
        EXPECT_EQ(decoded(std::uint8_t(byte)), text) << byte;
}

TEST(MeterText, TextThatIsNotUtf8OrNotInTheCodePageIsRefused) {
    // Cut short, a lone continuation byte, overlong, a surrogate, beyond U+10FFFF, an emoji, U+0080 (0x80 is
    // the euro sign), what an unreadable byte became, a control character.
    for (const char* text : {"\xC3", "\x80", "\xC0\xAF", "\xED\xA0\x80", "\xF4\x90\x80\x80", "\xF0\x9F\x92\x89",
                             "\xC2\x80", "\xEF\xBF\xBD", "\x01"})
        EXPECT_EQ(EncodeMeterText(text), std::nullopt) << text;
    EXPECT_EQ(EncodeMeterText(std::string("a\0b", 3)), std::nullopt);
    EXPECT_EQ(EncodeMeterText("\xE2\x82\xAC 5\t\xC5\x93"), "\x80 5\t\x9C");
    EXPECT_EQ(EncodeMeterText(""), "");
}
