#include "varnel/unique_checker.h"

#include <algorithm>

namespace varnel {

namespace {

std::string foldCase(const std::string& s) {
    std::string folded(s);
    std::transform(folded.begin(), folded.end(), folded.begin(),
                   [](char c) { return (c >= 'A' && c <= 'Z') ? char(c - 'A' + 'a') : c; });
    return folded;
}

}  // namespace

bool UniqueChecker::AddValue(const std::string& value) {
    auto [at, added] = folded_.insert(foldCase(value));
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
