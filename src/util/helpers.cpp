#include "util/helpers.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <limits>
#include <optional>

#include "util/codepage.h"
#include "varnel/records.h"

namespace varnel::detail {

namespace {

constexpr std::string_view kBlanks = " \t\n\v\f\r";

std::string_view trim(std::string_view s) {
    std::size_t first = s.find_first_not_of(kBlanks);
    if (first == std::string_view::npos) return {};
    return s.substr(first, s.find_last_not_of(kBlanks) - first + 1);
}

bool isDigit(char c) { return c >= '0' && c <= '9'; }

// Sign, digits with at most one point (at least one digit), optional exponent with digits.
bool hasNumberSyntax(std::string_view s) {
    std::size_t i = 0, n = s.size();
    if (i < n && (s[i] == '+' || s[i] == '-')) ++i;
    std::size_t digits = 0;
    while (i < n && isDigit(s[i])) ++i, ++digits;
    if (i < n && s[i] == '.') {
        ++i;
        while (i < n && isDigit(s[i])) ++i, ++digits;
    }
    if (digits == 0) return false;
    if (i < n && (s[i] == 'e' || s[i] == 'E')) {
        ++i;
        if (i < n && (s[i] == '+' || s[i] == '-')) ++i;
        std::size_t expDigits = 0;
        while (i < n && isDigit(s[i])) ++i, ++expDigits;
        if (expDigits == 0) return false;
    }
    return i == n;
}

// Out-of-range values (too large or too small for a double) are not numbers:
// reading them as a rounded value would silently store something else.
std::optional<double> parseNumber(std::string_view text) {
    std::string_view s = trim(text);
    if (!hasNumberSyntax(s)) return std::nullopt;
    if (s.front() == '+') s.remove_prefix(1);  // from_chars takes '-' only
    double value = 0;
    auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), value);
    if (ec != std::errc() || end != s.data() + s.size()) return std::nullopt;
    return value;
}

// Sign, then digits with at most one point among them (at least one digit).
bool hasDocumentNumberSyntax(std::string_view s) {
    std::size_t i = 0, digits = 0, points = 0;
    if (!s.empty() && (s[0] == '+' || s[0] == '-')) ++i;
    for (; i < s.size(); ++i) {
        if (isDigit(s[i]))
            ++digits;
        else if (s[i] != '.' || ++points > 1)
            return false;
    }
    return digits > 0;
}

// Value of an all-digit text, capped so that long runs of digits cannot overflow.
long long digitsValue(std::string_view s) {
    long long v = 0;
    for (char c : s) v = std::min(v * 10 + (c - '0'), 1'000'000'000LL);
    return v;
}

bool allDigits(std::string_view s) { return !s.empty() && std::all_of(s.begin(), s.end(), isDigit); }

constexpr std::array<std::string_view, 12> kMonthNames = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                                          "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};

// 1-12 for a month abbreviation (case and blanks ignored), 0 otherwise.
int monthByName(std::string_view s) {
    s = trim(s);
    for (std::size_t i = 0; i < kMonthNames.size(); ++i)
        if (EqualsNoCase(s, kMonthNames[i])) return int(i) + 1;
    return 0;
}

// A date text split at the separator, its parts named by the pattern.
struct DateLayout {
    std::optional<std::string_view> year, month, day;
    std::size_t monthPatternLength = 0;
};

bool splitThree(std::string_view s, char sep, std::array<std::string_view, 3>& parts) {
    for (std::size_t k = 0; k < 2; ++k) {
        std::size_t at = s.find(sep);
        if (at == std::string_view::npos) return false;
        parts[k] = s.substr(0, at);
        s.remove_prefix(at + 1);
    }
    parts[2] = s;
    return s.find(sep) == std::string_view::npos;
}

std::optional<DateLayout> layoutOf(std::string_view text, std::string_view separator, std::string_view pattern) {
    char sep = DateSeparator(separator);
    std::array<std::string_view, 3> textParts, patternParts;
    if (!splitThree(text, sep, textParts) || !splitThree(pattern, sep, patternParts)) return std::nullopt;
    DateLayout layout;
    for (std::size_t i = 0; i < 3; ++i) {
        std::string_view p = trim(patternParts[i]);
        if (p.empty()) continue;
        switch (LowerAscii(p.front())) {
        case 'y':
            if (!layout.year) layout.year = textParts[i];
            break;
        case 'm':
            if (!layout.month) layout.month = textParts[i], layout.monthPatternLength = p.size();
            break;
        case 'd':
            if (!layout.day) layout.day = textParts[i];
            break;
        }
    }
    return layout;
}

struct MinMaxDates {
    int firstType, lastType;
    std::int32_t minDate, maxDate;
};

// Clock ranges by meter type, in serial days.
constexpr MinMaxDates kClockRanges[] = {
    {1, 1, 32874, 42004},  // 1 Jan 1990 - 31 Dec 2014
    {2, 3, 33604, 44926},  // 1 Jan 1992 - 31 Dec 2022
    {4, 4, 35431, 42369},  // 1 Jan 1997 - 31 Dec 2015
    {5, 5, 35065, 46387},  // 1 Jan 1996 - 31 Dec 2026
    {6, 8, 36526, 44196},  // 1 Jan 2000 - 31 Dec 2020
};

thread_local bool continueFlag = true;

}  // namespace

std::string Trim(std::string_view text) { return std::string(trim(text)); }

char LowerAscii(char c) { return (c >= 'A' && c <= 'Z') ? char(c - 'A' + 'a') : c; }

std::string LowerCase(std::string_view text) {
    std::string s(text);
    std::transform(s.begin(), s.end(), s.begin(), LowerAscii);
    return s;
}

bool EqualsNoCase(std::string_view a, std::string_view b) {
    return a.size() == b.size() &&
           std::equal(a.begin(), a.end(), b.begin(), [](char x, char y) { return LowerAscii(x) == LowerAscii(y); });
}

std::string Abbreviated(std::string_view text) {
    constexpr std::size_t kShown = 40;
    std::size_t characters = 0;
    for (std::size_t i = 0; i < text.size(); ++i) {
        // A character starts at any byte that does not continue the one before.
        if ((static_cast<unsigned char>(text[i]) & 0xC0) != 0x80 && characters++ == kShown)
            return std::string(text.substr(0, i)) + "...";
    }
    return std::string(text);
}

bool IsNumeric(std::string_view text) { return parseNumber(text).has_value(); }

double ToNumber(std::string_view text) { return parseNumber(text).value_or(0.0); }

std::optional<double> DocumentNumber(std::string_view text) {
    if (!hasDocumentNumberSyntax(text)) return std::nullopt;
    std::string_view s = text;
    if (s.front() == '+') s.remove_prefix(1);  // from_chars takes '-' only
    double value = 0;
    const auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), value);
    if (ec == std::errc::result_out_of_range) {
        // Too small for a double is as good as 0 to every reader; too large is no value at all.
        const std::string_view whole = s.substr(0, s.find('.'));
        if (whole.find_first_of("123456789") != std::string_view::npos) return std::nullopt;
        return 0.0;
    }
    if (ec != std::errc() || end != s.data() + s.size()) return std::nullopt;
    return value;
}

std::optional<std::int16_t> DocumentInt16(std::string_view text) {
    const std::optional<double> value = DocumentNumber(text);
    return value ? Int16Value(*value) : std::nullopt;
}

std::optional<std::int16_t> Int16Value(double value) {
    if (!std::isfinite(value)) return std::nullopt;
    const double r = std::nearbyint(value);
    if (r < std::numeric_limits<std::int16_t>::min() || r > std::numeric_limits<std::int16_t>::max())
        return std::nullopt;
    return static_cast<std::int16_t>(r);
}

std::string BytesToText(std::span<const std::uint8_t> bytes, int count) {
    std::size_t n = count > 0 ? std::min(bytes.size(), std::size_t(count)) : 0;
    auto first = bytes.begin();
    auto last = std::find(first, first + std::ptrdiff_t(n), std::uint8_t(0));
    return DecodeMeterText(std::span<const std::uint8_t>(first, last));
}

bool TextToBytes(std::span<std::uint8_t> bytes, std::string_view text) {
    const std::optional<std::string> meterBytes = EncodeMeterText(text);
    if (!meterBytes) return false;
    if (bytes.empty()) return true;
    // One byte per character, so the cut never falls inside one. The last byte
    // is never written: the names these arrays hold are one shorter than the
    // array less its zero. A one-byte array still gets its zero.
    std::size_t n = std::min(meterBytes->size(), bytes.size() >= 2 ? bytes.size() - 2 : 0);
    std::copy_n(meterBytes->begin(), n, bytes.begin());
    bytes[n] = 0;
    return true;
}

DateTime ToDateTime(const DateTime& date, const DateTime& time) {
    return date.datePart().addSeconds(time.seconds() - time.datePart().seconds());
}

bool IsValidDate(std::string_view text, std::string_view separator, std::string_view pattern) {
    if (trim(text).empty()) return true;
    std::string_view trimmedSep = trim(separator);
    bool twoSeparators = (!trimmedSep.empty() && CountOccurrences(text, trimmedSep) == 2) ||
                         (!separator.empty() && CountOccurrences(text, separator) == 2);
    return twoSeparators && IsValidMonth(text, separator, pattern) && IsValidYear(text, separator, pattern) &&
           IsValidDay(text, separator, pattern);
}

char DateSeparator(std::string_view separator) {
    std::string_view s = trim(separator);
    return (s == "/" || s == "-" || s == ".") ? s.front() : '/';
}

std::size_t CountOccurrences(std::string_view s, std::string_view sub) {
    if (sub.empty()) return 0;
    std::size_t count = 0;
    for (std::size_t at = s.find(sub); at != std::string_view::npos; at = s.find(sub, at + sub.size())) ++count;
    return count;
}

std::string DigitsOnly(std::string_view s) {
    std::string digits;
    std::copy_if(s.begin(), s.end(), std::back_inserter(digits), isDigit);
    return digits;
}

bool IsValidMonth(std::string_view text, std::string_view separator, std::string_view pattern) {
    auto layout = layoutOf(text, separator, pattern);
    if (!layout) return false;
    if (!layout->month) return true;
    std::string_view month = *layout->month;
    if (layout->monthPatternLength < 3) {
        if (!allDigits(month)) return false;
        long long m = digitsValue(month);
        return m >= 1 && m <= 12;
    }
    return monthByName(month) != 0;
}

bool IsValidYear(std::string_view text, std::string_view separator, std::string_view pattern) {
    auto layout = layoutOf(text, separator, pattern);
    if (!layout) return false;
    if (!layout->year) return true;
    if (!allDigits(*layout->year)) return false;
    long long y = digitsValue(*layout->year);
    return y > 1600 && y < 9999;
}

bool IsValidDay(std::string_view text, std::string_view separator, std::string_view pattern) {
    auto layout = layoutOf(text, separator, pattern);
    if (!layout) return false;
    if (!layout->day) return true;
    if (!layout->month || !layout->year) return false;
    std::string_view day = *layout->day, month = *layout->month, year = *layout->year;
    if (!allDigits(day) || !allDigits(year)) return false;
    long long m = allDigits(month) ? digitsValue(month) : monthByName(month);
    long long y = digitsValue(year), d = digitsValue(day);
    return y >= 1 && y <= 9999 && m >= 1 && m <= 12 && d >= 1 && d <= 31 && isValidCalendarDate(int(y), int(m), int(d));
}

bool GetContinueFlag() { return continueFlag; }

void SetContinueFlag(bool value) { continueFlag = value; }

bool IsMeterType(double type) { return type > int{eNoMeter} && type <= int{eParvix}; }

void getMinMaxDates(int meterType, std::int32_t& minDate, std::int32_t& maxDate) {
    for (const MinMaxDates& r : kClockRanges) {
        if (meterType >= r.firstType && meterType <= r.lastType) {
            minDate = r.minDate;
            maxDate = r.maxDate;
            return;
        }
    }
}

}  // namespace varnel::detail
