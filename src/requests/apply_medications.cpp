// The medication, schedule and target steps of setDeviceSettings.
#include <algorithm>
#include <array>
#include <iterator>
#include <optional>

#include "errors/err_propagator.h"
#include "requests/apply_settings.h"
#include "requests/option_tables.h"
#include "settings/medication_groups.h"
#include "settings/schedule_group.h"
#include "settings/targets_group.h"
#include "util/codepage.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

template <class G>
std::shared_ptr<G> groupOf(ApplyContext& ctx, std::int32_t number) {
    auto group = std::dynamic_pointer_cast<G>(ctx.meter.Settings().Item(number));
    if (group) group->initialise(ctx.session.meterFns());
    return group;
}

void save(ApplyContext& ctx, ISetupGroup& group, const char* refused) {
    if (group.saveToMeter() != 0)
        ctx.outcome.refuse(refused);
    else
        ctx.outcome.bSuccess = true;
}

// What differs between the insulin and the oral-medication lists.
struct MedicationList {
    const char* element;
    std::int32_t group;
    double lastFixed;  // favourites 1..lastFixed name the meter's own entries
    double firstCustom, lastCustom;
    const char* customRefused;
    const char* favouriteRefused;
    const char* unmatchedEnd;  // after a custom favourite not named in the same document
    const char* tooMany;
    const char* saveRefused;
    void (*setName)(ISetupGroup&, std::int32_t position, const std::string& name);
    void (*setFavourite)(ISetupGroup&, std::int32_t slot, std::int16_t position);
    std::int32_t (*favouriteCount)(ISetupGroup&);
};

// The oral medications answer with the insulin wording; clients know them by it.
const MedicationList kInsulinList = {
    "Insulins",
    eGroupInsulins,
    10,
    11,
    21,
    "Invalid CustomInsulin at index ",
    "Invalid FavoriteInsulin at index ",
    "  ;",
    "Too many FavoriteInsulin at index ",
    "Invalid Insulin value ; ",
    [](ISetupGroup& g, std::int32_t p, const std::string& n) { dynamic_cast<Group_Insulins&>(g).setInsulinName(p, n); },
    [](ISetupGroup& g, std::int32_t k, std::int16_t v) { dynamic_cast<Group_Insulins&>(g).setFavInsulin(k, v); },
    [](ISetupGroup& g) { return dynamic_cast<Group_Insulins&>(g).FavInsulinCount(); },
};
const MedicationList kOralMedList = {
    "Pills",
    eGroupOralMeds,
    5,
    6,
    15,
    "Invalid CustomOralMed at index ",
    "Invalid FavoriteInsulin at index ",
    " ;",
    "Too many FavoriteOralMed at index ",
    "Invalid OralMeds value ; ",
    [](ISetupGroup& g, std::int32_t p, const std::string& n) { dynamic_cast<Group_OralMeds&>(g).setOralMedName(p, n); },
    [](ISetupGroup& g, std::int32_t k, std::int16_t v) { dynamic_cast<Group_OralMeds&>(g).setFavOralMed(k, v); },
    [](ISetupGroup& g) { return dynamic_cast<Group_OralMeds&>(g).FavOralMedsCount(); },
};

// The custom positions named by one document's list, by their place in it.
constexpr std::size_t kCustomEntries = 13;

MissingElement applyMedications(ApplyContext& ctx, const MedicationList& list) {
    std::shared_ptr<ISetupGroup> group = groupOf<ISetupGroup>(ctx, list.group);
    if (!group) return {};
    XMLWrapper& cfg = ctx.deviceCfg;
    WriteOutcome& outcome = ctx.outcome;

    cfg.SelectElement("Settings");
    if (cfg.CountElements(list.element) != 1) return list.element;
    cfg.MoveToChild(list.element);
    if (cfg.CountElements("Custom") != 1) return "Custom";
    cfg.MoveToChild("Custom");
    std::array<std::int16_t, kCustomEntries> named{};
    for (std::int32_t i = 0, n = cfg.GetChildCount(); i < n; ++i) {
        const std::string v = Trim(cfg.GetChildValueAt(i));
        const std::optional<double> position = DocumentNumber(v);
        const std::string name = Trim(cfg.GetChildAttributeAt(i, "Txt"));
        // A name the meter cannot hold is refused whole rather than stored garbled.
        if (!position || *position < list.firstCustom || *position > list.lastCustom || !EncodeMeterText(name)) {
            outcome.refuse(list.customRefused + Abbreviated(v) + " ;");
            continue;
        }
        if (static_cast<std::size_t>(i) >= named.size())
            raise(errc::subscript_out_of_range, std::string("More than 13 entries in ") + list.element + "/Custom");
        named[static_cast<std::size_t>(i)] = roundToInt16(*position);
        list.setName(*group, named[static_cast<std::size_t>(i)], name);
    }

    cfg.SelectElement("Settings");
    cfg.MoveToChild(list.element);
    if (cfg.CountElements("Favorite") != 1) return "Favorite";
    cfg.MoveToChild("Favorite");
    std::int32_t slot = 1;
    for (std::int32_t j = 0, n = cfg.GetChildCount(); j < n; ++j) {
        const std::string v = Trim(cfg.GetChildValueAt(j));
        if (v.empty()) continue;
        const std::optional<double> position = DocumentNumber(v);
        const bool fixed = position && *position > 0 && *position <= list.lastFixed;
        const bool custom = position && *position >= list.firstCustom && *position <= list.lastCustom;
        if (custom && std::find(named.begin(), named.end(), *position) == named.end()) {
            outcome.refuse(list.favouriteRefused + Abbreviated(v) + list.unmatchedEnd);
        } else if (!fixed && !custom) {
            outcome.refuse(list.favouriteRefused + Abbreviated(v) + " ;");
        } else if (slot > list.favouriteCount(*group)) {
            // The meter keeps a fixed number of favourites; the rest would be lost unseen.
            outcome.refuse(list.tooMany + Abbreviated(v) + " ;");
        } else {
            list.setFavourite(*group, slot++, roundToInt16(*position));
        }
    }
    save(ctx, *group, list.saveRefused);
    return {};
}

}  // namespace

MissingElement applyInsulins(ApplyContext& ctx) { return applyMedications(ctx, kInsulinList); }

MissingElement applyOralMeds(ApplyContext& ctx) { return applyMedications(ctx, kOralMedList); }

MissingElement applySchedule(ApplyContext& ctx) {
    std::shared_ptr<Group_Schedule> group = groupOf<Group_Schedule>(ctx, eGroupSchedule);
    if (!group) return {};
    XMLWrapper& cfg = ctx.deviceCfg;

    cfg.SelectElement("Settings");
    if (cfg.CountElements("Schedule") != 1) return "Schedule";
    const std::string custom = LowerCase(Trim(cfg.GetChildAttribute("Schedule", "Custom")));
    if (custom == "true") {
        group->ScheduleType = 1;
    } else if (custom == "false") {
        group->ScheduleType = 0;
    } else {
        ctx.outcome.refuse("Schedule type invalid ; ");
        // The save writes the selection too: it must be the meter's own, not a fresh group's 0.
        if (group->readFromMeter() != 0) {
            ctx.outcome.refuse("Invalid Schedule value ; ");
            return {};
        }
    }
    if (group->ScheduleType != 0) {
        for (std::int32_t s = 1; s <= group->Count(); ++s) {
            const char* name = kMealSegments.at(static_cast<std::size_t>(s - 1));
            cfg.SelectElement("Settings");
            cfg.MoveToChild("Schedule");
            if (cfg.CountElements(name) != 1) return name;
            const std::optional<std::int16_t> h = DocumentInt16(Trim(cfg.GetChildAttribute(name, "h")));
            const std::optional<std::int16_t> m = DocumentInt16(Trim(cfg.GetChildAttribute(name, "m")));
            // A negative time marks a segment left as it is.
            if (h && m && (*h < 0 || *m < 0)) continue;
            // Beyond the day it would wrap round to another time; no number is no time at all.
            if (!h || !m || *h > 23 || *m > 59) {
                ctx.outcome.refuse(std::string("Invalid Schedule ") + name + " value ; ");
                continue;
            }
            group->setScheduleTime(s, *DateTime::fromParts(1899, 12, 30, *h, *m));
        }
    }
    save(ctx, *group, "Invalid Schedule value ; ");
    return {};
}

MissingElement applyTargets(ApplyContext& ctx) {
    std::shared_ptr<Group_targets> group = groupOf<Group_targets>(ctx, eGroupTargets);
    if (!group) return {};
    XMLWrapper& cfg = ctx.deviceCfg;

    cfg.MoveToRoot();
    if (cfg.CountElements("Settings") != 1) return "Settings";
    cfg.SelectElement("Settings");
    if (cfg.CountElements("Targets") != 1) return "Targets";
    cfg.MoveToChild("Targets");
    std::array<std::optional<std::int16_t>, kTargetElements.size()> accepted;
    bool anyRefused = false;
    for (std::size_t i = 0; i < kTargetElements.size(); ++i) {
        const TargetElement& t = kTargetElements[i];
        if (cfg.CountElements(t.element) != 1) return t.element;
        const std::optional<std::int16_t> v = DocumentInt16(Trim(cfg.GetChildValue(t.element)));
        // The limits may be 0; a hypo level may not. An empty text is no limit at all.
        if (v && (t.limit == &Group_targets::HypoLevel ? *v > 0 : *v >= 0)) {
            accepted[i] = *v;
        } else {
            ctx.outcome.refuse(std::string("Invalid Targets ") + t.element + " value ; ");
            anyRefused = true;
        }
    }
    // All five limits are saved together: a refused one keeps the meter's value, not a fresh group's 0.
    if (anyRefused && group->readFromMeter() != 0) {
        ctx.outcome.refuse("Invalid Targets value ; ");
        return {};
    }
    for (std::size_t i = 0; i < kTargetElements.size(); ++i)
        if (accepted[i]) (*group).*kTargetElements[i].limit = *accepted[i];
    save(ctx, *group, "Invalid Targets value ; ");
    return {};
}

}  // namespace varnel::detail
