// The texts of the return codes, as written into status documents.
#pragma once

#include <string>

namespace varnel::detail {

// The text of a return code; "Unknown status" for any code without one.
// Takes any integer so transport codes and wider values are never truncated first.
std::string ErrorDescription(long long code);

}  // namespace varnel::detail
