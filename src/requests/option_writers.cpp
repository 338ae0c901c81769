#include "requests/option_writers.h"

#include <iterator>
#include <optional>

#include "errors/err_propagator.h"
#include "errors/error_description.h"
#include "requests/option_tables.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

struct OptionWriter {
    const char* member;
    // Messages: no value, the meter refused the write, the option is not writable.
    const char* emptyValue;
    const char* refused;
    const char* readOnly;
    // Notes itself in the status document when it fails unexpectedly.
    bool notesFailure = false;
};

// One writer per option, indexed by MeterOptions_Enum; the element and the
// value mapping are the option's document element's. The messages' blanks and
// semicolons are what clients have always received; keep them as they are.
constexpr OptionWriter kWriters[] = {
    {"SetStripCalCode", " Invalid StripCalCode value ;", " Invalid StripCalCode value ;",
     " StripCalCode value is read only;"},
    {"SetBeeper", " Invalid Beeper value ;", " Invalid Beeper value ;", " Beeper value is read only; "},
    {"SetGlucoseUnits", " Invalid GlucoseUnit value ;", " Invalid GlucoseUnit value; ",
     " GlucoseUnit value is read only "},
    {"SetPunctuation", " Invalid Punctuation value ;", " Invalid Punctuation value ;",
     " Punctuation value is read only ;"},
    {"SetDateMode", " Invalid DateMode value ;", " Invalid DateMode value ;", " DateMode value is read only ;"},
    {"SetTimeMode", " Invalid TimeMode value ;", " Invalid TimeMode value ;", " TimeMode value is read only ;"},
    {"SetLanguage", " Invalid Language value ;", " Invalid Language value; ", " Language value is read only; "},
    {"SetCommMode", " Invalid CommMode value ;", " Invalid CommMode value ;", " CommMode value is read only ;"},
    {"SetBaudRate", " Invalid BaudRate value ;", " Invalid BaudRate value ;", " BaudRate value is read only ;"},
    {"SetNewLang", " Invalid NewLang value ;", " Invalid NewLang value ;", " NewLang value is read only ;"},
    {"SetEventAveraging", " Invalid EventAveraging value ;", " Invalid EventAveraging value ;",
     " EventAveraging value is read only ;"},
    {"SetInsPrompt", " Invalid InsPrompt value ;", " Invalid InsPrompt value ;", " InsPrompt value is read only ;",
     true},
    {"SetShowLastResult", " Invalid ShowLastResult value ;", " Invalid ShowLastResult value ;",
     " ShowLastResult value is read only ;"},
    {"SetDaysAveraged", " Invalid DaysAveraged value ;", " Invalid DaysAveraged value ;",
     " DaysAveraged value is read only ;"},
    {"SetDisplayClock", " Invalid DisplayClock value ;", " Invalid DisplayClock value ;",
     " DisplayClock value is read only ;"},
    {"SetDaylight", " Invalid Daylight value ;", " Invalid Daylight value ;", " Daylight value is read only ;"},
    {"SetDaysBeginWeek", " Invalid DaysBeginWeek value ;", " Invalid DaysBeginWeek value ;",
     " DaysBeginWeek value is read only ;", true},
    {"SetCholesterolUnits", " Invalid CholesterolUnits value ;", " Invalid CholesterolUnits value ;",
     " CholesterolUnits value is read only ;"},
    {"SetInsulinPumpUse", " Invalid InsulinPumpUse value ;", " Invalid InsPumpUse value ;",
     " InsulinPumpUse value is read only ;"},
};
static_assert(std::size(kWriters) == kOptionElements.size());

constexpr std::int16_t kWritable = 2;
// The language the type-7 meter cannot show, whatever its language table says.
constexpr double kLanguageNotOnMorvex = 6;

const OptionWriter& writerFor(MeterOptions_Enum option) {
    if (option < 0 || option >= static_cast<int>(std::size(kWriters)))
        raise(errc::subscript_out_of_range, "No writer for option " + std::to_string(option));
    return kWriters[option];
}

// The document's value as the meter takes it: a document 1 of an inverted
// option is written as 0 and 0 as 1, the baud texts "0"-"3" run the other
// way; any other value goes as it is.
double mapped(OptionMapping mapping, const std::string& text, double value) {
    switch (mapping) {
    case OptionMapping::raw:
        return value;
    case OptionMapping::inverted:
        return value == 1 ? 0 : value == 0 ? 1 : value;
    case OptionMapping::reversed:
        if (text.size() == 1 && text[0] >= '0' && text[0] <= '3') return 3 - (text[0] - '0');
        return value;
    }
    return value;
}

// The element the writer reads: event averaging is "EvtAvg" on types 2 and 3,
// "EvtAvgDurn" on type 7 and nothing elsewhere.
std::string elementFor(MeterOptions_Enum option, std::int16_t lastMeterType) {
    if (option == eEvevtAveraging && lastMeterType != eCVPellis && lastMeterType != eDunmark &&
        lastMeterType != eMorvex)
        return {};
    return optionElementRow(option, lastMeterType).element;
}

}  // namespace

const char* optionWriterName(MeterOptions_Enum option) { return writerFor(option).member; }

std::int16_t writeOption(MeterDll& session, MeterOptions_Enum option, XMLWrapper& deviceCfg, XMLWrapper& status,
                         WriteOutcome& outcome) {
    const OptionWriter& w = writerFor(option);
    const auto noteFailure = [&](const IError& e) {
        if (!w.notesFailure) return;
        // Best effort: the error being raised matters more than this note.
        try {
            status.AddElement("ProcedureError", std::string(w.member) + " Line: " + std::to_string(e.ErrLine));
        } catch (...) {}
    };
    return guarded(
        "MeterDll", w.member,
        [&]() -> std::int16_t {
            deviceCfg.MoveToRoot();
            deviceCfg.MoveToChild("Settings");
            const std::string element = elementFor(option, session.LastMeterType());
            std::string text;
            if (option == eLanguage)
                text = deviceCfg.GetChildAttribute(element, "Val");
            else if (!element.empty())
                text = deviceCfg.GetChildValue(element);
            text = Trim(text);
            // No value, or one that is no plain number or does not fit the meter's
            // 16 bits, is refused alike: whatever it were taken for would not be what the client sent.
            const std::optional<double> number = DocumentNumber(text);
            const double value = number ? mapped(kOptionElements[option].mapping, text, *number) : 0;
            const std::optional<std::int16_t> rounded = number ? Int16Value(value) : std::nullopt;
            if (!rounded) {
                outcome.refuse(w.emptyValue + ErrorDescription(ME_FAIL) + ";");
                return ME_FAIL;
            }
            if (session.storedRecord().Setting.Availability[option] != kWritable) {
                outcome.refuse(w.readOnly);
                return ME_FAIL;
            }
            if (option == eLanguage && session.storedRecord().M_Type == eMorvex && value == kLanguageNotOnMorvex) {
                outcome.refuse(w.refused);
                return ME_FAIL;
            }
            // What the transport writes into this copy never reaches the session's record.
            METER_REC copy = session.storedRecord();
            const std::int16_t code = session.transport().vb_Set_Meter_Option(copy, option, *rounded);
            if (code == 0) {
                outcome.bSuccess = true;
                return 0;
            }
            outcome.refuse(w.refused + ErrorDescription(code) + ";");
            return code;
        },
        noteFailure);
}

}  // namespace varnel::detail
