#include "varnel/unique_checker.h"

#include "util/helpers.h"

namespace varnel {

bool UniqueChecker::AddValue(const std::string& value) {
    auto [at, added] = folded_.insert(detail::LowerCase(value));
    if (!added) return false;
    try {
        values_.push_back(value);
    } catch (...) {
        // Keep the two in step so a failed add leaves no trace.
        folded_.erase(at);
        throw;
    }
    return true;
}

void UniqueChecker::Clear() {
    values_.clear();
    folded_.clear();
}

}  // namespace varnel
