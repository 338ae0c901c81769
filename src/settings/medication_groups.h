// Groups 2 and 3: the meter's tables of insulin and oral-medication names
// with their favourites. Both tables work alike; MedicationTable holds what
// differs between them.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "settings/setup_group.h"

namespace varnel::detail {

// Sizes, transport calls and trace names of one medication table.
struct MedicationTable {
    const char* className;
    std::int32_t count;           // name positions 1..count
    std::int32_t favouriteCount;  // favourite positions 1..favouriteCount
    std::int32_t firstCustom;     // first position saveToMeter writes back
    const char* nameRoutine;
    const char* favouriteRoutine;
    const char* changeableRoutine;
    std::int16_t (Transport::*getName)(METER_REC&, INSULIN_OR_ORAL_MED_NAME_TYPE&);
    std::int16_t (Transport::*setName)(METER_REC&, INSULIN_OR_ORAL_MED_NAME_TYPE&);
    // Favourites travel in a record of favouriteCount 16-bit entries.
    std::int16_t (*getFavourites)(Transport&, METER_REC&, std::int16_t* out);
    std::int16_t (*setFavourites)(Transport&, METER_REC&, const std::int16_t* in);
};

// A medication table; positions are 1-based. Reads outside the table give an
// empty name, favourite 0 or false; writes outside it are errors.
class MedicationGroup : public ISetupGroup {
public:
    // Also empties the table: no names, zero codes and favourites, no changes.
    // Reads every name, then the favourites; stops early, returning 0, when the
    // continue flag is cleared. The first name or favourite the meter does not
    // give ends the read with its code.
    std::int16_t readFromMeter() override;
    // Writes the changed names at the custom positions, then all favourites.
    std::int16_t saveToMeter() override;
    const char* className() const override { return table_.className; }

    std::int32_t Count() const { return table_.count; }

protected:
    explicit MedicationGroup(const MedicationTable& table);

    std::int32_t favouriteCount() const { return table_.favouriteCount; }
    std::string name(std::int32_t position) const;
    void setName(std::int32_t position, const std::string& name);
    std::int16_t favourite(std::int32_t position) const;
    void setFavourite(std::int32_t position, std::int16_t value);
    bool nameChanged(std::int32_t position) const;
    bool changeable(std::int32_t position);
    // Slots 0..count: position p is slot p-1, the last slot is spare.
    std::vector<std::string> names() const { return names_; }

private:
    void clearValues() override;

    const MedicationTable& table_;
    std::vector<std::string> names_;
    std::vector<std::int16_t> favourites_;
    std::vector<std::int16_t> notChangeable_;
    std::vector<bool> changed_;
};

class Group_Insulins : public MedicationGroup {
public:
    Group_Insulins();

    std::string InsulinName(std::int32_t position) const { return name(position); }
    // Stores the name (at most 8 characters reach the meter) and marks it changed.
    void setInsulinName(std::int32_t position, const std::string& value) { setName(position, value); }
    std::int16_t FavInsulin(std::int32_t position) const { return favourite(position); }
    void setFavInsulin(std::int32_t position, std::int16_t value) { setFavourite(position, value); }
    std::int32_t FavInsulinCount() const { return favouriteCount(); }
    bool InsulinNameChanged(std::int32_t position) const { return nameChanged(position); }
    std::vector<std::string> InsulinsArray() const { return names(); }
    // False only for a name the meter marks as not changeable.
    bool isInsulinChangeable(std::int32_t position) { return changeable(position); }
};

class Group_OralMeds : public MedicationGroup {
public:
    Group_OralMeds();

    std::string OralMedName(std::int32_t position) const { return name(position); }
    // Stores the name (at most 8 characters reach the meter) and marks it changed.
    void setOralMedName(std::int32_t position, const std::string& value) { setName(position, value); }
    std::int16_t FavOralMed(std::int32_t position) const { return favourite(position); }
    void setFavOralMed(std::int32_t position, std::int16_t value) { setFavourite(position, value); }
    std::int32_t FavOralMedsCount() const { return favouriteCount(); }
    bool OralMedNameChanged(std::int32_t position) const { return nameChanged(position); }
    std::vector<std::string> OralMedsArray() const { return names(); }
    // False only for a name the meter marks as not changeable.
    bool isOralMedChangeable(std::int32_t position) { return changeable(position); }
};

}  // namespace varnel::detail
