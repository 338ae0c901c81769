#include <gtest/gtest.h>

#include "component/err_propagator.h"
#include "readings/results.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

template <class T>
concept TypeSettable = requires(T t) { t.setResultType(1); };
template <class T>
concept HasMealSlot = requires(T t) { t.setMealSlot(1); };
template <class T>
concept HasValue = requires(T t) { t.Value(); };
template <class T>
concept TakesFraction = requires(T t) { t.setValue(2.5); };

// The surface each class gets from its shape; whole-number values never take a fraction.
static_assert(!TypeSettable<CheckStrip> && !TypeSettable<Alcohol> && !TypeSettable<OralMeds> &&
              !TypeSettable<Error> && TypeSettable<Glucose> && TypeSettable<Exercise>);
static_assert(HasMealSlot<Food> && HasMealSlot<CalCode> && !HasMealSlot<Glucose>);
static_assert(!TakesFraction<Food> && !TakesFraction<microalbumin> && TakesFraction<BodyDimensions>);
static_assert(!HasValue<Exercise> && HasValue<HealthNotes>);

}  // namespace

TEST(ResultRecords, DefaultsAndFixedTypes) {
    Glucose g;
    EXPECT_EQ(g.ValueInMeterRange(), 3);
    EXPECT_EQ(g.GroupId(), 0);
    ASSERT_NE(g.Comments(), nullptr);
    EXPECT_EQ(g.Comments()->Count(), 0);
    g.setComments(nullptr);
    ASSERT_NE(g.Comments(), nullptr);
    ASSERT_NE(g.events(), nullptr);
    EXPECT_EQ(CheckStrip().ValueInMeterRange(), 3);
    EXPECT_EQ(Cholestrol().ValueInMeterRange(), 0);
    EXPECT_EQ(HealthNotes().Value(), 1);
    std::pair<std::shared_ptr<Result>, std::int32_t> fixed[] = {
        {std::make_shared<CheckStrip>(), 20}, {std::make_shared<hbA1C>(), 80},
        {std::make_shared<Alcohol>(), 54},    {std::make_shared<InsulinInjection>(), 30},
        {std::make_shared<OralMeds>(), 70},   {std::make_shared<CalCode>(), 2},
        {std::make_shared<Error>(), 0}};
    for (auto& [r, type] : fixed) EXPECT_EQ(r->ResultType(), type) << r->className();
}

TEST(CommentsCollection, OneCommentPerCodeAndKeys) {
    errPropagator().reset();
    CommentsCollection c;
    auto first = c.Add(11, 1, 1);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(c.Add(11, 7, 1, "again", true, "other"), nullptr);
    EXPECT_EQ(c.Item("11"), first);
    auto labelled = c.Add(14, 2, 0, "hypo", true, "Hypo");
    EXPECT_EQ(c.Item("hypo"), labelled);  // keys ignore case
    EXPECT_EQ(c.Item("14"), nullptr);
    EXPECT_EQ(c.Item(2), labelled);
    EXPECT_EQ(c.Item(0), nullptr);
    EXPECT_EQ(c.Item(3), nullptr);
    try {
        c.Add(15, 1, 1, "", false, "HYPO");
        FAIL() << "a key taken by another code was accepted";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "Add --> ");
    }
    c.Remove("11");
    EXPECT_EQ(c.Item(1), labelled);
    EXPECT_EQ(c.Count(), 1);
    EXPECT_THROW(c.Remove(2), ComponentError);
}

TEST(ResultCollection, OneBasedAndInOrder) {
    ResultCollection results;
    auto food = std::make_shared<Food>();
    EXPECT_EQ(results.Add(food), food);
    results.Add(std::make_shared<Alcohol>());
    EXPECT_EQ(results.Item(0), nullptr);
    EXPECT_EQ(results.Item(3), nullptr);
    EXPECT_EQ(results.Item(1), food);
    EXPECT_EQ(results.Item(2)->kind(), ResultKind::Alcohol);
    EXPECT_THROW(results.Add(nullptr), ComponentError);
    EXPECT_EQ(results.Count(), 2);
}
