// Number, text and date helpers shared by the whole component, and the
// request-wide continue flag.
//
// The component reads no regional settings: number texts use the C/POSIX
// conventions (decimal point '.', no thousands separators) and month names
// are the English abbreviations "Jan".."Dec". Texts held in byte arrays are
// the meter's single-byte code page, one character per byte (util/codepage.h);
// everywhere else they are UTF-8.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "util/date_time.h"

namespace varnel::detail {

// True when the text, blanks around it ignored, is a decimal number: optional
// sign, digits with at most one decimal point, optional exponent. Hexadecimal,
// "inf" and "nan" are not numbers, nor is a value beyond the range of a double.
bool IsNumeric(std::string_view text);
// The value of a numeric text (see IsNumeric); 0 for any other text.
double ToNumber(std::string_view text);

// The value of a number as the client's documents write it: an optional sign
// and decimal digits with at most one decimal point among them. Nothing for
// any other text: empty, blanks anywhere, an exponent, hexadecimal, "inf",
// "nan", digits of other scripts, or a value beyond the range of a double.
std::optional<double> DocumentNumber(std::string_view text);
// A document number rounded to a 16-bit integer, halves to even; nothing
// when the text is no document number or the value does not fit.
std::optional<std::int16_t> DocumentInt16(std::string_view text);
// A value rounded to a 16-bit integer, halves to even; nothing when it does not fit.
std::optional<std::int16_t> Int16Value(double value);

// The text without the blanks (spaces, tabs, line ends) at either end.
std::string Trim(std::string_view text);
// The character in lower case when it is an ASCII capital; every other byte as it is.
// No locale takes part, so a UTF-8 byte is never changed.
char LowerAscii(char c);
// The text with its ASCII capitals in lower case.
std::string LowerCase(std::string_view text);
// True when the texts differ at most in the case of ASCII letters.
bool EqualsNoCase(std::string_view a, std::string_view b);
// A client's text as a message quotes it: its first 40 UTF-8 characters, and
// "..." when there were more, so that a huge value cannot swell a report.
std::string Abbreviated(std::string_view text);

// The text of the first count meter bytes as UTF-8, ending early at the first
// zero byte; never reads past the array, whatever count says.
std::string BytesToText(std::span<const std::uint8_t> bytes, int count);
// Stores the meter bytes of at most size-2 characters of a UTF-8 text and a
// zero after them (a 10-byte name holds 8 characters); later bytes keep their
// values. False, and nothing stored, when the meter cannot hold the text.
bool TextToBytes(std::span<std::uint8_t> bytes, std::string_view text);

// The date of the first value at the time of day of the second.
DateTime ToDateTime(const DateTime& date, const DateTime& time);

// True when text is a real date written as pattern (for example "dd/MM/yyyy" or
// "dd/MMM/yyyy") with separator between its three parts; an empty or
// all-blank text is accepted as no date at all.
bool IsValidDate(std::string_view text, std::string_view separator, std::string_view pattern);

// The separator the date parts are split at: separator (blanks ignored) when it is
// '/', '-' or '.', otherwise '/'.
char DateSeparator(std::string_view separator);
// Number of non-overlapping occurrences of sub in s, counted from the left; 0 for an empty sub.
std::size_t CountOccurrences(std::string_view s, std::string_view sub);
// The decimal digits of s, in order.
std::string DigitsOnly(std::string_view s);

// The part checks of IsValidDate: each holds when the pattern has no such part
// and fails when the text or the pattern does not split into three parts.
// A month part of fewer than 3 pattern letters is a number 1-12, otherwise a month abbreviation.
bool IsValidMonth(std::string_view text, std::string_view separator, std::string_view pattern);
// The year is all digits, from 1601 to 9998.
bool IsValidYear(std::string_view text, std::string_view separator, std::string_view pattern);
// The day is all digits and, with the month and year, names a real calendar day
// (with a day part but no month or year part the pattern cannot tell, so it fails).
bool IsValidDay(std::string_view text, std::string_view separator, std::string_view pattern);

// The calling thread's continue flag: long loops stop early when it is false. Starts true.
bool GetContinueFlag();
void SetContinueFlag(bool value);

// True for a meter type of the family: above eNoMeter (0), up to eParvix (8). Documents give the
// type as a number text, so a fraction in that range passes here; the identity check, which
// compares it with the meter's own type, refuses it.
bool IsMeterType(double type);

// First and last serial day of the clock range the meter type accepts; any other
// type leaves both untouched.
void getMinMaxDates(int meterType, std::int32_t& minDate, std::int32_t& maxDate);

}  // namespace varnel::detail
