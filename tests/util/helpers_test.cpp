#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <thread>
#include <tuple>

#include "util/codepage.h"
#include "util/helpers.h"

using namespace varnel::detail;

namespace {

std::string decoded(int b) {
    const auto byte = std::uint8_t(b);
    return DecodeMeterText(std::span<const std::uint8_t>(&byte, 1));
}

}  // namespace

TEST(ToNumber, CDecimalSyntaxWithBlanksAroundAndNothingElse) {
    for (auto [text, value] : {std::pair{"  12 ", 12.0}, {"\t-3", -3.0}, {".5", 0.5}, {"25E-1", 2.5}}) {
        EXPECT_TRUE(IsNumeric(text)) << text;
        EXPECT_EQ(ToNumber(text), value) << text;
    }
    for (const char* text : {"", "12a", "0x10", "nan", ".", "1e", "1 2", "1e400"}) {
        EXPECT_FALSE(IsNumeric(text)) << text;
        EXPECT_EQ(ToNumber(text), 0) << text;
    }
}

// Texts clients put in settings documents: what is a number and what only looks like one.
TEST(DocumentNumber, PlainDecimalsOnly) {
    const std::string tiny = "0." + std::string(400, '0') + "1", tenMegabytes(10'000'000, '9');
    for (auto [text, value] : {std::pair{"-3", -3.0},
                               {"+4.5", 4.5},
                               {".5", 0.5},
                               {"7.", 7.0},
                               {tiny.c_str(), 0.0},
                               {"99999999999999999999", 1e20}})
        EXPECT_EQ(DocumentNumber(text), value) << text;
    EXPECT_EQ(DocumentNumber("1." + std::string(10'000'000, '0')), 1);
    // Among them: accents, Arabic-Indic digits, an embedded zero byte.
    const std::string zero("1\0002", 3);
    for (std::string_view text :
         std::initializer_list<std::string_view>{"", "nan", "inf", "1e5", "0x10", " 12", "-", ".", "1.2.3", "+-1",
                                                 "1,5", "\u0661\u0662", zero, tenMegabytes})
        EXPECT_EQ(DocumentNumber(text), std::nullopt) << text.substr(0, 20);
    // Sixteen bits, halves to even.
    for (auto [text, value] : {std::pair{"-32768", -32768}, {"12.5", 12}, {"13.5", 14}, {"32767.4", 32767}})
        EXPECT_EQ(DocumentInt16(text), std::optional<std::int16_t>(value)) << text;
    for (const char* text : {"32768", "-32769", "32767.5", "1e2"}) EXPECT_EQ(DocumentInt16(text), std::nullopt) << text;
}

// The meter's code page as UTF-8: a read stops at a zero byte or the count, a write two short of the end and
// cut by characters; text the meter cannot hold stores nothing at all.
TEST(ByteTexts, ReadAndWrite) {
    const std::uint8_t cafe[] = {'C', 'a', 'f', 0xE9, 0x80, 0x01, 0, 'X'};
    EXPECT_EQ(BytesToText(cafe, 8), "Caf\xC3\xA9\xE2\x82\xAC\xEF\xBF\xBD");  // é, euro sign, U+FFFD
    EXPECT_EQ(BytesToText(std::span(cafe, 3), 20), "Caf");                   // count beyond the array
    EXPECT_EQ(BytesToText(cafe, -1), "");

    std::uint8_t name[10];
    std::fill(std::begin(name), std::end(name), std::uint8_t(0xEE));
    EXPECT_TRUE(TextToBytes(name, "ABCDEFGHIJKL"));
    EXPECT_EQ(BytesToText(name, 10), "ABCDEFGH");
    EXPECT_EQ(name[9], 0xEE);
    EXPECT_TRUE(TextToBytes(name, "Hi"));
    EXPECT_EQ(std::string(name, name + 4), std::string("Hi\0D", 4));  // later bytes keep their values
    // Nine accented characters (eighteen UTF-8 bytes) keep their first eight.
    EXPECT_TRUE(TextToBytes(name, "\xC3\xA9t\xC3\xA9 cr\xC3\xA8me"));  // "été crème"
    EXPECT_EQ(BytesToText(name, 10), "\xC3\xA9t\xC3\xA9 cr\xC3\xA8m");
    for (const char* text : {"\xF0\x9F\x92\x89", "ab\xE9"}) {
        EXPECT_FALSE(TextToBytes(name, text)) << text;
        EXPECT_EQ(BytesToText(name, 10), "\xC3\xA9t\xC3\xA9 cr\xC3\xA8m");
    }
    TextToBytes(std::span<std::uint8_t>(), "x");  // no room at all: nothing written
}

TEST(IsValidDate, NumericPattern) {
    const char* p = "dd/MM/yyyy";
    for (const char* ok : {"29/02/2000", "1/2/1601", "31/12/9998", ""}) EXPECT_TRUE(IsValidDate(ok, "/", p)) << ok;
    for (const char* bad : {"29/02/1900", "1/13/2004", "01/02/1600", "01/02/9999", "31/04/2004", "0/01/2004",
                            "01-02-2004", "1a/02/2004", "01/02/2004/", "01//2004"})
        EXPECT_FALSE(IsValidDate(bad, "/", p)) << bad;
}

TEST(ContinueFlag, IsPerThreadAndStartsTrue) {
    SetContinueFlag(false);
    bool other = false;
    std::thread([&] { other = GetContinueFlag(); }).join();
    EXPECT_TRUE(other);
    EXPECT_FALSE(GetContinueFlag());
    SetContinueFlag(true);
}

// Serials, keys, port kinds and month names fold ASCII only: bytes of other characters must never
// match across case, whatever locale the client process runs under.
TEST(CaseFold, AsciiLettersOnly) {
    EXPECT_EQ(LowerCase("AbZ@[`{09 \xC3\x89"), "abz@[`{09 \xC3\x89");
    for (auto [a, b, equal] : {std::tuple{"SN123ab", "sn123AB", true},
                               {"abc", "abcd", false},
                               {"@", "`", false},
                               {"\xC3\xA9", "\xC3\x89", false},
                               {"I", "\xC4\xB1", false}})
        EXPECT_EQ(EqualsNoCase(a, b), equal) << a << " / " << b;
}

TEST(MeterText, EveryByteDecodesToACharacterADocumentCanCarry) {
    for (int b = 1; b < 256; ++b) {
        // Control characters become U+FFFD; everything else comes back as the very byte, the code page's five gaps
        // included.
        if (b < 0x20 && b != '\t' && b != '\n' && b != '\r')
            EXPECT_EQ(decoded(b), "\xEF\xBF\xBD") << b;
        else
            EXPECT_EQ(EncodeMeterText(decoded(b)), std::string(1, char(b))) << b;
    }
    for (auto [byte, text] :
         {std::pair{0x80, "\xE2\x82\xAC"}, {0x81, "\xC2\x81"}, {0x9F, "\xC5\xB8"}, {0xFF, "\xC3\xBF"}})
        EXPECT_EQ(decoded(byte), text) << byte;
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
