#include "settings/meter_settings.h"

#include <algorithm>
#include <string>

#include "errors/err_propagator.h"

namespace varnel::detail {

std::shared_ptr<ISetupGroup> MeterSettings::Item(std::int32_t group) const {
    auto it = std::find_if(groups_.begin(), groups_.end(), [&](const Entry& e) { return e.first == group; });
    return it == groups_.end() ? nullptr : it->second;
}

std::shared_ptr<ISetupGroup> MeterSettings::AddGroup(std::int32_t group, std::shared_ptr<ISetupGroup> object) {
    return guarded("MeterSettings", "AddGroup", [&] {
        if (Item(group)) raise(errc::internal, "Settings group " + std::to_string(group) + " is already present");
        if (!object) raise(errc::missing_object, "No settings group to add");
        groups_.emplace_back(group, object);
        return object;
    });
}

}  // namespace varnel::detail
