#include "requests/document_values.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cmath>

namespace varnel::detail {

std::string NumberText(double v) {
    if (v == 0) return "0";  // also for -0
    std::array<char, 400> buf{};
    if (!std::isfinite(v)) {
        auto end = std::to_chars(buf.data(), buf.data() + buf.size(), v).ptr;
        return std::string(buf.data(), end);
    }
    // Whole numbers, most readings among them, print as integers, exactly as below.
    if (std::fabs(v) < 1e15 && v == std::trunc(v)) return std::to_string(static_cast<long long>(v));
    int decimals = std::max(0, 14 - static_cast<int>(std::floor(std::log10(std::fabs(v)))));
    char* end = std::to_chars(buf.data(), buf.data() + buf.size(), v, std::chars_format::fixed, decimals).ptr;
    // Trailing zeros go before the text is made, so a short number never takes the heap.
    if (decimals > 0) {
        while (end[-1] == '0') --end;
        if (end[-1] == '.') --end;
    }
    return std::string(buf.data(), end);
}

namespace {

// `value` as decimal text into `out` (at least 21 bytes), at least `digits` digits; returns the end.
char* decimal(char* out, long long value, int digits) {
    if (digits == 2 && value >= 0 && value < 10) *out++ = '0';
    return std::to_chars(out, out + 21, value).ptr;
}

}  // namespace

std::string TwoDigits(long long value) {
    char buf[24];
    return std::string(buf, decimal(buf, value, 2));
}

DateAttributes::DateAttributes(const DateTime& t, bool withTime) {
    // The calendar date once, not once for each of its three parts.
    const std::int32_t dayNumber = t.dayNumber();
    const std::chrono::year_month_day date{std::chrono::sys_days{std::chrono::year{1899} / 12 / 30} +
                                           std::chrono::days{dayNumber}};
    const std::int64_t time = t.seconds() - std::int64_t(dayNumber) * 86400;
    const struct {
        const char* name;
        long long value;
        int digits;
    } parts[] = {{"D", unsigned(date.day()), 1},  {"MM", unsigned(date.month()), 2}, {"Y", int(date.year()), 1},
                 {"h", time / 3600, 1},           {"m", time / 60 % 60, 1},          {"s", time % 60, 1}};
    count_ = withTime ? 6 : 3;
    for (std::size_t i = 0; i < count_; ++i) {
        items_[i].name = parts[i].name;
        *decimal(items_[i].text, parts[i].value, parts[i].digits) = '\0';
    }
}

}  // namespace varnel::detail
