// The settings groups one meter supports, keyed by group number.
#pragma once

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "settings/setup_group.h"

namespace varnel::detail {

class MeterSettings {
public:
    using Entry = std::pair<std::int32_t, std::shared_ptr<ISetupGroup>>;

    // The group stored under that number, or nullptr.
    std::shared_ptr<ISetupGroup> Item(std::int32_t group) const;
    std::int32_t Count() const { return static_cast<std::int32_t>(groups_.size()); }

    // Appends a group under its number; a number already present is an error.
    // Hands the same group back.
    std::shared_ptr<ISetupGroup> AddGroup(std::int32_t group, std::shared_ptr<ISetupGroup> object);

    // Enumeration in insertion order.
    std::vector<Entry>::const_iterator begin() const { return groups_.begin(); }
    std::vector<Entry>::const_iterator end() const { return groups_.end(); }

private:
    std::vector<Entry> groups_;
};

}  // namespace varnel::detail
