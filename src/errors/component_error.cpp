#include "varnel/component_error.h"

#include <utility>

namespace varnel {

ComponentError::ComponentError(std::int32_t number, std::string description, std::int32_t line)
    : number_(number), description_(std::move(description)), line_(line) {}

}  // namespace varnel
