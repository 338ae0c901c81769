#include "readings/results.h"

#include "errors/err_propagator.h"

namespace varnel::detail {

ResultPtr ResultCollection::Add(ResultPtr result) {
    if (!result) raise(errc::missing_object, "Object variable not set");
    items_.push_back(std::move(result));
    return items_.back();
}

const ResultPtr& ResultCollection::Item(std::int32_t index) const {
    static const ResultPtr none;
    if (index < 1 || index > Count()) return none;
    return items_[static_cast<std::size_t>(index - 1)];
}

}  // namespace varnel::detail
