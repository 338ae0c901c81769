#include <gtest/gtest.h>

#include "errors/err_propagator.h"
#include "readings/results.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

template <class T>
concept TakesFraction = requires(T t) {
    t.setValue(2.5);
};

// Whole-number values never take a fraction: it would be cut silently.
static_assert(!TakesFraction<Food> && !TakesFraction<microalbumin> && TakesFraction<BodyDimensions>);

}  // namespace

TEST(CommentsCollection, OneCommentPerCodeAndKeysIgnoringCase) {
    errPropagator().reset();
    CommentsCollection c;
    auto first = c.Add(11, 1);
    ASSERT_NE(first, nullptr);
    EXPECT_EQ(c.Add(11, 7, "other"), nullptr);
    auto labelled = c.Add(14, 2, "Hypo");
    EXPECT_EQ(c.Item("hypo"), labelled);
    EXPECT_EQ(c.Item("14"), nullptr);
    EXPECT_EQ((std::vector{c.Item(0), c.Item(2), c.Item(3)}), (std::vector<CommentPtr>{nullptr, labelled, nullptr}));
    try {
        c.Add(15, 1, "HYPO");
        FAIL() << "a key taken by another code was accepted";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.description(), "Add --> ");
    }
    c.Remove("11");
    EXPECT_EQ(std::tuple(c.Item(1), c.Count()), std::tuple(labelled, 1));
    EXPECT_THROW(c.Remove(2), ComponentError);
}

