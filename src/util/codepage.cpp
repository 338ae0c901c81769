#include "util/codepage.h"

#include <algorithm>
#include <array>
#include <iterator>

namespace varnel::detail {

namespace {

constexpr char32_t kReplacement = 0xFFFD;

// Characters of bytes 0x80-0x9F; the code page's five undefined bytes keep their own number.
constexpr std::array<char32_t, 32> kHighControls = {0x20AC, 0x0081, 0x201A, 0x0192, 0x201E, 0x2026, 0x2020, 0x2021,
                                                    0x02C6, 0x2030, 0x0160, 0x2039, 0x0152, 0x008D, 0x017D, 0x008F,
                                                    0x0090, 0x2018, 0x2019, 0x201C, 0x201D, 0x2022, 0x2013, 0x2014,
                                                    0x02DC, 0x2122, 0x0161, 0x203A, 0x0153, 0x009D, 0x017E, 0x0178};

// The C0 controls a document can carry.
bool allowedControl(char32_t c) { return c == '\t' || c == '\n' || c == '\r'; }

void appendUtf8(std::string& out, char32_t c) {
    if (c < 0x80) {
        out += static_cast<char>(c);
    } else if (c < 0x800) {
        out += static_cast<char>(0xC0 | (c >> 6));
        out += static_cast<char>(0x80 | (c & 0x3F));
    } else {  // every character decoded here lies in the basic plane
        out += static_cast<char>(0xE0 | (c >> 12));
        out += static_cast<char>(0x80 | ((c >> 6) & 0x3F));
        out += static_cast<char>(0x80 | (c & 0x3F));
    }
}

// The next character of UTF-8 text at i, moving i past it; nothing for an
// overlong, surrogate, out-of-range or cut-short sequence.
std::optional<char32_t> nextUtf8(std::string_view s, std::size_t& i) {
    const auto lead = static_cast<unsigned char>(s[i++]);
    if (lead < 0x80) return lead;
    int more = 0;
    char32_t c = 0, least = 0;
    if (lead >= 0xC2 && lead <= 0xDF)
        more = 1, c = lead & 0x1F, least = 0x80;
    else if (lead >= 0xE0 && lead <= 0xEF)
        more = 2, c = lead & 0x0F, least = 0x800;
    else if (lead >= 0xF0 && lead <= 0xF4)
        more = 3, c = lead & 0x07, least = 0x10000;
    else
        return std::nullopt;
    for (; more > 0; --more, ++i) {
        if (i >= s.size() || (static_cast<unsigned char>(s[i]) & 0xC0) != 0x80) return std::nullopt;
        c = (c << 6) | (static_cast<unsigned char>(s[i]) & 0x3F);
    }
    if (c < least || c > 0x10FFFF || (c >= 0xD800 && c <= 0xDFFF)) return std::nullopt;
    return c;
}

std::optional<char> meterByte(char32_t c) {
    if (c < 0x20) return allowedControl(c) ? std::optional<char>(static_cast<char>(c)) : std::nullopt;
    if (c < 0x80 || (c >= 0xA0 && c <= 0xFF)) return static_cast<char>(c);
    const auto at = std::find(kHighControls.begin(), kHighControls.end(), c);
    if (at == kHighControls.end()) return std::nullopt;
    return static_cast<char>(0x80 + (at - kHighControls.begin()));
}

}  // namespace

std::string DecodeMeterText(std::span<const std::uint8_t> bytes) {
    std::string out;
    out.reserve(bytes.size());
    for (std::uint8_t b : bytes) {
        if (b < 0x20 && !allowedControl(b))
            appendUtf8(out, kReplacement);
        else if (b >= 0x80 && b <= 0x9F)
            appendUtf8(out, kHighControls[b - 0x80]);
        else
            appendUtf8(out, b);
    }
    return out;
}

std::optional<std::string> EncodeMeterText(std::string_view utf8) {
    std::string out;
    for (std::size_t i = 0; i < utf8.size();) {
        const std::optional<char32_t> c = nextUtf8(utf8, i);
        if (!c) return std::nullopt;
        const std::optional<char> b = meterByte(*c);
        if (!b) return std::nullopt;
        out += *b;
    }
    return out;
}

}  // namespace varnel::detail
