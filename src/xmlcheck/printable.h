// Text that came from outside (a capture, a profile, a meter) made fit for a
// terminal or a log: control characters (C0, DEL, C1) and bytes that are not
// UTF-8 are written as \xNN, so such a text can neither move the cursor nor
// retitle the window. Shared by the command and the capture libraries.
#pragma once

#include <string>
#include <string_view>

namespace varnel::detail {

// The text with control characters and bytes that are not UTF-8 written as \xNN.
std::string printableText(std::string_view s);

}  // namespace varnel::detail
