/**
 * @file unique_checker.h
 * A set of texts that tells whether a text was seen before, without regard to case.
 */
#pragma once

#include <cstddef>
#include <string>
#include <unordered_set>
#include <vector>

#include "export.h"

namespace varnel {

/// Texts kept in the order they were added; A-Z and a-z compare equal, other bytes exactly.
class VARNEL_API UniqueChecker {
public:
    /// Adds `value` unless an equal text is present; true when it was added.
    bool AddValue(const std::string& value);
    /// Removes every text.
    void Clear();

    /// The number of texts kept.
    std::size_t Count() const { return values_.size(); }
    /// The texts added, first added first.
    const std::vector<std::string>& Values() const { return values_; }

private:
    std::vector<std::string> values_;
    std::unordered_set<std::string> folded_;
};

}  // namespace varnel
