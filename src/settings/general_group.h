// Group 1: the meter's general options (MeterOptions_Enum 0-18) as SetupOptions.
#pragma once

#include <cstdint>
#include <memory>
#include <vector>

#include "settings/setup_group.h"
#include "settings/setup_option.h"

namespace varnel::detail {

class Group_General : public ISetupGroup {
public:
    // Replaces the options with those the meter offers; a failed read keeps the old ones.
    std::int16_t readFromMeter() override;
    // Writes every modified writable option; options with setting type 1 are
    // passed as the meter marked them, absent ones are left alone.
    std::int16_t saveToMeter() override;
    const char* className() const override { return "Group_General"; }

    std::int32_t Count() const { return static_cast<std::int32_t>(options_.size()); }
    // The option at a 1-based position, or nullptr.
    std::shared_ptr<SetupOption> OptionByIndex(std::int32_t position) const;
    // The option with that option code, or nullptr.
    std::shared_ptr<SetupOption> OptionByKey(std::int32_t key) const;

    // Options in the order the meter listed them.
    std::vector<std::shared_ptr<SetupOption>>::const_iterator begin() const { return options_.begin(); }
    std::vector<std::shared_ptr<SetupOption>>::const_iterator end() const { return options_.end(); }

private:
    bool add(std::int32_t key, std::int16_t value, std::int32_t settingType, std::int32_t minValue,
             std::int32_t maxValue, std::int32_t dataType, bool isRecent);

    std::vector<std::shared_ptr<SetupOption>> options_;
};

}  // namespace varnel::detail
