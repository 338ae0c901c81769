// A tagged value: empty, integer, real, date or text, for properties and
// document values that may take several types.
#pragma once

#include <cstdint>
#include <string>
#include <variant>

#include "util/date_time.h"

namespace varnel::detail {

using Variant = std::variant<std::monostate, std::int32_t, double, DateTime, std::string>;

}  // namespace varnel::detail
