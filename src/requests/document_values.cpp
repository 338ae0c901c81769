#include "requests/document_values.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <cstdio>

namespace varnel::detail {

std::string NumberText(double v) {
    if (v == 0) return "0";  // also for -0
    std::array<char, 400> buf{};
    if (!std::isfinite(v)) {
        auto end = std::to_chars(buf.data(), buf.data() + buf.size(), v).ptr;
        return std::string(buf.data(), end);
    }
    int decimals = std::max(0, 14 - static_cast<int>(std::floor(std::log10(std::fabs(v)))));
    auto end = std::to_chars(buf.data(), buf.data() + buf.size(), v, std::chars_format::fixed, decimals).ptr;
    std::string text(buf.data(), end);
    if (text.find('.') != std::string::npos) {
        text.erase(text.find_last_not_of('0') + 1);
        if (text.back() == '.') text.pop_back();
    }
    return text;
}

std::string TwoDigits(long long value) {
    char buf[32];
    const int n = std::snprintf(buf, sizeof buf, "%02lld", value);
    return std::string(buf, static_cast<std::size_t>(n));
}

std::vector<std::pair<const char*, std::string>> dateAttributes(const DateTime& t, bool withTime) {
    std::vector<std::pair<const char*, std::string>> out{
        {"D", NumberText(t.day())}, {"MM", TwoDigits(t.month())}, {"Y", NumberText(t.year())}};
    if (withTime) {
        out.emplace_back("h", NumberText(t.hour()));
        out.emplace_back("m", NumberText(t.minute()));
        out.emplace_back("s", NumberText(t.second()));
    }
    return out;
}

}  // namespace varnel::detail
