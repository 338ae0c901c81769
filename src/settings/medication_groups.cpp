#include "settings/medication_groups.h"

#include <algorithm>
#include <iterator>
#include <string>

#include "errors/err_propagator.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

// Names are read from at most 9 bytes; TextToBytes writes at most 8 characters and a zero.
constexpr int kNameReadBytes = 9;

std::int16_t getInsulinFavourites(Transport& t, METER_REC& rec, std::int16_t* out) {
    PREDEFINED_INSULINS_TYPE v{};
    std::int16_t rc = t.GetPredefinedInsulins(rec, v);
    std::copy(std::begin(v.InsulinType), std::end(v.InsulinType), out);
    return rc;
}

std::int16_t setInsulinFavourites(Transport& t, METER_REC& rec, const std::int16_t* in) {
    PREDEFINED_INSULINS_TYPE v{};
    std::copy(in, in + std::size(v.InsulinType), v.InsulinType);
    return t.SetPredefinedInsulins(rec, v);
}

std::int16_t getOralMedFavourites(Transport& t, METER_REC& rec, std::int16_t* out) {
    PREDEFINED_ORAL_MEDS_TYPE v{};
    std::int16_t rc = t.GetPredefinedOralMeds(rec, v);
    std::copy(std::begin(v.oralMedType), std::end(v.oralMedType), out);
    return rc;
}

std::int16_t setOralMedFavourites(Transport& t, METER_REC& rec, const std::int16_t* in) {
    PREDEFINED_ORAL_MEDS_TYPE v{};
    std::copy(in, in + std::size(v.oralMedType), v.oralMedType);
    return t.SetPredefinedOralMeds(rec, v);
}

const MedicationTable kInsulins = {
    "Group_Insulins",
    21,
    3,
    11,
    "InsulinName",
    "FavInsulin",
    "isInsulinChangeable",
    &Transport::GetInsulinName,
    &Transport::SetInsulinName,
    getInsulinFavourites,
    setInsulinFavourites,
};

const MedicationTable kOralMeds = {
    "Group_OralMeds",
    15,
    5,
    6,
    "OralMedName",
    "FavOralMed",
    "isOralMedChangeable",
    &Transport::GetOralMedicationName,
    &Transport::SetOralMedicationName,
    getOralMedFavourites,
    setOralMedFavourites,
};

bool inRange(std::int32_t position, std::int32_t count) { return position >= 1 && position <= count; }

// Slot of a position that must exist; a subscript error otherwise.
std::size_t slotOf(std::int32_t position, std::int32_t count) {
    if (!inRange(position, count))
        raise(errc::subscript_out_of_range,
              "Position " + std::to_string(position) + " is outside 1-" + std::to_string(count));
    return static_cast<std::size_t>(position - 1);
}

}  // namespace

MedicationGroup::MedicationGroup(const MedicationTable& table) : table_(table) { clearValues(); }

Group_Insulins::Group_Insulins() : MedicationGroup(kInsulins) {}
Group_OralMeds::Group_OralMeds() : MedicationGroup(kOralMeds) {}

void MedicationGroup::clearValues() {
    // One spare slot beyond the last position, as the arrays handed out show.
    const auto slots = static_cast<std::size_t>(table_.count) + 1;
    names_.assign(slots, std::string());
    notChangeable_.assign(slots, 0);
    changed_.assign(slots, false);
    favourites_.assign(static_cast<std::size_t>(table_.favouriteCount) + 1, 0);
}

std::int16_t MedicationGroup::readFromMeter() {
    return guarded(table_.className, "readFromMeter", [&]() -> std::int16_t {
        Transport& t = transport();
        for (std::int32_t p = 1; p <= table_.count; ++p) {
            if (!GetContinueFlag()) return 0;
            INSULIN_OR_ORAL_MED_NAME_TYPE record{};
            record.index = toInt16(p);
            // A name the meter did not give fails the read: an empty name would pass for the meter's.
            if (const std::int16_t code = outcome((t.*table_.getName)(rec_, record))) return code;
            const auto slot = static_cast<std::size_t>(p - 1);
            names_[slot] = BytesToText(record.nameStr, kNameReadBytes);
            notChangeable_[slot] = record.notChangeable;
        }
        std::fill(changed_.begin(), changed_.end(), false);
        std::vector<std::int16_t> received(static_cast<std::size_t>(table_.favouriteCount));
        for (std::int32_t f = 1; f <= table_.favouriteCount; ++f) {
            if (std::int16_t code = outcome(table_.getFavourites(t, rec_, received.data()))) return code;
            favourites_[static_cast<std::size_t>(f - 1)] = received[static_cast<std::size_t>(f - 1)];
        }
        return 0;
    });
}

std::int16_t MedicationGroup::saveToMeter() {
    return guarded(table_.className, "saveToMeter", [&]() -> std::int16_t {
        Transport& t = transport();
        for (std::int32_t p = table_.firstCustom; p <= table_.count; ++p) {
            const auto slot = static_cast<std::size_t>(p - 1);
            if (!changed_[slot]) continue;
            INSULIN_OR_ORAL_MED_NAME_TYPE record{};
            record.index = toInt16(p);
            // Names from documents were checked on the way in; any other is a fault, not a name to garble.
            if (!TextToBytes(record.nameStr, names_[slot]))
                raise(errc::internal, "The name at position " + std::to_string(p) + " is not text the meter can hold");
            if (std::int16_t code = outcome((t.*table_.setName)(rec_, record))) return code;
        }
        return outcome(table_.setFavourites(t, rec_, favourites_.data()));
    });
}

std::string MedicationGroup::name(std::int32_t position) const {
    return inRange(position, table_.count) ? names_[static_cast<std::size_t>(position - 1)] : std::string();
}

void MedicationGroup::setName(std::int32_t position, const std::string& value) {
    guarded(table_.className, table_.nameRoutine, [&] {
        const std::size_t slot = slotOf(position, table_.count);
        names_[slot] = value;
        changed_[slot] = true;
    });
}

std::int16_t MedicationGroup::favourite(std::int32_t position) const {
    return inRange(position, table_.favouriteCount) ? favourites_[static_cast<std::size_t>(position - 1)] : 0;
}

void MedicationGroup::setFavourite(std::int32_t position, std::int16_t value) {
    guarded(table_.className, table_.favouriteRoutine,
            [&] { favourites_[slotOf(position, table_.favouriteCount)] = value; });
}

bool MedicationGroup::nameChanged(std::int32_t position) const {
    return inRange(position, table_.count) && changed_[static_cast<std::size_t>(position - 1)];
}

bool MedicationGroup::changeable(std::int32_t position) {
    return guarded(table_.className, table_.changeableRoutine,
                   [&] { return notChangeable_[slotOf(position, table_.count)] != 1; });
}

}  // namespace varnel::detail
