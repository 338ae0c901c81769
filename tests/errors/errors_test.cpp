#include <gtest/gtest.h>

#include <cmath>
#include <set>
#include <stdexcept>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::detail;

TEST(ErrPropagator, TraceGrowsOutermostFirstAndCleanupSeesIt) {
    std::string seen;
    const std::string trace = test::unexpectedTrace([&] {
        guarded("A", "outer", [&] {
            guarded(
                "B", "mid", [] { guarded("C", "inner", [] { throw std::out_of_range("x"); }); },
                [&](const IError& e) { seen = e.ErrorTrace; });
        });
    });
    EXPECT_EQ(trace, std::to_string(errc::subscript_out_of_range) + " outer --> mid --> inner --> ");
    EXPECT_EQ(seen, "mid --> inner --> ");
    // The shared error holds the latest routine and the inner trace as its description.
    const IError& e = errPropagator().error();
    EXPECT_EQ(e.ErrorDesc + "|" + e.FunctionName, "mid --> inner --> |outer");

    // Started afresh, the next trace does not carry this one.
    EXPECT_EQ(test::unexpectedTrace([] { guarded("X", "getReadings", [] { raise(errc::missing_object, "boom"); }); }),
              std::to_string(errc::missing_object) + " getReadings --> ");
}

TEST(Rounding, HalvesToEvenAndOverflowRaises) {
    for (auto [value, rounded] : {std::pair{12.5, 12}, {13.5, 14}, {-2.5, -2}, {32767.4, 32767}, {-32768.5, -32768}})
        EXPECT_EQ(roundToInt16(value), rounded) << value;
    EXPECT_EQ(roundToInt32(2147483647.4), 2147483647);
    const std::string overflow = std::to_string(errc::overflow) + " Overflow";
    for (auto raises : {+[] { roundToInt16(32767.5); }, +[] { roundToInt16(NAN); }, +[] { toInt16(-32769); },
                        +[] { toInt16(40000); }, +[] { roundToInt32(2147483647.5); }})
        EXPECT_EQ(test::unexpectedTrace(raises), overflow);
}

// The texts themselves are pinned where requests report them; here, what has none.
TEST(ErrorDescription, CodesWithoutATextAreUnknownStatus) {
    EXPECT_EQ(ErrorDescription(-2), "Timeout error");
    EXPECT_EQ(ErrorDescription(-22), "Different device detected");  // two codes share a text
    // -10 (clock error) and -16 (unknown) have none of their own, nor have codes off the list; wider
    // values must not wrap onto a listed 16-bit code (65536 - 17 would be -17).
    for (long long code :
         {-40LL, -37LL, -24LL, -16LL, -12LL, -10LL, -5LL, 1LL, 2LL, 32767LL, -32768LL, 65536LL - 17, 0x100000000LL})
        EXPECT_EQ(ErrorDescription(code), "Unknown status") << code;
}

// Every other code from 0 to -36 has a text of its own.
TEST(ErrorDescription, EveryOtherCodeOfTheEnumHasItsText) {
    const std::set<long long> none{-5, -10, -12, -16, -24};
    for (long long code = -36; code <= 0; ++code)
        EXPECT_TRUE(none.contains(code) || ErrorDescription(code) != "Unknown status") << code;
}
