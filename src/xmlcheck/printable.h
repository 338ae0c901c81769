// Text that came from outside (a capture, a profile, a meter) made fit for a
// terminal or a log: control characters (C0, DEL, C1) and bytes that are not
// UTF-8 are written as \xNN, so such a text can neither move the cursor nor
// retitle the window. Header-only, shared by the command and the capture libraries.
#pragma once

#include <string>
#include <string_view>

#include "xml_check.h"

namespace varnel::detail {

inline std::string printableText(std::string_view s) {
    static constexpr char kHex[] = "0123456789abcdef";
    std::string out;
    out.reserve(s.size());
    auto escape = [&](std::size_t from, std::size_t to) {
        for (std::size_t k = from; k < to; ++k) {
            const auto b = static_cast<unsigned char>(s[k]);
            out += {'\\', 'x', kHex[b >> 4], kHex[b & 15]};
        }
    };
    for (std::size_t i = 0; i < s.size();) {
        const std::size_t at = i;
        const long c = decodeUtf8(s, i);
        if (c < 0)
            escape(at, i = at + 1);
        else if (c < 0x20 || (c >= 0x7f && c < 0xa0))
            escape(at, i);
        else
            out.append(s.substr(at, i - at));
    }
    return out;
}

}  // namespace varnel::detail
