#include <gtest/gtest.h>

#include <cmath>
#include <map>
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

TEST(ErrorDescription, EveryListedCodeHasItsTextAndNoOtherCodeHasOne) {
    const std::map<long long, const char*> texts = {
        {0, "Operation completed successfully"},
        {-1, "Checksum error"},
        {-2, "Timeout error"},
        {-3, "Communication error"},
        {-4, "Datalog comparison failure"},
        {-6, "Datalog empty return code"},
        {-7, "Memory allocation failure"},
        {-8, "Different device detected"},
        {-9, "Data failed validation"},
        {-11, "Function is not supported"},
        {-13, "No device found"},
        {-14, "Meter is in Reset Meter mode"},
        {-15, "No serial ports found on the system"},
        {-17, "Operation failed"},
        {-18, "Serial port has not been opened yet"},
        {-19, "Bad parameter passed to the function"},
        {-20, "General overflow error"},
        {-21, "No data received from serial port"},
        {-22, "Different device detected"},
        {-23, "ESC was used to break out of delay"},
        {-25, "Unsupported ports"},
        {-26, "Bad device information"},
        {-27, "CLSIDFromProgID failed"},
        {-28, "CoCreateInstance failed"},
        {-29, "DispEventAdvise failed"},
        {-30, "DispEventUnadvise failed"},
        {-31, "Partial success"},
        {-32, "Fatal error"},
        {-33, "Invalid XML"},
        {-34, "Invalid registry entries"},
        {-35, "Bad Device Block"},
        {-36, "Invalid Handle of Port"},
    };
    // -10 (clock error) and -16 (unknown) have no text of their own.
    for (long long code = -40; code <= 2; ++code) {
        auto it = texts.find(code);
        EXPECT_EQ(ErrorDescription(code), it != texts.end() ? it->second : "Unknown status") << code;
    }
    // Wider values must not wrap onto a listed 16-bit code (65536 - 17 would be -17).
    for (long long code : {32767LL, -32768LL, 65536LL - 17, 0x100000000LL})
        EXPECT_EQ(ErrorDescription(code), "Unknown status") << code;
}
