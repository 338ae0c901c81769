// Every public request on simulated meters, with each transport call failing in
// turn, once and from then on. A request may fail, but it must say so: it
// returns 0 only when it wrote what a healthy run writes and the meter holds
// what a healthy run leaves; otherwise it writes a well-formed report with a
// non-zero code. A failed erase loses nothing, and the session recovers.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <algorithm>
#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include <unistd.h>

#include "errors/err_propagator.h"
#include "simulator.h"
#include "support/client_session.h"
#include "support/sim_transport.h"
#include "support/wrapper_fixture.h"
#include "util/helpers.h"
#include "varnel/clock.h"
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/vantrix32.h"
#include "varnel/xml_wrapper.h"

namespace varnel::test {
namespace {

// A line fault: what the meter link answers when it breaks.
constexpr std::int16_t kFaultCode = ME_COM_ERROR;

struct Fault {
    std::string function;
    int nth;
    bool persistent;
};

// What the meter holds, as its saved profile's lines; the clock, which runs on, apart.
// Made only where two meters differ.
struct MeterText {
    std::vector<std::string> lines;
    std::int32_t clock = 0;
};

// What one run of a request left behind.
struct Outcome {
    std::int32_t result = 0;
    std::string raised;  // an unexpected error, "" when none
    std::string output;  // the answer document, the meter clock value blanked
    std::string status;  // the status document as written
    sim::MeterProfile meterBefore, meterAfter;
    std::map<std::string, int> calls;  // transport calls the request made
    std::string recovery;              // "" when a fresh discover and readings worked
};

// One request as a client makes it, on a meter discovered beforehand (except discovery itself).
struct Request {
    const char* name;
    Call call;
    // How the first failure report begins when a transport function fails, by function
    // ("" for every other function the request calls).
    std::map<std::string, std::string> says;
};

// What the settings and capabilities requests say when a read fails; an option's read names the option.
const std::string kRead = "Operation failed;;Communication error ; ";
const std::map<std::string, std::string> kSettingsReads = {
    {"vb_Chk4Meter", "Communication error"},
    {"vb_Read_Meter_Options", "Operation failed; ; GetAllGeneralSettings failed. Error is : Communication error"},
    {"vb_Read_Meter_Option", kRead},
    {"vb_Read_Meter_Clock", kRead + "Clock setting failed"},
    {"convert_from_seconds", kRead + "Clock setting failed"},
    {"vb_Get_Meter_Firmware", kRead + "Firmware read failed"},
    {"GetInitializedFlag", kRead + "DevInit setting failed"},
    {"GetInsulinName", kRead + "Insulins setting failed"},
    {"GetPredefinedInsulins", kRead + "Insulins setting failed"},
    {"GetOralMedicationName", kRead + "OralMeds setting failed"},
    {"GetPredefinedOralMeds", kRead + "OralMeds setting failed"},
    {"GetMealSegments", kRead + "Schedule setting failed"},
    {"GetScheduleSelection", kRead + "Schedule setting failed"},
    {"GetTargetRange", kRead + "Targets setting failed"},
};
const std::map<std::string, std::string> kCapsReads = {
    {"vb_Chk4Meter", "Communication error"},
    {"vb_Read_Meter_Option", kRead},
    {"vb_Read_Meter_Clock", kRead + "Clock setting failed"},
    {"vb_Get_Meter_Firmware", kRead + "Firmware read failed"},
    // The schedule's report runs its two parts together here.
    {"GetMealSegments", "Operation failed;;Communication error"},
    {"GetScheduleSelection", "Operation failed;;Communication error"},
};
// A write that fails is refused within the summary report, naming what was refused.
const std::map<std::string, std::string> kWrites = {
    {"vb_Chk4Meter", "Communication error"},
    {"vb_Set_Meter_Option", "Partial success; Invalid "},
    // Nothing else to write on some types: then nothing was written.
    {"vb_Set_Meter_Clock", "Partial success;Invalid DeviceClock value ;|Operation failed;Invalid DeviceClock value ;"},
    {"SetInitializedFlag", "Partial success;Invalid DevInit value ; Communication error;"},
    {"SetInsulinName", "Partial success;Invalid Insulin value ;"},
    {"SetPredefinedInsulins", "Partial success;Invalid Insulin value ;"},
    {"SetOralMedicationName", "Partial success;Invalid OralMeds value ;"},
    {"SetPredefinedOralMeds", "Partial success;Invalid OralMeds value ;"},
    {"SetMealSegments", "Partial success;Invalid Schedule value ;"},
    {"SetScheduleSelection", "Partial success;Invalid Schedule value ;"},
    {"SetTargetRange", "Partial success;Invalid Targets value ;"},
};

const std::vector<Request>& requests() {
    static const std::vector<Request> all = {
        {"discoverDevice",
         Call::discover,
         {{"find_meter", "Communication error ; No meter detected on port 1"},
          {"vb_Get_Meter_Firmware", "Communication error ; Firmware read failed"}}},
        {"getDeviceSettingsAll", Call::settings, kSettingsReads},
        {"getDeviceSettingsListed", Call::settingsListed, kSettingsReads},
        {"getDeviceCapsAll", Call::caps, kCapsReads},
        {"getDeviceCapsListed", Call::capsListed, kCapsReads},
        {"setDeviceSettings", Call::setSettings, kWrites},
        {"getReadings",
         Call::readings,
         {{"vb_Chk4Meter", "Communication error"},
          {"vb_Get_Meter_Firmware", "Communication error ; Firmware read failed"},
          {"GetMeterDatalogRecordData", "Communication error ; "},  // how many records were lost
          {"convert_from_seconds", "Communication error ; "},
          {"", "Communication error ; GetReadingFromMeter failed"}}},
        {"clearMeter", Call::clear, {{"", "Communication error"}}},
        {"closeMeter", Call::close, {}},
    };
    return all;
}

std::string printed(const XMLWrapper& doc) { return doc.IsEmpty() ? "" : doc.XML(); }

// The meter clock runs on while requests wait, so its reading is not compared.
std::string withoutClockValue(const std::string& xml) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) return xml;
    for (pugi::xpath_node n : doc.select_nodes("//Clock/Val"))
        for (pugi::xml_attribute a : n.node().attributes()) a.set_value("");
    std::ostringstream out;
    doc.save(out, "  ", pugi::format_default | pugi::format_no_declaration);
    return out.str();
}

// What the client passes in: a listing of the settings items, or the edited settings.
XMLWrapper clientDocument(Call call, const std::string& settings) {
    XMLWrapper doc;
    if (call == Call::setSettings) {
        if (!doc.LoadXML(settings)) throw std::runtime_error("the settings document does not load");
        return doc;
    }
    if (call != Call::settingsListed && call != Call::capsListed) return doc;
    doc = newDoc(call == Call::caps || call == Call::capsListed ? doc_kind::device_caps : doc_kind::device_settings);
    // Every other item of the meter's settings, the clock always.
    pugi::xml_document meter;
    meter.load_string(settings.c_str());
    doc.SelectElement("Settings");
    int i = 0;
    for (pugi::xml_node n : meter.child("DeviceSettings").child("Settings").children())
        if (i++ % 2 == 0 || std::string(n.name()) == "Clock") doc.AddElement(n.name());
    if (call == Call::capsListed) {
        doc.SelectElement("Records");
        doc.AddElement("Gluc");
    }
    return doc;
}

std::vector<std::string> lines(const std::string& text) {
    std::vector<std::string> result;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) result.push_back(line);
    return result;
}

// A settings document that changes several items of every kind the meter has,
// made from what the meter reports, as a client edits it.
std::string editedSettings(const std::string& current) {
    pugi::xml_document doc;
    doc.load_string(current.c_str());
    pugi::xml_node s = doc.child("DeviceSettings").child("Settings");
    // Read-only items are left out, so a healthy write reports full success.
    for (pugi::xml_node n = s.first_child(); n;) {
        pugi::xml_node next = n.next_sibling();
        if (n.attribute("Mode") && n.attribute("Mode").as_int() == 0) s.remove_child(n);
        n = next;
    }
    auto set = [&](const char* path, const char* text) {
        if (pugi::xml_node n = s.first_element_by_path(path)) n.text().set(text);
    };
    if (pugi::xml_node clock = s.child("Clock").child("Val"))
        for (auto [name, value] :
             {std::pair{"D", "15"}, {"MM", "06"}, {"Y", "2012"}, {"h", "10"}, {"m", "20"}, {"s", "30"}})
            clock.attribute(name).set_value(value);
    for (auto [path, text] : {std::pair{"CC", "9"}, {"Beep", "0"}, {"DevInit", "0"}, {"GlucUnit", "1"},
                              {"DateFormat", "1"}, {"TimeFormat", "1"}, {"EvtAvgDurn", "3"}, {"WeekBegin", "0"},
                              {"CholesUnit", "1"}, {"PumpUse", "1"}, {"ShowLastResult", "0"}, {"DaysAveraged", "1"},
                              {"Targets/PreMealLow", "75"}, {"Targets/Hypo", "65"}})
        set(path, text);
    if (pugi::xml_node lang = s.child("Language"); lang && lang.attribute("Mode").as_int() == 1)
        lang.attribute("Val").set_value("2");
    for (pugi::xml_node n : s.child("Insulins").child("Custom").children())
        if (n.text().as_int() == 12)
            n.attribute("Txt").set_value("Night");
        else if (n.text().as_int() == 13)
            n.attribute("Txt").set_value("BolusX");
    for (pugi::xml_node n : s.child("Pills").child("Custom").children())
        if (n.text().as_int() == 7) n.attribute("Txt").set_value("Noon");
    for (auto [list, entry, values] : {std::tuple{"Insulins", "Insulin", std::array{"9", "12", "1"}},
                                       {"Pills", "Pill", std::array{"2", "7", "6"}}}) {
        pugi::xml_node fav = s.child(list).child("Favorite");
        pugi::xml_node n = fav.first_child();
        for (const char* v : values) {
            if (!fav) break;
            if (!n) n = fav.append_child(entry);
            n.text().set(v);
            n = n.next_sibling();
        }
    }
    if (pugi::xml_node sched = s.child("Schedule")) {
        sched.child("PreB").attribute("m").set_value("30");
        sched.child("PostD").attribute("m").set_value("15");
    }
    std::ostringstream out;
    doc.save(out, "  ", pugi::format_default | pugi::format_no_declaration);
    return out.str();
}

// The first line in which two texts differ.
std::string firstDifference(const std::vector<std::string>& a, const std::vector<std::string>& b) {
    for (std::size_t i = 0; i < std::max(a.size(), b.size()); ++i) {
        const std::string x = i < a.size() ? a[i] : "(end)", y = i < b.size() ? b[i] : "(end)";
        if (x != y) return "line " + std::to_string(i + 1) + ": got `" + x + "`, healthy `" + y + "`";
    }
    return "";
}
std::string firstDifference(const std::string& got, const std::string& want) {
    return firstDifference(lines(got), lines(want));
}

MeterText meterText(sim::MeterProfile p) {
    static const std::string path =
        (std::filesystem::temp_directory_path() / ("varnel_sweep_" + std::to_string(::getpid()) + ".xml")).string();
    MeterText t;
    t.clock = std::exchange(p.clock, 0);
    sim::writeProfileFile(p, path);
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    std::filesystem::remove(path);
    t.lines = lines(text.str());
    return t;
}

// The meter clock as the same setting: within an hour of each other.
bool sameClock(const MeterText& a, const MeterText& b) { return std::abs(long(a.clock) - long(b.clock)) <= 3600; }

// The same meter, its clock within the hour.
bool sameMeter(const sim::MeterProfile& a, sim::MeterProfile b) {
    if (std::abs(long(a.clock) - long(b.clock)) > 3600) return false;
    b.clock = a.clock;
    return a == b;
}

// The lines of got that are in neither of the others ("clock" for the clock), joined.
std::string linesOutside(const MeterText& got, const MeterText& a, const MeterText& b) {
    std::string out;
    for (const std::string& line : got.lines)
        if (std::find(a.lines.begin(), a.lines.end(), line) == a.lines.end() &&
            std::find(b.lines.begin(), b.lines.end(), line) == b.lines.end())
            out += "\n  " + line;
    if (!sameClock(got, a) && !sameClock(got, b)) out += "\n  clock";
    return out;
}
std::string linesOutside(const sim::MeterProfile& got, const sim::MeterProfile& a, const sim::MeterProfile& b) {
    if (sameMeter(got, a) || sameMeter(got, b)) return "";
    return linesOutside(meterText(got), meterText(a), meterText(b));
}

// "" when both hold the same; else the first line that differs.
std::string meterDifference(const sim::MeterProfile& got, const sim::MeterProfile& want) {
    if (sameMeter(got, want)) return "";
    const MeterText a = meterText(got), b = meterText(want);
    return sameClock(a, b) ? firstDifference(a.lines, b.lines) : "the clock";
}

// "" when the status holds at least one complete report with a non-zero code, every report is
// complete (integer Major and Minor, a description) and the first failure's description begins
// as given; else what is wrong.
std::string statusProblem(const std::string& xml, const std::string& begins) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) return "status is not a document";
    std::string failure;
    int groups = 0;
    for (pugi::xml_node n = doc.document_element().first_child(); n; n = n.next_sibling()) {
        if (std::string(n.name()) != "ErrCode") continue;
        ++groups;
        char* end = nullptr;
        const std::string major = n.child_value("Major"), minor = n.child_value("Minor");
        const long ma = std::strtol(major.c_str(), &end, 10);
        if (major.empty() || *end) return "ErrCode without a numeric Major";
        const long mi = std::strtol(minor.c_str(), &end, 10);
        if (minor.empty() || *end) return "ErrCode without a numeric Minor";
        pugi::xml_node desc = n.next_sibling();
        if (std::string(desc.name()) != "ErrDesc" || std::string(desc.child_value()).empty())
            return "ErrCode without an ErrDesc";
        if ((ma || mi) && failure.empty()) failure = desc.child_value();
    }
    if (groups == 0) return "no report in the status";
    if (failure.empty()) return "only success reports in the status";
    // Alternatives are separated by "|".
    for (std::size_t from = 0, to; from <= begins.size(); from = to + 1) {
        to = std::min(begins.find('|', from), begins.size());
        if (failure.compare(0, to - from, begins, from, to - from) == 0) return "";
    }
    return "the failure described as `" + failure + "`, not `" + begins + "…`";
}

// The Major code of the last report in the status, 0 when there is none.
std::int32_t summaryCode(const std::string& xml) {
    pugi::xml_document doc;
    doc.load_string(xml.c_str());
    std::int32_t code = 0;
    for (pugi::xml_node n : doc.document_element().children("ErrCode")) code = n.child("Major").text().as_int();
    return code;
}

std::size_t entryCount(const XMLWrapper& datalog) {
    pugi::xml_document doc;
    doc.load_string(datalog.XML().c_str());
    pugi::xml_node records = doc.document_element().child("Records");
    return static_cast<std::size_t>(std::distance(records.begin(), records.end()));
}

struct SweepCase {
    std::size_t request;
    int type;
};

class FaultSweep : public ::testing::TestWithParam<SweepCase> {
protected:
    const Request& request() const { return requests()[GetParam().request]; }
    Call call() const { return request().call; }
    int type() const { return GetParam().type; }

    void TearDown() override {
        vx_set_yield_hook(nullptr, nullptr);
        sim::reset();
        setThreadClock(nullptr);
    }

    // Runs the request once on a fresh meter of the type, with the fault if one is given.
    Outcome run(const std::optional<Fault>& fault, const std::string& settings) {
        setThreadClock(std::make_shared<ManualClock>(1000));
        sim::loadProfile(sim::defaultProfile(type()));
        detail::SetContinueFlag(true);
        Outcome o;
        {
            DllWrapper wrapper = detail::wrapperOver(simTransport());
            METER_REC rec{};
            XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status), out;
            if (call() != Call::discover) {
                if (makeCall(wrapper, Call::discover, rec, device, status, out, sim::meter().port) != ME_SUCCESS) {
                    o.raised = "the meter was not found before the request";
                    return o;
                }
                status = newDoc(doc_kind::status);
            }
            out = clientDocument(call(), settings);
            o.meterBefore = sim::meter();
            std::map<std::string, int> before;
            for (const std::string& f : sim::faultableFunctions()) before[f] = sim::callCount(f);
            if (fault) sim::injectFault(fault->function, fault->nth, kFaultCode, fault->persistent);
            detail::errPropagator().reset();
            try {
                o.result = makeCall(wrapper, call(), rec, device, status, out, sim::meter().port);
            } catch (const ComponentError& e) {
                o.raised = "ComponentError " + std::to_string(e.number()) + " " + e.description();
            } catch (const std::exception& e) {
                o.raised = std::string("exception ") + e.what();
            }
            sim::clearFaults();
            for (const std::string& f : sim::faultableFunctions())
                if (int n = sim::callCount(f) - before[f]) o.calls[f] = n;
            o.meterAfter = sim::meter();
            o.output = withoutClockValue(printed(out));
            if (call() == Call::close) o.output = sim::portOpen() ? "port open" : "port released";
            o.status = printed(status);
            const bool answered = o.raised.empty() && (o.result == ME_SUCCESS || o.result == ME_PARTIALSUCCESS);
            keepDocuments({&status, answered ? &out : nullptr});
            o.recovery = recover(wrapper);
        }
        return o;
    }

    // A fresh discovery and upload on the same component after the request.
    std::string recover(DllWrapper& wrapper) {
        try {
            METER_REC rec{};
            XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status), out;
            for (Call c : {Call::discover, Call::readings})
                if (std::int32_t r = makeCall(wrapper, c, rec, device, status, out, sim::meter().port))
                    return "discovery or readings afterwards returned " + std::to_string(r) + " " + statusText(status);
            const sim::MeterProfile m = sim::meter();
            const bool empty = m.datalog.empty() && m.binaryDatalog.empty();
            if ((entryCount(out) == 0) != empty)
                return "readings afterwards gave " + std::to_string(entryCount(out)) + " entries";
            wrapper.closeMeter(rec);
        } catch (const std::exception& e) {
            return std::string("recovery raised ") + e.what();
        }
        return "";
    }

    // What is wrong with a faulty run, judged against the healthy one; "" when nothing.
    std::string judge(const Outcome& o, const Outcome& healthy, const std::string& function) const {
        if (!o.raised.empty()) return "raised " + o.raised;
        // A settings write returns 0 whenever it walked the whole document; its summary report tells how it went.
        std::int32_t result = o.result;
        if (result == ME_SUCCESS && call() == Call::setSettings) result = summaryCode(o.status);
        std::string wrong;
        auto add = [&](const std::string& w) { wrong += (wrong.empty() ? "" : "; ") + w; };
        if (result == ME_SUCCESS) {
            if (o.output != healthy.output)
                add("returned 0 with another document (" + firstDifference(o.output, healthy.output) + ")");
            if (o.status != healthy.status)
                add("returned 0 with another status (" + firstDifference(o.status, healthy.status) + ")");
            if (std::string d = meterDifference(o.meterAfter, healthy.meterAfter); !d.empty())
                add("returned 0 but the meter differs in " + d);
        } else {
            if (call() != Call::close) {
                const auto& says = request().says;
                auto said = says.find(function);
                if (said == says.end()) said = says.find("");
                if (said == says.end()) add("no report is expected when " + function + " fails");
                else if (std::string p = statusProblem(o.status, said->second); !p.empty())
                    add("returned " + std::to_string(result) + " with " + p);
            }
            if (std::string d = linesOutside(o.meterAfter, o.meterBefore, healthy.meterAfter); !d.empty())
                add("returned " + std::to_string(result) + "; meter neither as before nor as asked in" + d);
            if (call() == Call::clear && !meterDifference(o.meterAfter, o.meterBefore).empty())
                add("a failed erase lost records");
        }
        if (!o.recovery.empty()) add(o.recovery);
        return wrong;
    }
};

TEST_P(FaultSweep, EveryFailureIsReportedAndNothingIsLost) {
    // The meter's own settings document: what a client lists items from, or edits and sends back.
    std::string settings;
    if (call() == Call::setSettings || call() == Call::settingsListed || call() == Call::capsListed) {
        sim::loadProfile(sim::defaultProfile(type()));
        setThreadClock(std::make_shared<ManualClock>(1000));
        DllWrapper wrapper = detail::wrapperOver(simTransport());
        METER_REC rec{};
        XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status), cfg;
        ASSERT_EQ(makeCall(wrapper, Call::discover, rec, device, status, cfg, sim::meter().port), ME_SUCCESS);
        ASSERT_EQ(makeCall(wrapper, Call::settings, rec, device, status, cfg), ME_SUCCESS) << statusText(status);
        settings = call() == Call::setSettings ? editedSettings(cfg.XML()) : cfg.XML();
    }

    const Outcome healthy = run(std::nullopt, settings);
    ASSERT_EQ(healthy.raised, "");
    ASSERT_EQ(healthy.result, ME_SUCCESS) << healthy.status;
    ASSERT_EQ(summaryCode(healthy.status), ME_SUCCESS) << healthy.status;
    ASSERT_EQ(healthy.recovery, "");
    ASSERT_FALSE(healthy.calls.empty());
    if (call() == Call::setSettings) {
        // The healthy write changes something of every kind the meter has: the clock, options, and on
        // type 7 the names, favourites, schedule, targets and the initialised flag (the first line).
        const MeterText before = meterText(healthy.meterBefore), after = meterText(healthy.meterAfter);
        EXPECT_FALSE(sameClock(after, before));
        std::vector<std::string> kinds;
        if (type() == eMorvex || type() == 3) kinds = {"<option "};
        if (type() == eMorvex)
            kinds.insert(kinds.end(), {"<meter ", "<name ", "<insulins ", "<oralMeds ", "<schedule ", "<targets "});
        const std::string changed = linesOutside(after, before, before);
        for (const std::string& kind : kinds) {
            bool found = false;
            for (const std::string& line : lines(changed)) found = found || line.find(kind) != std::string::npos;
            EXPECT_TRUE(found) << kind << " unchanged; changed:" << changed;
        }
    }

    std::vector<std::string> offences;
    int runs = 0;
    for (const auto& [function, count] : healthy.calls)
        for (int k = 1; k <= count; ++k)
            for (bool persistent : {false, true}) {
                const Outcome o = run(Fault{function, k, persistent}, settings);
                ++runs;
                if (std::string wrong = judge(o, healthy, function); !wrong.empty())
                    offences.push_back(std::string(request().name) + " type " + std::to_string(type()) + " " +
                                       function + " call " + std::to_string(k) + "/" + std::to_string(count) +
                                       (persistent ? " persistent: " : " once: ") + wrong);
            }
    RecordProperty("faulty_runs", runs);
    std::string all;
    for (const std::string& line : offences) all += line + "\n";
    EXPECT_TRUE(offences.empty()) << offences.size() << " of " << runs << " faulty runs went wrong:\n" << all;
}

void PrintTo(const SweepCase& c, std::ostream* out) { *out << requests()[c.request].name << " on type " << c.type; }

std::vector<SweepCase> sweepCases() {
    std::vector<SweepCase> cases;
    for (int type = 1; type <= 8; ++type)
        for (std::size_t r = 0; r < requests().size(); ++r) cases.push_back({r, type});
    return cases;
}

INSTANTIATE_TEST_SUITE_P(Requests, FaultSweep, ::testing::ValuesIn(sweepCases()),
                         [](const ::testing::TestParamInfo<SweepCase>& info) {
                             return std::string(requests()[info.param.request].name) + "_type" +
                                    std::to_string(info.param.type);
                         });

}  // namespace
}  // namespace varnel::test
