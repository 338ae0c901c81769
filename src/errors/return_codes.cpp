#include "varnel/return_codes.h"

#include "errors/error_description.h"

namespace varnel {

std::string returnCodeText(long long code) { return detail::ErrorDescription(code); }

}  // namespace varnel
