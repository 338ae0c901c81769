#include <gtest/gtest.h>

#include "component/err_propagator.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

struct ErrPropagatorTest : ::testing::Test {
    void SetUp() override { errPropagator().reset(); }
};

void innermost() { raise(errc::missing_object, "Object variable not set"); }
void middle() { guarded("MeterDll", "findmeter", [] { innermost(); }); }

}  // namespace

TEST_F(ErrPropagatorTest, TraceGrowsOutermostFirstAndKeepsNumber) {
    try {
        guarded("DllWrapper", "discoverDevice", [] { middle(); });
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "discoverDevice --> findmeter --> ");
    }
    const IError& e = errPropagator().error();
    EXPECT_EQ(e.ErrorDesc, "findmeter --> ");
    EXPECT_EQ(e.FunctionName, "discoverDevice");
    EXPECT_TRUE(e.ClassName.empty());
}

TEST_F(ErrPropagatorTest, ThreeLevelsAndCleanupSeesTheError) {
    std::string seen;
    try {
        guarded("A", "outer", [] {
            guarded("B", "mid", [] { guarded("C", "inner", [] { throw std::out_of_range("x"); }); });
        }, [&](const IError& e) { seen = e.ErrorTrace; });
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::subscript_out_of_range);
        EXPECT_EQ(e.description(), "outer --> mid --> inner --> ");
    }
    EXPECT_EQ(seen, "outer --> mid --> inner --> ");
}

TEST_F(ErrPropagatorTest, ResetStartsTheTraceAfresh) {
    auto fail = [](const char* routine) {
        try {
            guarded("X", routine, [] { raise(5, "boom"); });
        } catch (const ComponentError&) {
        }
    };
    fail("discoverDevice");
    fail("getReadings");
    EXPECT_EQ(errPropagator().error().ErrorTrace, "getReadings --> discoverDevice --> ");
    errPropagator().reset();
    fail("getReadings");
    EXPECT_EQ(errPropagator().error().ErrorTrace, "getReadings --> ");
}

TEST(Rounding, HalvesToEvenAndOverflowRaises) {
    EXPECT_EQ(roundToInt16(12.5), 12);
    EXPECT_EQ(roundToInt16(13.5), 14);
    EXPECT_EQ(roundToInt16(-2.5), -2);
    EXPECT_EQ(roundToInt16(32767.4), 32767);
    EXPECT_THROW(roundToInt16(32767.5), ComponentError);
    EXPECT_THROW(toInt16(-32769), ComponentError);
    try {
        toInt16(40000);
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::overflow);
    }
}
