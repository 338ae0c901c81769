#include <gtest/gtest.h>

#include <utility>

#include "component/error_description.h"

using varnel::detail::ErrorDescription;

TEST(ErrorDescription, EveryListedCodeHasItsText) {
    const std::pair<int, const char*> expected[] = {
        {0, "Operation completed successfully"}, {-1, "Checksum error"},
        {-2, "Timeout error"}, {-3, "Communication error"},
        {-4, "Datalog comparison failure"}, {-6, "Datalog empty return code"},
        {-7, "Memory allocation failure"}, {-8, "Different device detected"},
        {-9, "Data failed validation"}, {-11, "Function is not supported"},
        {-13, "No device found"}, {-14, "Meter is in Reset Meter mode"},
        {-15, "No serial ports found on the system"}, {-17, "Operation failed"},
        {-18, "Serial port has not been opened yet"}, {-19, "Bad parameter passed to the function"},
        {-20, "General overflow error"}, {-21, "No data received from serial port"},
        {-22, "Different device detected"}, {-23, "ESC was used to break out of delay"},
        {-25, "Unsupported ports"}, {-26, "Bad device information"},
        {-27, "CLSIDFromProgID failed"}, {-28, "CoCreateInstance failed"},
        {-29, "DispEventAdvise failed"}, {-30, "DispEventUnadvise failed"},
        {-31, "Partial success"}, {-32, "Fatal error"}, {-33, "Invalid XML"},
        {-34, "Invalid registry entries"}, {-35, "Bad Device Block"},
        {-36, "Invalid Handle of Port"},
    };
    for (const auto& [code, text] : expected) EXPECT_EQ(ErrorDescription(code), text) << code;
    EXPECT_EQ(ErrorDescription(-8), ErrorDescription(-22));
}

TEST(ErrorDescription, UnlistedCodesAreUnknownWithoutTruncation) {
    for (long long code : {-10LL, -16LL, 5LL, -5LL, -12LL, -24LL, -37LL, 32767LL, -32768LL})
        EXPECT_EQ(ErrorDescription(code), "Unknown status") << code;
    // Wider values must not wrap onto a listed 16-bit code (65536 - 17 would be -17).
    EXPECT_EQ(ErrorDescription(65536 - 17), "Unknown status");
    EXPECT_EQ(ErrorDescription(0x100000000LL), "Unknown status");
}
