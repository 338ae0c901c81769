#include <gtest/gtest.h>

#include <cmath>
#include <stdexcept>

#include "component/err_propagator.h"

using namespace varnel;
using namespace varnel::detail;

namespace {

// The number and trace of the error a routine raised.
template <class F>
std::string failure(F&& routine) {
    try {
        routine();
    } catch (const ComponentError& e) {
        return std::to_string(e.number()) + " " + e.description();
    }
    return "no error";
}

}  // namespace

TEST(ErrPropagator, TraceGrowsOutermostFirstAndCleanupSeesIt) {
    errPropagator().reset();
    std::string seen;
    const std::string trace = failure([&] {
        guarded("A", "outer", [&] {
            guarded("B", "mid", [] { guarded("C", "inner", [] { throw std::out_of_range("x"); }); },
                    [&](const IError& e) { seen = e.ErrorTrace; });
        });
    });
    EXPECT_EQ(trace, std::to_string(errc::subscript_out_of_range) + " outer --> mid --> inner --> ");
    EXPECT_EQ(seen, "mid --> inner --> ");
    // The shared error holds the latest routine, with the inner trace as its description.
    const IError& e = errPropagator().error();
    EXPECT_EQ(e.ErrorDesc, "mid --> inner --> ");
    EXPECT_EQ(e.FunctionName, "outer");
    EXPECT_TRUE(e.ClassName.empty());

    // Without a reset the next request's trace would carry this one.
    errPropagator().reset();
    EXPECT_EQ(failure([] { guarded("X", "getReadings", [] { raise(errc::missing_object, "boom"); }); }),
              std::to_string(errc::missing_object) + " getReadings --> ");
}

TEST(Rounding, HalvesToEvenAndOverflowRaises) {
    for (auto [value, rounded] : {std::pair{12.5, 12}, {13.5, 14}, {-2.5, -2}, {32767.4, 32767}, {-32768.5, -32768}})
        EXPECT_EQ(roundToInt16(value), rounded) << value;
    EXPECT_EQ(roundToInt32(2147483647.4), 2147483647);
    const std::string overflow = std::to_string(errc::overflow) + " Overflow";
    for (auto raises : {+[] { roundToInt16(32767.5); }, +[] { roundToInt16(NAN); }, +[] { toInt16(-32769); },
                        +[] { toInt16(40000); }, +[] { roundToInt32(2147483647.5); }})
        EXPECT_EQ(failure(raises), overflow);
}
