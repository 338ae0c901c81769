// The meters' text: one byte per character in their single-byte code page
// (Windows-1252), held by the component and its documents as UTF-8.
//
// Decoding never fails and always gives well-formed UTF-8 that XML 1.0 can
// carry: a control byte other than tab, line feed and carriage return becomes
// U+FFFD, and the five bytes the code page leaves undefined (0x81, 0x8D, 0x8F,
// 0x90, 0x9D) become the characters of the same number (U+0081 ...), so that
// encoding gives them back unchanged.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

namespace varnel::detail {

// The UTF-8 text of meter bytes, every byte one character.
std::string DecodeMeterText(std::span<const std::uint8_t> bytes);

// The meter's bytes for a UTF-8 text, one per character; nothing when the text
// is not well-formed UTF-8 or holds a character the meter cannot (one outside
// the code page, U+FFFD, a control character other than tab, line feed and
// carriage return).
std::optional<std::string> EncodeMeterText(std::string_view utf8);

}  // namespace varnel::detail
