// Numbers and dates as every document writes them.
#include <gtest/gtest.h>

#include <string>

#include "requests/document_values.h"

namespace varnel::detail {
namespace {

TEST(DocumentValues, RealNumbersAndDatesBeforeDayZero) {
    const std::pair<double, const char*> numbers[] = {
        {123.0, "123"},
        {-5.0, "-5"},
        {0.5, "0.5"},
        {-0.0, "0"},
        {123456789012345.0, "123456789012345"},
        {1e15, "1000000000000000"},
        {1.0 / 3, "0.333333333333333"},
    };
    for (auto [value, text] : numbers) EXPECT_EQ(NumberText(value), text) << value;

    // Before day 0 (30 December 1899) the day still starts at midnight; without the time, the date alone.
    for (bool withTime : {true, false}) {
        std::string text;
        for (const auto& [name, value] : dateAttributes(*DateTime::fromParts(1899, 1, 9, 18, 4, 0), withTime))
            text += std::string(name) + "=" + value + " ";
        EXPECT_EQ(text, withTime ? "D=9 MM=01 Y=1899 h=18 m=4 s=0 " : "D=9 MM=01 Y=1899 ");
    }
}

}  // namespace
}  // namespace varnel::detail
