#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "readings/results.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

template <class T>
concept TypeSettable = requires(T t) { t.setResultType(1); };
template <class T>
concept HasSlot = requires(T t) { t.setSlot(1); };
template <class T>
concept HasMealSlot = requires(T t) { t.setMealSlot(1); };
template <class T>
concept HasValue = requires(T t) { t.Value(); };
template <class T>
concept TakesFraction = requires(T t) { t.setValue(2.5); };

// The public surface each class gets from its shape.
static_assert(!TypeSettable<CheckStrip> && !TypeSettable<hbA1C> && !TypeSettable<Alcohol> &&
              !TypeSettable<InsulinInjection> && !TypeSettable<OralMeds> &&
              !TypeSettable<CalCode> && !TypeSettable<Error>);
static_assert(TypeSettable<Glucose> && TypeSettable<Food> && TypeSettable<Exercise> &&
              TypeSettable<ketones> && TypeSettable<LastVisits>);
static_assert(HasMealSlot<Food> && HasMealSlot<Alcohol> && HasMealSlot<CalCode> &&
              HasMealSlot<Error> && !HasSlot<Food> && HasSlot<Glucose> && !HasMealSlot<Glucose>);
static_assert(!HasValue<Exercise> && HasValue<HealthNotes>);
// Whole-number values are never silently truncated from a fraction.
static_assert(!TakesFraction<Food> && !TakesFraction<microalbumin> && TakesFraction<BodyDimensions>);

}  // namespace

TEST(ResultRecords, DefaultsAndFixedTypes) {
    Glucose g;
    EXPECT_EQ(g.ValueInMeterRange(), 3);
    ASSERT_NE(g.Comments(), nullptr);
    EXPECT_EQ(g.Comments()->Count(), 0);
    EXPECT_EQ(g.GroupId(), 0);
    EXPECT_EQ(g.ResultType(), 0);
    EXPECT_EQ(CheckStrip().ValueInMeterRange(), 3);
    EXPECT_EQ(Cholestrol().ValueInMeterRange(), 0);
    EXPECT_EQ(HealthNotes().Value(), 1);

    std::pair<ResultPtr, std::int32_t> fixed[] = {
        {std::make_shared<CheckStrip>(), 20}, {std::make_shared<hbA1C>(), 80},
        {std::make_shared<Alcohol>(), 54},    {std::make_shared<InsulinInjection>(), 30},
        {std::make_shared<OralMeds>(), 70},   {std::make_shared<CalCode>(), 2},
        {std::make_shared<Error>(), 0}};
    for (auto& [r, type] : fixed) {
        auto& base = static_cast<Result&>(*r);
        EXPECT_EQ(base.ResultType(), type) << base.className();
    }
    EXPECT_STREQ(std::make_shared<Error>()->className(), "Error");
    EXPECT_EQ(std::make_shared<ketones>()->kind(), ResultKind::ketones);
}

TEST(ResultRecords, GlucoseCommentListsAreRecreatedWhenCleared) {
    Glucose g;
    auto first = g.Comments();
    EXPECT_EQ(g.Comments(), first);
    g.setComments(nullptr);
    ASSERT_NE(g.Comments(), nullptr);
    EXPECT_NE(g.Comments(), first);
    auto events = g.events();
    ASSERT_NE(events, nullptr);
    events->Add(5, 1, 0);
    EXPECT_EQ(g.events()->Count(), 1);
    EXPECT_EQ(g.Comments()->Count(), 0);
}

TEST(CommentsCollection, OneCommentPerCodeAndKeys) {
    CommentsCollection c;
    auto first = c.Add(11, 1, 1);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(c.Add(11, 7, 1, "again", true, "other"), nullptr);
    EXPECT_EQ(c.Count(), 1);
    EXPECT_EQ(first->Value(), 1);
    EXPECT_EQ(c.Item("11"), first);

    auto labelled = c.Add(14, 2, 0, "hypo", true, "Hypo");
    ASSERT_NE(labelled, nullptr);
    EXPECT_EQ(labelled->Label(), "hypo");
    EXPECT_TRUE(labelled->Editable());
    EXPECT_EQ(c.Item("hypo"), labelled);  // keys ignore case
    EXPECT_EQ(c.Item("14"), nullptr);
    EXPECT_EQ(c.Item(2), labelled);
    EXPECT_EQ(c.Item(0), nullptr);
    EXPECT_EQ(c.Item(3), nullptr);
    EXPECT_EQ(c.Item("nope"), nullptr);

    std::vector<std::int32_t> ids;
    for (const auto& comment : c) ids.push_back(comment->Id());
    EXPECT_EQ(ids, (std::vector<std::int32_t>{11, 14}));

    c.Remove("11");
    EXPECT_EQ(c.Item(1), labelled);
    c.Remove(1);
    EXPECT_EQ(c.Count(), 0);
    EXPECT_THROW(c.Remove(1), ComponentError);
}

TEST(CommentsCollection, KeyTakenByAnotherCodeRaisesThroughAdd) {
    errPropagator().reset();
    CommentsCollection c;
    c.Add(3, 1, 1, "", false, "k");
    try {
        c.Add(4, 1, 1, "", false, "K");
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "Add --> ");
    }
    EXPECT_EQ(c.Count(), 1);
}

TEST(ResultCollection, OneBasedAndInOrder) {
    ResultCollection results;
    auto food = std::make_shared<Food>();
    EXPECT_EQ(results.Add(food), food);
    results.Add(std::make_shared<Alcohol>());
    results.Add(std::make_shared<Glucose>());
    EXPECT_EQ(results.Count(), 3);
    EXPECT_EQ(results.Item(0), nullptr);
    EXPECT_EQ(results.Item(4), nullptr);
    EXPECT_EQ(results.Item(1), food);
    EXPECT_EQ(results.Item(3)->kind(), ResultKind::Glucose);
    std::vector<ResultKind> kinds;
    for (const auto& r : results) kinds.push_back(r->kind());
    EXPECT_EQ(kinds, (std::vector<ResultKind>{ResultKind::Food, ResultKind::Alcohol, ResultKind::Glucose}));
    EXPECT_THROW(results.Add(nullptr), ComponentError);
    EXPECT_EQ(results.Count(), 3);
}
