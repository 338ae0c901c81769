// A count of the sibling steps the XML document component takes for indexed
// child access, so tests can check that reading children in order is linear.
#pragma once

#include <cstdint>

namespace varnel::detail {

// Steps this thread took since it started; tests compare differences.
std::uint64_t& xmlIndexSteps();

}  // namespace varnel::detail
