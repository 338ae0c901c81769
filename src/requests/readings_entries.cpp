#include "requests/readings_entries.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <climits>
#include <cmath>
#include <concepts>
#include <cstdio>
#include <string>
#include <string_view>
#include <typeinfo>

#include "contracts/xml_wrapper_append.h"
#include "errors/err_propagator.h"
#include "requests/document_values.h"

namespace varnel::detail {

namespace {

// The text GetTrueString gives; flags and health entries carry it.
constexpr const char* kTrue = "true";

// The concrete class of a result; a result that is not what its kind says is an error, never a guess.
// The exact class, the usual case, is told by its type alone, without a walk of the hierarchy.
template <class T>
const T& as(const Result& r) {
    return typeid(r) == typeid(T) ? static_cast<const T&>(r) : dynamic_cast<const T&>(r);
}
template <class T>
T& as(Result& r) {
    return typeid(r) == typeid(T) ? static_cast<T&>(r) : dynamic_cast<T&>(r);
}

template <ResultKind K>
std::string valueText(const Result& r) {
    return NumberText(as<ResultOf<K>>(r).Value());
}

// A text looked up by ResultType.
struct Coded {
    std::int32_t type;
    const char* text;
    const char* txt;
};

template <std::size_t N>
const Coded* lookup(const Coded (&table)[N], std::int32_t type) {
    for (const Coded& c : table)
        if (c.type == type) return &c;
    return nullptr;
}

// Writes into the entry element just added under Records.
// Every name is a constant of this file.
struct Entry {
    XmlAppender doc;
    const EntryContext& context;

    void attr(const char* name, std::string_view value) { doc.setAttribute(name, value); }
    void child(const char* name, std::string_view text = {}, const char* parent = "") {
        doc.addChildElement(name, parent, text);
    }
    void childAttr(const char* name, std::string_view value) { doc.setChildAttribute(name, value); }
    // Ord: only the binary-datalog meter numbers its entries.
    void ord(const Result& r) {
        if (context.storedMeterType == 7) attr("Ord", NumberText(r.Ordinal()));
    }
    // Attributes Name/Txt from a ResultType table; nothing for an unlisted type.
    void codedAttrs(const char* name, const Coded* c) {
        if (!c) return;
        attr(name, c->text);
        attr("Txt", c->txt);
    }
    // A child Name with text and Txt from a ResultType table; nothing for an unlisted type.
    void codedChild(const char* name, const Coded* c) {
        if (!c) return;
        child(name, c->text);
        childAttr("Txt", c->txt);
    }
};

// --- glucose and check strip ---

// "High" above the meter's range, "Low" below it, nothing within it: a HI or LO reading
// carries the meter's limit as its value and must not pass for a measured one.
const char* rangeText(std::int32_t valueInMeterRange) {
    return valueInMeterRange == 1 ? "High" : valueInMeterRange == 2 ? "Low" : nullptr;
}

constexpr const char* kMealSlotTexts[] = {"Before Breakfast", "After Breakfast", "Before Lunch", "After Lunch",
                                          "Before Dinner",    "After Dinner",    "Night",        "Sleep"};

void mealSlot(Entry& e, std::int32_t slot, bool glucose) {
    if (slot < 1 || slot > 8) return;
    // Type-2 meters name their night and sleep glucose slots the other way round.
    const bool swapped = glucose && e.context.storedMeterType == 2 && slot >= 7;
    e.child("MealSlot");
    e.childAttr("Slot", NumberText(slot));
    e.childAttr("Txt", kMealSlotTexts[swapped ? 14 - slot : slot - 1]);
}

struct CommentElement {
    std::int32_t id;
    const char* element;
    const char* text;  // nullptr: an empty element without Txt
    const char* txt;
};

constexpr CommentElement kCommentElements[] = {
    {1, "Food", "1", "Fasting"},
    {8, "Food", "0", "Different Food"},
    {10, "Ex", "2", "During"},
    {11, "Ex", "0", "Before"},
    {12, "Ex", "1", "After"},
    {13, "Ill", nullptr, nullptr},
    {14, "Hypo", nullptr, nullptr},
    {15, "Other", "0", "Other"},
    {17, "Stress", nullptr, nullptr},
    {18, "Menses", nullptr, nullptr},
    {19, "Vac", nullptr, nullptr},
    {23, "Food", "2", "Too much Food"},
    {24, "Food", "3", "Not enough Food"},
    {25, "Other", "1", "Other1"},
    {26, "Other", "2", "Other2"},
};

const CommentElement* commentElement(std::int32_t id) {
    for (const CommentElement& c : kCommentElements)
        if (c.id == id) return &c;
    return nullptr;
}

void comments(Entry& e, const Glucose& g) {
    // Meters of types 6 and 8 show no comments in the datalog.
    if (e.context.storedMeterType == 6 || e.context.storedMeterType == 8) return;
    const CommentsCollection& list = g.commentsSeen();
    const CommentsCollection& events = g.eventsSeen();
    // Any real comment counts, not just the first: a leading code 0 must not hide the rest.
    bool any = events.Count() > 0;
    for (const CommentPtr& c : list) any = any || c->Id() != 0;
    if (!any) return;
    e.child("Comments");
    for (const CommentPtr& c : list) {
        const CommentElement* el = commentElement(c->Id());
        if (!el) continue;
        e.child(el->element, el->text ? el->text : std::string_view(), "Comments");
        if (el->txt) e.childAttr("Txt", el->txt);
    }
    for (const CommentPtr& c : events) {
        e.child("Event", NumberText(c->Id()), "Comments");
        e.childAttr("Txt", "EVENT" + NumberText(c->Id()));
    }
}

void writeGlucose(Entry& e, const Result& r) {
    const Glucose& g = as<Glucose>(r);
    // Type, Txt and Site by ResultType: control solution, alternate site, anything else.
    struct Sample {
        std::int32_t type;
        const char *kind, *txt, *site;
    };
    static constexpr Sample samples[] = {{21, "1", "Control", "4"}, {11, "0", "Blood", "1"}, {0, "0", "Blood", "0"}};
    const Sample* s = &samples[2];
    for (const Sample& x : samples)
        if (x.type == g.ResultType()) {
            s = &x;
            break;
        }
    e.attr("Val", NumberText(g.Value()));
    if (const char* range = rangeText(g.ValueInMeterRange())) e.attr("Range", range);
    e.attr("Type", s->kind);
    e.attr("Txt", s->txt);
    e.attr("Site", s->site);
    e.ord(r);
    mealSlot(e, g.Slot(), true);
    comments(e, g);
}

void writeCheckStrip(Entry& e, const Result& r) {
    const CheckStrip& s = as<CheckStrip>(r);
    e.ord(r);
    e.attr("Site", "4");
    e.attr("Val", NumberText(s.Value()));
    if (const char* range = rangeText(s.ValueInMeterRange())) e.attr("Range", range);
    e.attr("Type", "2");
    e.attr("Txt", "Check Strip");
    mealSlot(e, s.Slot(), false);
    e.child("Strip");
    e.child("Lvl", "1", "Strip");
    e.childAttr("Upper", NumberText(e.context.checkStripHigh));
    e.childAttr("Lower", NumberText(e.context.checkStripLow));
}

// --- entries that take several results of one meter entry ---

void valueBP(Entry& e, const Result&, const Result& r) {
    if (r.ResultType() == 91) e.attr("Diast", valueText<ResultKind::BloodPressure>(r));
    if (r.ResultType() == 90) e.attr("Syst", valueText<ResultKind::BloodPressure>(r));
}

void valueHtWt(Entry& e, const Result&, const Result& r) {
    if (r.ResultType() == 101) e.child("Ht", valueText<ResultKind::BodyDimensions>(r));
    if (r.ResultType() == 100) e.child("Wt", valueText<ResultKind::BodyDimensions>(r));
}

void valueCholes(Entry& e, const Result&, const Result& r) {
    static constexpr Coded names[] = {{130, "LDL", ""}, {131, "HDL", ""}, {140, "Total", ""}, {150, "Trig", ""}};
    const Coded* c = lookup(names, r.ResultType());
    if (!c) return;
    e.child(c->text, valueText<ResultKind::Cholestrol>(r));
    // One entry holds several values; each says for itself whether it is out of range.
    if (const char* range = rangeText(as<Cholestrol>(r).ValueInMeterRange())) e.childAttr("Range", range);
}

bool isSnack(const Result& r) { return r.ResultType() >= 55 && r.ResultType() <= 58; }

void valueFood(Entry& e, const Result& first, const Result& r) {
    // Regular and snack codes name the same four values, five apart.
    static constexpr Coded names[] = {{50, "Carbs", ""}, {51, "Cals", ""}, {52, "SFat", ""}, {53, "Protein", ""}};
    std::int32_t type = r.ResultType() - (isSnack(first) ? 5 : 0);
    if (const Coded* c = lookup(names, type)) e.child(c->text, valueText<ResultKind::Food>(r));
}

// A snack value never joins a meal entry nor the reverse: its value child would be lost.
bool sameFoodKind(const Result& first, const Result& next) { return isSnack(first) == isSnack(next); }

void valueHNotes(Entry& e, const Result&, const Result& r) {
    static constexpr const char* names[] = {"Stress", "Hypo", "Ill", "Menses", "Vac", "Other"};
    if (r.ResultType() >= 170 && r.ResultType() <= 175) e.child(names[r.ResultType() - 170]);
}

void writeFood(Entry& e, const Result& r) {
    e.ord(r);
    if (isSnack(r)) {
        e.child("Slot", "4");
        e.childAttr("Txt", "Snack");
        return;
    }
    if (r.ResultType() < 50 || r.ResultType() > 53) return;
    static constexpr Coded meals[] = {{1, "1", "Breakfast"}, {3, "2", "Lunch"}, {5, "3", "Dinner"}};
    e.codedChild("Slot", lookup(meals, as<Food>(r).MealSlot()));
}

void writeOrd(Entry& e, const Result& r) { e.ord(r); }

// --- entries of one result each ---

void writeError(Entry& e, const Result& r) {
    e.child("Major", "Gluc Error");
    e.child("Minor", "Test.Flags=3");
    e.child("Txt", NumberText(as<Error>(r).Value()));
}

void writeChange(Entry& e, const Result& r) {
    const CalCode& c = as<CalCode>(r);
    e.attr("Type", "2");
    e.attr("From", c.FromValue());
    e.attr("To", c.ToValue());
}

void writeExercise(Entry& e, const Result& r) {
    const Exercise& x = as<Exercise>(r);
    e.attr("Duration", NumberText(static_cast<long long>(x.Hours()) * 60 + x.Minutes()));
    e.ord(r);
    static constexpr Coded levels[] = {{60, "0", "Mild"}, {61, "1", "Moderate"}, {62, "2", "Hard"}};
    e.codedChild("Intensity", lookup(levels, r.ResultType()));
}

void writeAlcohol(Entry& e, const Result& r) {
    const Alcohol& a = as<Alcohol>(r);
    if (a.Value() > 0) e.attr("Val", NumberText(a.Value()));
    e.ord(r);
}

void writeHbA1c(Entry& e, const Result& r) {
    e.attr("Val", valueText<ResultKind::hbA1C>(r));
    e.ord(r);
}

void writePump(Entry& e, const Result& r) {
    e.ord(r);
    e.attr("Val", valueText<ResultKind::InsulinPump>(r));
}

void writeInjection(Entry& e, const Result& r) {
    const InsulinInjection& i = as<InsulinInjection>(r);
    e.attr("Val", NumberText(i.Value()));
    e.ord(r);
    e.attr("InsName", i.InsulinName());
}

void writeKetones(Entry& e, const Result& r) {
    e.ord(r);
    static constexpr Coded levels[] = {
        {110, "0", "Negative"}, {111, "1", "Trace"}, {112, "2", "Small"}, {113, "3", "Moderate"}, {114, "4", "Large"}};
    e.codedAttrs("Val", lookup(levels, r.ResultType()));
}

void writeVisit(Entry& e, const Result& r) {
    e.ord(r);
    static constexpr Coded visits[] = {{160, "2", "Dr Visit"}, {161, "0", "Eye Exam"}, {162, "1", "Foot Exam"}};
    e.codedAttrs("Type", lookup(visits, r.ResultType()));
}

void writeMicroAlbumin(Entry& e, const Result& r) {
    e.ord(r);
    if (r.ResultType() == 123) {
        e.child("Val", valueText<ResultKind::microalbumin>(r));
        return;
    }
    static constexpr Coded levels[] = {{122, "2", ">1000"}, {120, "0", "Normal"}, {121, "1", "Positive"}};
    e.codedChild("Type", lookup(levels, r.ResultType()));
}

void writeOralMed(Entry& e, const Result& r) {
    const OralMeds& m = as<OralMeds>(r);
    e.ord(r);
    e.attr("Val", NumberText(m.Value()));
    e.child("OMedName", m.OralMedsName());
}

// How an entry takes the results that follow its first one.
struct Merge {
    int most;        // results absorbed at most; 0: the entry never merges
    bool sameGroup;  // the next result must share the first one's GroupId
    bool (*fits)(const Result& first, const Result& next) = nullptr;
};

constexpr Merge kAlone{0, false};
constexpr Merge kMany{INT_MAX, true};

// One row per result class, in the order the classes are tested.
struct EntryKind {
    ResultKind kind;
    const char* element;
    std::array<const char*, 2> flags;  // attributes set to "true" before the date
    void (*write)(Entry&, const Result&);
    // Writes one result's value into the open element; called for the first result too.
    void (*value)(Entry&, const Result& first, const Result& r);
    Merge merge;
};

constexpr EntryKind kEntryKinds[] = {
    {ResultKind::Error, "Error", {}, writeError, nullptr, kAlone},
    {ResultKind::Glucose, "Gluc", {}, writeGlucose, nullptr, kAlone},
    {ResultKind::BloodPressure, "BP", {"Health"}, writeOrd, valueBP, {1, false}},
    {ResultKind::BodyDimensions, "HtWt", {"Health"}, writeOrd, valueHtWt, {1, true}},
    {ResultKind::CheckStrip, "Gluc", {}, writeCheckStrip, nullptr, kAlone},
    {ResultKind::CalCode, "Change", {}, writeChange, nullptr, kAlone},
    {ResultKind::Cholestrol, "Choles", {"Health"}, writeOrd, valueCholes, kMany},
    {ResultKind::Exercise, "Ex", {}, writeExercise, nullptr, kAlone},
    {ResultKind::Food, "Food", {}, writeFood, valueFood, {INT_MAX, true, sameFoodKind}},
    {ResultKind::Alcohol, "Alcohol", {}, writeAlcohol, nullptr, kAlone},
    {ResultKind::hbA1C, "HbA1c", {"Health"}, writeHbA1c, nullptr, kAlone},
    {ResultKind::HealthNotes, "HNotes", {"Health"}, writeOrd, valueHNotes, kMany},
    {ResultKind::InsulinPump, "MTDD", {"Ins", "Med"}, writePump, nullptr, kAlone},
    {ResultKind::InsulinInjection, "Ins", {"Ins", "Med"}, writeInjection, nullptr, kAlone},
    {ResultKind::ketones, "Ketones", {"Health"}, writeKetones, nullptr, kAlone},
    {ResultKind::LastVisits, "Visit", {"Health"}, writeVisit, nullptr, kAlone},
    {ResultKind::microalbumin, "MicroAlbumin", {"Health"}, writeMicroAlbumin, nullptr, kAlone},
    {ResultKind::OralMeds, "OralMed", {"Med"}, writeOralMed, nullptr, kAlone},
};

const EntryKind& entryKind(ResultKind kind) {
    for (const EntryKind& k : kEntryKinds)
        if (k.kind == kind) return k;
    raise(errc::internal, "No entry for result class " + std::string(resultShape(kind).name));
}

// A pump result is a bolus or a daily total.
const char* elementName(const EntryKind& k, const Result& r) {
    return k.kind == ResultKind::InsulinPump && r.ResultType() == 41 ? "MBolus" : k.element;
}

void cholesUnit(XMLWrapper& doc, const Cholestrol& first) {
    static constexpr Coded units[] = {{0, "0", "mg/dL"}, {1, "1", "mmol/L"}};
    doc.SelectElement("TransferDetail");
    doc.MoveToChild("ExtraInfo");
    if (const Coded* u = lookup(units, first.UnitType())) {
        doc.AddElement("CholesUnit", u->text);
        doc.SetAttribute("Txt", u->txt);
    }
    doc.SelectElement("Records");
}

Result& asResult(const ResultPtr& p) {
    if (!p) raise(errc::missing_object, "Object variable not set");
    Result* r = p->asResult();
    if (!r) throw std::bad_cast();  // not one of the result classes, as a failed cast says
    return *r;
}

}  // namespace

bool ProcessCommentsAsPerDeviceType(Glucose& result, std::int16_t deviceType) {
    if (result.commentsSeen().Count() == 0) return true;
    auto list = result.Comments();
    for (std::int32_t i = 1; i <= list->Count();) {
        const std::int32_t id = list->Item(i)->Id();
        bool taken = id == 0;
        if (!taken && deviceType == 1) {
            // These meters' codes are events, not comments.
            result.events()->Add(id, 1);
            taken = true;
        } else if (!taken && deviceType == 2 && ((id >= 2 && id <= 7) || id == 9 || id == 10)) {
            // These meters give the meal slot as a comment code; a later one wins.
            result.setSlot(id <= 7 ? id - 1 : id - 2);
            taken = true;
        }
        if (taken)
            list->Remove(i);
        else
            ++i;
    }
    return true;
}

void writeReadingsEntries(XMLWrapper& datalog, ResultCollection& results, EntryContext& context,
                          UniqueChecker& checker) {
    Entry e{XmlAppender(datalog), context};
    const std::int32_t count = results.Count();
    for (std::int32_t i = 1; i <= count; ++i) {
        const ResultPtr& item = results.Item(i);
        Result& first = asResult(item);
        const EntryKind& k = entryKind(first.kind());

        const std::int16_t type = context.storedMeterType;
        if (k.kind == ResultKind::Glucose && (type == 1 || type == 2 || type == 7))
            ProcessCommentsAsPerDeviceType(as<Glucose>(first), context.lastMeterType);
        if (k.kind == ResultKind::Cholestrol && !context.cholesUnitWritten) {
            cholesUnit(datalog, as<Cholestrol>(first));
            context.cholesUnitWritten = true;
        }

        e.doc.addElement(elementName(k, first));
        // The flags, then the date: every entry starts with them, set in one call.
        std::array<XmlAppender::Attribute, 8> head;
        std::size_t n = 0;
        for (const char* flag : k.flags)
            if (flag) head[n++] = {flag, kTrue};
        const DateAttributes date(first.DateTime(), true);
        for (const DateAttributes::Attribute& a : date) head[n++] = {a.name, a.text};
        e.doc.setAttributes({head.data(), n});
        k.write(e, first);
        if (k.value) k.value(e, first, first);

        if (k.merge.most == 0) continue;
        checker.Clear();
        checker.AddValue(NumberText(first.ResultType()));
        for (int absorbed = 0; absorbed < k.merge.most && i < count; ++absorbed) {
            const ResultPtr& nextItem = results.Item(i + 1);
            const Result& next = asResult(nextItem);
            if (next.kind() != k.kind) break;
            if (k.merge.sameGroup && next.GroupId() != first.GroupId()) break;
            if (k.merge.fits && !k.merge.fits(first, next)) break;
            if (!checker.AddValue(NumberText(next.ResultType()))) break;
            k.value(e, first, next);
            ++i;
        }
        checker.Clear();
    }
}

}  // namespace varnel::detail
