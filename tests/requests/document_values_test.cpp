// Numbers and dates as every document writes them.
#include <gtest/gtest.h>

#include <string>

#include "requests/document_values.h"

namespace varnel::detail {
namespace {

TEST(DocumentValues, RealNumbersWholeOrNot) {
    const std::pair<double, const char*> cases[] = {
        {123.0, "123"}, {-5.0, "-5"}, {0.5, "0.5"}, {-0.0, "0"}, {123456789012345.0, "123456789012345"},
        {1e15, "1000000000000000"}, {1.0 / 3, "0.333333333333333"},
    };
    for (auto [value, text] : cases) EXPECT_EQ(NumberText(value), text) << value;
}

TEST(DocumentValues, DateAttributesFromTheCalendar) {
    struct Case {
        int y, mo, d, h, mi, s;
        bool withTime;
        const char* text;
    };
    const Case cases[] = {
        {2008, 1, 5, 7, 4, 9, true, "D=5 MM=01 Y=2008 h=7 m=4 s=9"},
        {2000, 2, 29, 0, 0, 0, false, "D=29 MM=02 Y=2000"},
        // Before day 0 (30 December 1899) the day still starts at midnight.
        {1899, 12, 29, 18, 30, 0, true, "D=29 MM=12 Y=1899 h=18 m=30 s=0"},
    };
    for (const Case& c : cases) {
        std::string text;
        for (const auto& [name, value] : dateAttributes(*DateTime::fromParts(c.y, c.mo, c.d, c.h, c.mi, c.s), c.withTime))
            text += (text.empty() ? "" : " ") + std::string(name) + "=" + value;
        EXPECT_EQ(text, c.text);
    }
}

}  // namespace
}  // namespace varnel::detail
