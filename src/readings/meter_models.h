// The meter model classes: one object per connected meter, owning the
// settings groups its meter supports and choosing its datalog upload and
// conversion. Seven models differ only in the class text of their error
// trace; the eighth, clsCVMorvex, adds four groups and the binary datalog.
#pragma once

#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "readings/meter_fns.h"
#include "readings/results.h"
#include "settings/meter_settings.h"

namespace varnel::detail {

class MeterModel {
public:
    virtual ~MeterModel() = default;

    // The model's settings groups; a missing-object error before initialise.
    MeterSettings& Settings();
    // Uploads the meter's datalog into the meter-functions object: 0 or the transport's code.
    virtual std::int16_t GetReadingFromMeter() = 0;
    // Converts the uploaded datalog into results added to objresultcol.
    virtual bool MeterUpload(ResultCollection& objresultcol) = 0;
    // Initialises and reads every group, reporting progress; the first failing
    // group's code ends it.
    std::int16_t MeterSetup();
    // Keeps the meter-functions object and builds the settings groups (they
    // are not initialised here). Always false.
    bool initialise(std::shared_ptr<clsMeterFns> objMeterFns);

    // Class text recorded in the error trace.
    const char* className() const { return className_; }

protected:
    // Reads groups in setupOrder, reporting progress[i] after the i-th read.
    struct Layout {
        std::span<const std::int32_t> groups;      // created and added in this order
        std::span<const std::int32_t> setupOrder;  // initialised and read in this order
        std::span<const std::int16_t> progress;
    };

    MeterModel(const char* className, const Layout& layout);

    clsMeterFns& meterFns();
    // The group under that number; a missing-object error when the model has none.
    ISetupGroup& group(std::int32_t number);
    template <class G>
    G& groupAs(std::int32_t number) {
        return dynamic_cast<G&>(group(number));
    }

private:
    const char* className_;
    Layout layout_;
    std::shared_ptr<clsMeterFns> mobjMeterFns;
    std::unique_ptr<MeterSettings> mobjSettings;
};

// Meter types 1-6 and 8: clock and general groups, record datalog.
class StandardMeterModel : public MeterModel {
public:
    explicit StandardMeterModel(const char* className);

    std::int16_t GetReadingFromMeter() override;
    bool MeterUpload(ResultCollection& objresultcol) override;
};

// Meter type 7 and any unknown type: all six groups, binary datalog.
class clsCVMorvex : public MeterModel {
public:
    clsCVMorvex();

    // Uploads, then (only after a successful upload) reads the oral-medication
    // and insulin names the conversion needs.
    std::int16_t GetReadingFromMeter() override;
    bool MeterUpload(ResultCollection& objresultcol) override;
};

// A class-name text usable as a template argument.
template <std::size_t N>
struct ModelName {
    constexpr ModelName(const char (&text)[N]) { std::copy_n(text, N, this->text); }
    char text[N];
};

template <ModelName Name>
class NamedStandardModel final : public StandardMeterModel {
public:
    NamedStandardModel() : StandardMeterModel(Name.text) {}
};

using clsCVTarnConsumer = NamedStandardModel<"clsCVTarnConsumer">;
using clsCVPellis = NamedStandardModel<"clsCVPellis">;
using clsDunmark = NamedStandardModel<"clsDunmark">;
using clsQuillaandbremo = NamedStandardModel<"clsQuilla&Bremo">;
using clsCVTolvo = NamedStandardModel<"clsCVTolvo">;
using clsCVZenta = NamedStandardModel<"clsCVZenta">;
using clsParvix = NamedStandardModel<"clsParvix">;

// A new model for a MeterType_Enum value; clsCVMorvex for type 7 and every unlisted type.
std::unique_ptr<MeterModel> createMeterModel(std::int32_t meterType);

}  // namespace varnel::detail
