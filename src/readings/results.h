// Result records: one object per value uploaded from a meter, kept in a
// ResultCollection. All classes share one shape (Result); what differs between
// them (value type, fixed ResultType, slot name, defaults) is the data in
// resultShapes, and the few classes with members of their own add them.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "readings/comments.h"
#include "util/date_time.h"

namespace varnel::detail {

// The result classes, in the order their shapes are listed.
enum class ResultKind : std::uint8_t {
    Glucose,
    CheckStrip,
    Cholestrol,
    hbA1C,
    ketones,
    microalbumin,
    BloodPressure,
    BodyDimensions,
    Food,
    Alcohol,
    InsulinInjection,
    InsulinPump,
    OralMeds,
    Exercise,
    HealthNotes,
    LastVisits,
    CalCode,
    Error,
};

// How a class keeps its Value.
enum class ValueType : std::uint8_t { None, Long, Double };

// ResultType of a class that lets it be set.
inline constexpr std::int32_t kSettableType = -1;

// What one result class is made of.
struct ResultShape {
    const char* name;
    ValueType value;
    std::int32_t fixedType;  // kSettableType, or the ResultType every object reports
    bool mealSlot;           // the slot is called MealSlot rather than Slot
    bool measured;           // has UnitType and ValueInMeterRange
    std::int32_t initialValue;
    std::int32_t initialRange;  // ValueInMeterRange at creation
};

inline constexpr ResultShape resultShapes[] = {
    {"Glucose", ValueType::Double, kSettableType, false, true, 0, 3},
    {"CheckStrip", ValueType::Double, 20, false, true, 0, 3},
    {"Cholestrol", ValueType::Double, kSettableType, false, true, 0, 0},
    {"hbA1C", ValueType::Double, 80, false, false, 0, 0},
    {"ketones", ValueType::Long, kSettableType, false, false, 0, 0},
    {"microalbumin", ValueType::Long, kSettableType, false, false, 0, 0},
    {"BloodPressure", ValueType::Long, kSettableType, false, false, 0, 0},
    {"BodyDimensions", ValueType::Double, kSettableType, false, false, 0, 0},
    {"Food", ValueType::Long, kSettableType, true, false, 0, 0},
    {"Alcohol", ValueType::Long, 54, true, false, 0, 0},
    {"InsulinInjection", ValueType::Double, 30, false, false, 0, 0},
    {"InsulinPump", ValueType::Double, kSettableType, false, false, 0, 0},
    {"OralMeds", ValueType::Double, 70, false, false, 0, 0},
    {"Exercise", ValueType::None, kSettableType, false, false, 0, 0},
    {"HealthNotes", ValueType::Long, kSettableType, false, false, 1, 0},
    {"LastVisits", ValueType::Long, kSettableType, false, false, 0, 0},
    {"CalCode", ValueType::Long, 2, true, false, 0, 0},
    {"Error", ValueType::Long, 0, true, false, 0, 0},
};

constexpr const ResultShape& resultShape(ResultKind kind) { return resultShapes[static_cast<std::size_t>(kind)]; }

class Result;

// What every result offers to the code that groups and identifies results.
class IResult {
public:
    virtual ~IResult() = default;
    virtual void setDateTime(detail::DateTime v) = 0;
    virtual detail::DateTime DateTime() const = 0;
    virtual std::int32_t Id() const = 0;
    virtual void setGroupId(std::int32_t v) = 0;
    virtual std::int32_t GroupId() const = 0;
    virtual void setMeterGroupId(std::int32_t v) = 0;
    virtual std::int32_t MeterGroupId() const = 0;
    virtual void setId(std::int32_t v) = 0;
    // Which result class this is, for callers that branch on it.
    virtual ResultKind kind() const = 0;
    // The shape every result class shares; null for anything else.
    virtual Result* asResult() { return nullptr; }
};

// The shape all result classes share.
class Result : public IResult {
public:
    void setDateTime(detail::DateTime v) final { dateTime_ = v; }
    detail::DateTime DateTime() const final { return dateTime_; }
    std::int32_t Id() const final { return id_; }
    void setId(std::int32_t v) final { id_ = v; }
    std::int32_t GroupId() const final { return groupId_; }
    void setGroupId(std::int32_t v) final { groupId_ = v; }
    std::int32_t MeterGroupId() const final { return meterGroupId_; }
    void setMeterGroupId(std::int32_t v) final { meterGroupId_ = v; }
    ResultKind kind() const final { return kind_; }
    Result* asResult() final { return this; }

    std::int16_t Ordinal() const { return ordinal_; }
    void setOrdinal(std::int16_t v) { ordinal_ = v; }
    std::int32_t ResultType() const { return resultType_; }

    const char* className() const { return resultShape(kind_).name; }

protected:
    explicit Result(ResultKind kind)
        : kind_(kind),
          resultType_(resultShape(kind).fixedType == kSettableType ? 0 : resultShape(kind).fixedType),
          value_(resultShape(kind).initialValue),
          valueInMeterRange_(resultShape(kind).initialRange) {}

    ResultKind kind_;
    std::int32_t meterGroupId_ = 0;
    std::int32_t groupId_ = 0;
    std::int32_t id_ = 0;
    std::int16_t ordinal_ = 0;
    detail::DateTime dateTime_;
    std::int32_t resultType_;
    double value_;
    std::int32_t slot_ = 0;
    std::int32_t unitType_ = 0;
    std::int32_t valueInMeterRange_;
};

// One result class: the members its shape gives it, typed as the class keeps them.
template <ResultKind K>
class ResultOf : public Result {
public:
    static constexpr ResultShape shape = resultShape(K);

    ResultOf() : Result(K) {}

    std::int32_t Value() const requires(shape.value == ValueType::Long) { return static_cast<std::int32_t>(value_); }
    void setValue(std::int32_t v) requires(shape.value == ValueType::Long) { value_ = v; }
    // A whole-number value must be rounded by the caller, never truncated here.
    template <std::floating_point T>
    void setValue(T) requires(shape.value == ValueType::Long) = delete;
    double Value() const requires(shape.value == ValueType::Double) { return value_; }
    void setValue(double v) requires(shape.value == ValueType::Double) { value_ = v; }

    void setResultType(std::int32_t v) requires(shape.fixedType == kSettableType) { resultType_ = v; }

    std::int32_t Slot() const requires(!shape.mealSlot) { return slot_; }
    void setSlot(std::int32_t v) requires(!shape.mealSlot) { slot_ = v; }
    std::int32_t MealSlot() const requires(shape.mealSlot) { return slot_; }
    void setMealSlot(std::int32_t v) requires(shape.mealSlot) { slot_ = v; }

    std::int32_t UnitType() const requires(shape.measured) { return unitType_; }
    void setUnitType(std::int32_t v) requires(shape.measured) { unitType_ = v; }
    // 1 above the meter's range, 2 below it, 3 within it.
    std::int32_t ValueInMeterRange() const requires(shape.measured) { return valueInMeterRange_; }
    void setValueInMeterRange(std::int32_t v) requires(shape.measured) { valueInMeterRange_ = v; }
};

using CheckStrip = ResultOf<ResultKind::CheckStrip>;
using Cholestrol = ResultOf<ResultKind::Cholestrol>;
using hbA1C = ResultOf<ResultKind::hbA1C>;
using ketones = ResultOf<ResultKind::ketones>;
using microalbumin = ResultOf<ResultKind::microalbumin>;
using BloodPressure = ResultOf<ResultKind::BloodPressure>;
using BodyDimensions = ResultOf<ResultKind::BodyDimensions>;
using Food = ResultOf<ResultKind::Food>;
using Alcohol = ResultOf<ResultKind::Alcohol>;
using InsulinPump = ResultOf<ResultKind::InsulinPump>;
using HealthNotes = ResultOf<ResultKind::HealthNotes>;
using LastVisits = ResultOf<ResultKind::LastVisits>;

// A blood glucose reading with its comment codes.
class Glucose final : public ResultOf<ResultKind::Glucose> {
public:
    std::int32_t Calibration() const { return calibration_; }
    void setCalibration(std::int32_t v) { calibration_ = v; }
    // Reading either list while it holds none starts a new, empty one.
    std::shared_ptr<CommentsCollection> Comments() const { return held(comments_); }
    std::shared_ptr<CommentsCollection> events() const { return held(events_); }
    // The lists as they are, starting none: most readings carry no comment at all.
    const CommentsCollection& commentsSeen() const { return comments_ ? *comments_ : kNone; }
    const CommentsCollection& eventsSeen() const { return events_ ? *events_ : kNone; }

private:
    static std::shared_ptr<CommentsCollection> held(std::shared_ptr<CommentsCollection>& list) {
        if (!list) list = std::make_shared<CommentsCollection>();
        return list;
    }

    static inline const CommentsCollection kNone{};

    std::int32_t calibration_ = 0;
    mutable std::shared_ptr<CommentsCollection> comments_;
    mutable std::shared_ptr<CommentsCollection> events_;
};

class InsulinInjection final : public ResultOf<ResultKind::InsulinInjection> {
public:
    const std::string& InsulinName() const { return name_; }
    void setInsulinName(std::string v) { name_ = std::move(v); }

private:
    std::string name_;
};

class OralMeds final : public ResultOf<ResultKind::OralMeds> {
public:
    const std::string& OralMedsName() const { return name_; }
    void setOralMedsName(std::string v) { name_ = std::move(v); }

private:
    std::string name_;
};

// An exercise session; its ResultType is the exercise level and it has no Value.
class Exercise final : public ResultOf<ResultKind::Exercise> {
public:
    std::int32_t Hours() const { return hours_; }
    void setHours(std::int32_t v) { hours_ = v; }
    std::int32_t Minutes() const { return minutes_; }
    void setMinutes(std::int32_t v) { minutes_ = v; }

private:
    std::int32_t hours_ = 0;
    std::int32_t minutes_ = 0;
};

// A change from one text value to another (a calibration code, a meter error).
template <ResultKind K>
class ValueChange final : public ResultOf<K> {
public:
    const std::string& FromValue() const { return from_; }
    void setFromValue(std::string v) { from_ = std::move(v); }
    const std::string& ToValue() const { return to_; }
    void setToValue(std::string v) { to_ = std::move(v); }

private:
    std::string from_;
    std::string to_;
};

using CalCode = ValueChange<ResultKind::CalCode>;
using Error = ValueChange<ResultKind::Error>;

using ResultPtr = std::shared_ptr<IResult>;

// The results of one upload, in the order they were added; positions are 1-based.
class ResultCollection {
public:
    // Appends a result (never null) and returns the same object.
    ResultPtr Add(ResultPtr result);
    // The result at a 1-based position; nullptr when there is none.
    const ResultPtr& Item(std::int32_t index) const;
    std::int32_t Count() const { return static_cast<std::int32_t>(items_.size()); }

    std::vector<ResultPtr>::const_iterator begin() const { return items_.begin(); }
    std::vector<ResultPtr>::const_iterator end() const { return items_.end(); }

private:
    std::vector<ResultPtr> items_;
};

}  // namespace varnel::detail
