#include "requests/option_elements.h"

#include <algorithm>
#include <string_view>

#include "errors/error_description.h"
#include "requests/option_tables.h"
#include "requests/request_frame.h"

namespace varnel::detail {

namespace {

// What a failed single read adds to the request's description. Only the
// options of the meters read one at a time need their own text.
struct SingleReadFailure {
    MeterOptions_Enum option;
    const char* text;
};

constexpr SingleReadFailure kSingleReadFailures[] = {
    {eUnits, " ; GluUnits settings failed"},
    {eTimeFormat, " ; Timeformat setting failed"},
};

std::string failureText(const OptionElementRow& row) {
    for (const SingleReadFailure& f : kSingleReadFailures)
        if (f.option == row.option) return f.text;
    return std::string(" ; ") + row.element + " setting failed";
}

// Meters whose language cannot be changed whatever their record says.
bool languageFixed(std::int16_t lastMeterType) {
    return lastMeterType == eDunmark || lastMeterType == eQuillaandBremo || lastMeterType == eCorviaZenta ||
           lastMeterType == eParvix;
}

constexpr std::int16_t kFastestBaud = 3;  // document value of 9600 baud

}  // namespace

OptionElements::OptionElements(MeterDll& session, METER_REC& record, std::string& message)
    : session_(session), record_(record), message_(message) {}

bool OptionElements::bulk() const {
    switch (record_.M_Type) {
    case eCVTarnConsumerMeter:
    case eCVPellis:
    case eDunmark:
    case eCVTolvoMeter:
    case eMorvex:
        return true;
    default:
        return false;
    }
}

std::int16_t OptionElements::fetch(XMLWrapper& status) {
    if (!bulk()) return 0;
    return GetAllGeneralSettings(session_, record_, status, message_);
}

std::int16_t OptionElements::readSingle(MeterOptions_Enum option, XMLWrapper& status) {
    // Meters read one option at a time fall asleep unless every other read is preceded by a tickle.
    if (!tickled_) session_.transport().vb_Tickle_Meter(record_);
    tickled_ = !tickled_;
    const std::int16_t r = session_.transport().vb_Read_Meter_Option(record_, static_cast<std::int16_t>(option));
    if (r != 0) {
        const OptionElementRow& row = optionElementRow(option, session_.LastMeterType());
        message_ = ErrorDescription(ME_FAIL) + ";" + message_ + ";" + ErrorDescription(r) + failureText(row);
        reportStatus(status, ME_FAIL, r, message_);
    }
    return r;
}

std::int16_t OptionElements::write(XMLWrapper& doc, MeterOptions_Enum option, XMLWrapper& status) {
    if (!bulk())
        if (const std::int16_t r = readSingle(option, status)) return r;

    const std::int16_t lastType = session_.LastMeterType();
    const OptionElementRow& row = optionElementRow(option, lastType);
    const SETTINGS_REC& s = record_.Setting;
    std::int16_t value = 0;
    if (!documentValue(row, s.nValue[option], value)) return 0;  // a code the element cannot show

    const bool language = option == eLanguage;
    doc.AddElement(row.element, language ? std::string() : std::to_string(value));
    const char* mode = language && languageFixed(lastType) ? "0" : modeText(s.Availability[option]);
    if (mode) doc.SetAttribute("Mode", mode);
    if (language) doc.SetAttribute("Val", std::to_string(value));
    if (const char* word = optionWord(row, value)) doc.SetAttribute("Txt", word);

    if (option == eCommunicationRate) {
        // The range runs up to the fastest rate whatever the current one is.
        const std::int16_t min = record_.M_Type == eCVTolvoMeter ? kFastestBaud : s.nValue_min[option];
        doc.SetAttribute("Min", std::to_string(min));
        doc.SetAttribute("Max", std::to_string(kFastestBaud));
    } else {
        doc.SetAttribute("Min", std::to_string(s.nValue_min[option]));
        doc.SetAttribute("Max", std::to_string(s.nValue_max[option]));
    }

    if (language) {
        doc.AddChildElement("ValidLang");
        const int count = std::clamp<int>(record_.langMap.numLanguages, 0, 20);
        for (int i = 0; i < count; ++i) {
            const std::int16_t code = record_.langMap.languages[i];
            doc.AddChildElement("Lang", "ValidLang", std::to_string(code));
            if (const char* word = languageWord(code)) doc.SetChildAttribute("Txt", word);
        }
    }
    return 0;
}

}  // namespace varnel::detail
