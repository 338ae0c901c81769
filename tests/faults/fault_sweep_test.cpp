// Every public request on simulated meters, with each transport call failing in
// turn, once and from then on. A request may fail, but it must say so: it
// returns 0 only when it wrote what a healthy run writes and the meter holds
// what a healthy run leaves; otherwise its first failure report says what
// failed (the schema test checks the form of every status kept here). A failed
// request invents nothing on the meter, a failed erase loses nothing, and the
// session recovers.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <map>
#include <optional>
#include <sstream>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include <unistd.h>

#include "support/client_session.h"
#include "support/wrapper_fixture.h"

namespace varnel::test {
namespace {

struct Fault {
    std::string function;
    int nth;
    bool persistent;
};

// What the meter holds, the clock (which runs on) apart.
struct Meter {
    sim::MeterProfile held;
    std::int32_t clock = 0;
};

// What one run of a request left behind.
struct Outcome {
    std::int32_t result = 0;
    std::string raised;  // an unexpected error, "" when none
    std::string output;  // the answer document
    XMLWrapper status;
    Meter meterBefore, meterAfter;
    std::map<std::string, int> calls;  // transport calls the request made
    std::string recovery;              // "" when a fresh discover and readings worked
};

// One request as a client makes it, on a meter discovered beforehand (except discovery itself).
struct Request {
    const char* name;
    Call call;
    // How the first failure report begins when a transport function fails, by function
    // ("" for every other function the request calls; alternatives separated by "|").
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

const std::vector<Request> kRequests = {
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

std::string printed(const pugi::xml_document& doc) {
    std::ostringstream out;
    doc.save(out, "  ", pugi::format_default | pugi::format_no_declaration);
    return out.str();
}

std::vector<std::string> lines(const std::string& text) {
    std::vector<std::string> result;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) result.push_back(line);
    return result;
}

// A document's lines, the meter clock's reading blanked: the clock runs on while requests wait.
std::vector<std::string> withoutClockValue(const std::string& xml) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) return lines(xml);
    for (pugi::xpath_node n : doc.select_nodes("//Clock/Val/@*")) n.attribute().set_value("");
    return lines(printed(doc));
}

// What the client passes in: the edited settings, or a listing of every other item of the meter's
// settings (the clock always, and the glucose records for capabilities).
XMLWrapper clientDocument(Call call, const std::string& settings) {
    XMLWrapper doc;
    if (call == Call::setSettings && !doc.LoadXML(settings)) throw std::runtime_error("the settings do not load");
    if (call != Call::settingsListed && call != Call::capsListed) return doc;
    doc = newDoc(call == Call::capsListed ? doc_kind::device_caps : doc_kind::device_settings);
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

// The meter's settings as a client edits them: read-only items left out (so a healthy write
// succeeds in full), every option moved to an end of its range, several items of every other kind changed.
std::string editedSettings(const std::string& current) {
    pugi::xml_document doc;
    doc.load_string(current.c_str());
    pugi::xml_node s = doc.child("DeviceSettings").child("Settings");
    for (pugi::xpath_node n : s.select_nodes("*[@Mode='0']")) s.remove_child(n.node());
    for (pugi::xpath_node x : s.select_nodes("*[@Max and not(*)]")) {
        pugi::xml_node n = x.node();
        n.text().set(n.attribute(n.text().as_int() == n.attribute("Max").as_int() ? "Min" : "Max").value());
    }
    s.child("Pills").child("Favorite").append_child("Pill");  // one favourite more
    for (auto [path, value] : {std::pair{"Clock/Val/@Y", "2012"},
                               {"Language[@Mode='1']/@Val", "2"},
                               {"Targets/Hypo", "65"},
                               {"Schedule/PreB/@m", "30"},
                               {"Insulins/Custom/*[.='12']/@Txt", "Night"},   // renamed
                               {"Insulins/Custom/*[.='13']/@Txt", "BolusX"},  // named anew
                               {"Pills/Custom/*[.='7']/@Txt", "Noon"},
                               {"Insulins/Favorite/*[2]", "12"},
                               {"Pills/Favorite/*[1]", "2"},
                               {"Pills/Favorite/*[3]", "6"}})
        for (pugi::xpath_node n : s.select_nodes(path))
            n.attribute() ? n.attribute().set_value(value) : n.node().text().set(value);
    return printed(doc);
}

// The first line in which two texts differ, "" when none.
std::string firstDifference(const std::vector<std::string>& a, const std::vector<std::string>& b) {
    for (std::size_t i = 0; i < std::max(a.size(), b.size()); ++i) {
        const std::string x = i < a.size() ? a[i] : "(end)", y = i < b.size() ? b[i] : "(end)";
        if (x != y) return "line " + std::to_string(i + 1) + ": got `" + x + "`, healthy `" + y + "`";
    }
    return "";
}

Meter meterNow() {
    Meter m{sim::meter()};
    m.clock = std::exchange(m.held.clock, 0);
    return m;
}

// The meter as its saved profile's lines.
std::vector<std::string> lines(const Meter& m) {
    static const std::string path =
        (std::filesystem::temp_directory_path() / ("varnel_sweep_" + std::to_string(::getpid()) + ".xml")).string();
    sim::writeProfileFile(m.held, path);
    std::ostringstream text;
    text << std::ifstream(path).rdbuf();
    std::filesystem::remove(path);
    return lines(text.str());
}

// The meter clock as the same setting: within an hour of each other.
bool sameClock(const Meter& a, const Meter& b) { return std::abs(long(a.clock) - long(b.clock)) <= 3600; }

// "" when both hold the same; else the first line that differs.
std::string meterDifference(const Meter& got, const Meter& want) {
    if (!sameClock(got, want)) return "the clock";
    return got.held == want.held ? "" : firstDifference(lines(got), lines(want));
}

// The lines of got that are in neither of the others ("clock" for the clock), joined.
std::string linesOutside(const Meter& got, const Meter& a, const Meter& b) {
    std::string out;
    if (got.held != a.held && got.held != b.held) {
        const std::vector<std::string> inA = lines(a), inB = lines(b);
        for (const std::string& line : lines(got))
            if (std::ranges::find(inA, line) == inA.end() && std::ranges::find(inB, line) == inB.end())
                out += "\n  " + line;
    }
    if (!sameClock(got, a) && !sameClock(got, b)) out += "\n  clock";
    return out;
}

// "" when the first failure report (non-zero codes) begins as one of the alternatives; else what is wrong.
std::string statusProblem(const XMLWrapper& status, const std::string& begins) {
    for (const std::string& report : statusGroups(status)) {
        if (report.starts_with("0/0/")) continue;
        if (report.starts_with("0/")) return "a failure reported under major code 0: `" + report + "`";
        const std::string said = report.substr(report.find('/', report.find('/') + 1) + 1);
        for (std::size_t from = 0, to; from <= begins.size(); from = to + 1) {
            to = std::min(begins.find('|', from), begins.size());
            if (said.compare(0, to - from, begins, from, to - from) == 0) return "";
        }
        return "the failure described as `" + said + "`, not `" + begins + "…`";
    }
    return "no failure report in the status";
}

// The Major code of the last report, 0 when there is none.
std::int32_t summaryCode(const XMLWrapper& status) {
    const std::vector<std::string> reports = statusGroups(status);
    return reports.empty() ? 0 : std::stoi(reports.back());
}

class FaultSweep : public ::testing::TestWithParam<std::tuple<std::size_t, int>> {
protected:
    const Request& request() const { return kRequests[std::get<0>(GetParam())]; }
    Call call() const { return request().call; }
    int type() const { return std::get<1>(GetParam()); }

    void TearDown() override {
        vx_set_yield_hook(nullptr, nullptr);
        sim::reset();
        setThreadClock(nullptr);
    }

    // Runs a request once on a fresh meter of the type, with the fault if one is given.
    Outcome run(Call call, const std::optional<Fault>& fault, const std::string& settings) {
        setThreadClock(std::make_shared<ManualClock>(1000));
        sim::loadProfile(sim::defaultProfile(type()));
        detail::SetContinueFlag(true);
        Outcome o;
        DllWrapper wrapper = detail::wrapperOver(simTransport());
        METER_REC rec{};
        XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status), out;
        if (call != Call::discover && makeCall(wrapper, Call::discover, rec, device, status, out, sim::meter().port)) {
            o.raised = "the meter was not found before the request";
            return o;
        }
        status = newDoc(doc_kind::status);
        out = clientDocument(call, settings);
        o.meterBefore = meterNow();
        std::map<std::string, int> before;
        for (const std::string& f : sim::faultableFunctions()) before[f] = sim::callCount(f);
        if (fault) sim::injectFault(fault->function, fault->nth, ME_COM_ERROR, fault->persistent);
        detail::errPropagator().reset();
        try {
            o.result = makeCall(wrapper, call, rec, device, status, out, sim::meter().port);
        } catch (const std::exception& e) {  // a ComponentError's text is its routine trace
            o.raised = std::string("exception ") + e.what();
        }
        sim::clearFaults();
        for (const std::string& f : sim::faultableFunctions())
            if (int n = sim::callCount(f) - before[f]) o.calls[f] = n;
        o.meterAfter = meterNow();
        o.output = call == Call::close ? (sim::portOpen() ? "port open" : "port released")
                   : out.IsEmpty()     ? ""
                                       : out.XML();
        o.status = status;
        const bool answered = o.raised.empty() && (o.result == ME_SUCCESS || o.result == ME_PARTIALSUCCESS);
        keepDocuments({&status, answered ? &out : nullptr});
        o.recovery = recover(wrapper);
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
            const std::size_t entries = childTexts(parsed(out)->document_element().child("Records")).size();
            if ((entries == 0) != (m.datalog.empty() && m.binaryDatalog.empty()))
                return "readings afterwards gave " + std::to_string(entries) + " entries";
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
        const std::int32_t result =
            o.result == ME_SUCCESS && call() == Call::setSettings ? summaryCode(o.status) : o.result;
        std::string wrong;
        auto add = [&](const std::string& w) { wrong += (wrong.empty() ? "" : "; ") + w; };
        if (result == ME_SUCCESS) {
            for (auto [what, difference] :
                 {std::pair{"document",
                            firstDifference(withoutClockValue(o.output), withoutClockValue(healthy.output))},
                  {"status", firstDifference(lines(o.status.XML()), lines(healthy.status.XML()))},
                  {"meter", meterDifference(o.meterAfter, healthy.meterAfter)}})
                if (!difference.empty()) add(std::string("returned 0 with another ") + what + ": " + difference);
        } else {
            const auto& says = request().says;
            const auto said = says.contains(function) ? says.find(function) : says.find("");
            std::string problem = "no report is expected when " + function + " fails";
            if (said != says.end()) problem = statusProblem(o.status, said->second);
            if (call() != Call::close && !problem.empty())  // closeMeter writes no report
                add("returned " + std::to_string(result) + " with " + problem);
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
    // The meter's own settings: what a client lists items from, or edits and sends back.
    std::string settings;
    if (call() == Call::setSettings || call() == Call::settingsListed || call() == Call::capsListed) {
        const Outcome read = run(Call::settings, std::nullopt, "");
        ASSERT_EQ(read.result, ME_SUCCESS) << read.raised << statusText(read.status);
        settings = call() == Call::setSettings ? editedSettings(read.output) : read.output;
    }

    const Outcome healthy = run(call(), std::nullopt, settings);
    ASSERT_EQ(healthy.raised + healthy.recovery, "");
    ASSERT_EQ(healthy.result, ME_SUCCESS);
    ASSERT_EQ(summaryCode(healthy.status), ME_SUCCESS) << statusText(healthy.status);
    ASSERT_FALSE(healthy.calls.empty());
    if (call() == Call::setSettings) {
        // The healthy write changes something of every kind the meter has: the clock, options, and on
        // type 7 the initialised flag (the first line), names, favourites, schedule and targets.
        EXPECT_FALSE(sameClock(healthy.meterAfter, healthy.meterBefore));
        const std::string changed = linesOutside(healthy.meterAfter, healthy.meterBefore, healthy.meterBefore);
        for (std::string kind :
             {"<option ", "<meter ", "<name ", "<insulins ", "<oralMeds ", "<schedule ", "<targets "})
            if (type() == eMorvex || (type() == 3 && kind == "<option ")) {
                EXPECT_NE(changed.find(kind), std::string::npos) << kind << " unchanged; changed:" << changed;
            }
    }

    std::string offences;
    int runs = 0, wrong = 0;
    for (const auto& [function, count] : healthy.calls)
        for (int k = 1; k <= count; ++k)
            for (bool persistent : {false, true}) {
                ++runs;
                const std::string w = judge(run(call(), Fault{function, k, persistent}, settings), healthy, function);
                if (w.empty()) continue;
                ++wrong;
                offences += std::string(request().name) + " type " + std::to_string(type()) + " " + function +
                            " call " + std::to_string(k) + "/" + std::to_string(count) +
                            (persistent ? " persistent: " : " once: ") + w + "\n";
            }
    RecordProperty("faulty_runs", runs);
    EXPECT_EQ(wrong, 0) << wrong << " of " << runs << " faulty runs went wrong:\n" << offences;
}

INSTANTIATE_TEST_SUITE_P(Requests, FaultSweep,
                         ::testing::Combine(::testing::Range<std::size_t>(0, kRequests.size()), ::testing::Range(1, 9)),
                         [](const auto& info) {
                             return std::string(kRequests[std::get<0>(info.param)].name) + "_type" +
                                    std::to_string(std::get<1>(info.param));
                         });

}  // namespace
}  // namespace varnel::test
