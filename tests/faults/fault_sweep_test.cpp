// Every public request on simulated meters, with each transport call failing in
// turn, once and from then on. A request may fail, but it must say so: it
// returns 0 only when it wrote what a healthy run writes and the meter holds
// what a healthy run leaves; otherwise it writes a well-formed report with a
// non-zero code. A failed erase loses nothing, and the session recovers.
#include <gtest/gtest.h>

#include <pugixml.hpp>

#include <cstdlib>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <sstream>
#include <string>
#include <vector>

#include "errors/err_propagator.h"
#include "simulator.h"
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
    bool needsDiscovery = true;
    bool hasStatus = true;
    // Runs the request; the answer document goes to out. settings is the meter's
    // own settings document (edited for setDeviceSettings).
    std::function<std::int32_t(DllWrapper&, METER_REC&, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
                               const std::string& settings)>
        run;
};

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

XMLWrapper listing(std::int32_t kind, const std::vector<std::string>& settings,
                   const std::vector<std::string>& records) {
    XMLWrapper doc = newDoc(kind);
    doc.SelectElement("Settings");
    for (const std::string& s : settings) doc.AddElement(s);
    if (!records.empty()) {
        doc.SelectElement("Records");
        for (const std::string& r : records) doc.AddElement(r);
    }
    return doc;
}

// Every other item of a settings document, the clock always: what a client lists.
std::vector<std::string> someItems(const std::string& settings) {
    pugi::xml_document doc;
    doc.load_string(settings.c_str());
    std::vector<std::string> names;
    int i = 0;
    for (pugi::xml_node n : doc.child("DeviceSettings").child("Settings").children())
        if (i++ % 2 == 0 || std::string(n.name()) == "Clock") names.push_back(n.name());
    return names;
}

std::vector<std::string> lines(const std::string& text) {
    std::vector<std::string> result;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) result.push_back(line);
    return result;
}

const std::vector<Request>& requests() {
    static const std::vector<Request> all = {
        {"discoverDevice", false, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper&, XMLWrapper& status, XMLWrapper& out, const std::string&) {
             out = newDoc(doc_kind::device_info);
             XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
             return w.discoverDevice(rec, out, conn, status);
         }},
        {"getDeviceSettingsAll", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string&) {
             out = newDoc(doc_kind::device_settings);
             bool check = true;
             return w.getDeviceSettings(rec, device, out, true, status, check);
         }},
        {"getDeviceSettingsListed", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string& settings) {
             out = listing(doc_kind::device_settings, someItems(settings), {});
             bool check = true;
             return w.getDeviceSettings(rec, device, out, false, status, check);
         }},
        {"getDeviceCapsAll", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string&) {
             out = newDoc(doc_kind::device_caps);
             bool check = true;
             return w.getDeviceCaps(rec, device, out, true, status, check);
         }},
        {"getDeviceCapsListed", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string& settings) {
             out = listing(doc_kind::device_caps, someItems(settings), {"Gluc"});
             bool check = true;
             return w.getDeviceCaps(rec, device, out, false, status, check);
         }},
        {"setDeviceSettings", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string& settings) {
             out = XMLWrapper();
             if (!out.LoadXML(settings)) throw std::runtime_error("the settings document does not load");
             return w.setDeviceSettings(rec, device, out, status);
         }},
        {"getReadings", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string&) {
             out = newDoc(doc_kind::datalog);
             XMLWrapper filter = newDoc(doc_kind::filter);
             bool check = true;
             return w.getReadings(rec, device, out, filter, status, check);
         }},
        {"clearMeter", true, true,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper& device, XMLWrapper& status, XMLWrapper& out,
            const std::string&) {
             out = XMLWrapper();
             return w.clearMeter(rec, device, status);
         }},
        {"closeMeter", true, false,
         [](DllWrapper& w, METER_REC& rec, XMLWrapper&, XMLWrapper&, XMLWrapper& out, const std::string&) {
             out = XMLWrapper();
             return w.closeMeter(rec);
         }},
    };
    return all;
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
    if (pugi::xml_node clock = s.child("Clock").child("Val")) {
        clock.attribute("D").set_value("15");
        clock.attribute("MM").set_value("06");
        clock.attribute("Y").set_value("2012");
        clock.attribute("h").set_value("10");
        clock.attribute("m").set_value("20");
        clock.attribute("s").set_value("30");
    }
    set("CC", "9");
    set("Beep", "0");
    set("DevInit", "0");
    set("GlucUnit", "1");
    set("DateFormat", "1");
    set("TimeFormat", "1");
    set("EvtAvgDurn", "3");
    set("WeekBegin", "0");
    set("CholesUnit", "1");
    set("PumpUse", "1");
    set("ShowLastResult", "0");
    set("DaysAveraged", "1");
    if (pugi::xml_node lang = s.child("Language"); lang && lang.attribute("Mode").as_int() == 1)
        lang.attribute("Val").set_value("2");
    for (pugi::xml_node n : s.child("Insulins").child("Custom").children())
        if (n.text().as_int() == 12)
            n.attribute("Txt").set_value("Night");
        else if (n.text().as_int() == 13)
            n.attribute("Txt").set_value("BolusX");
    for (pugi::xml_node n : s.child("Pills").child("Custom").children())
        if (n.text().as_int() == 7) n.attribute("Txt").set_value("Noon");
    if (pugi::xml_node fav = s.child("Insulins").child("Favorite")) {
        pugi::xml_node n = fav.first_child();
        for (const char* v : {"9", "12", "1"}) {
            if (!n) n = fav.append_child("Insulin");
            n.text().set(v);
            n = n.next_sibling();
        }
    }
    if (pugi::xml_node fav = s.child("Pills").child("Favorite")) {
        pugi::xml_node n = fav.first_child();
        for (const char* v : {"2", "7", "6"}) {
            if (!n) n = fav.append_child("Pill");
            n.text().set(v);
            n = n.next_sibling();
        }
    }
    if (pugi::xml_node sched = s.child("Schedule")) {
        sched.child("PreB").attribute("m").set_value("30");
        sched.child("PostD").attribute("m").set_value("15");
    }
    set("Targets/PreMealLow", "75");
    set("Targets/Hypo", "65");
    std::ostringstream out;
    doc.save(out, "  ", pugi::format_default | pugi::format_no_declaration);
    return out.str();
}

// One thing the meter holds, compared on its own.
struct MeterItem {
    std::string name;
    std::function<bool(const sim::MeterProfile&, const sim::MeterProfile&)> same;
};

// A whole member, compared through the profile's own comparison (records have none of their own).
template <class M>
MeterItem whole(std::string name, M sim::MeterProfile::*member) {
    return {std::move(name), [member](const sim::MeterProfile& a, const sim::MeterProfile& b) {
                sim::MeterProfile x = b;
                x.*member = a.*member;
                return x == b;
            }};
}

template <class V>
MeterItem slot(std::string name, V sim::MeterProfile::*member, std::size_t i) {
    return {std::move(name), [member, i](const sim::MeterProfile& a, const sim::MeterProfile& b) {
                const auto& va = a.*member;
                const auto& vb = b.*member;
                if (i >= va.size() || i >= vb.size()) return va.size() == vb.size();
                return va[i] == vb[i];
            }};
}

const std::vector<MeterItem>& meterItems() {
    static const std::vector<MeterItem> items = [] {
        using P = sim::MeterProfile;
        std::vector<MeterItem> v = {
            whole("type", &P::type),
            whole("port", &P::port),
            whole("serial", &P::serial),
            whole("identity serial", &P::identitySerial),
            whole("firmware", &P::firmware),
            whole("name", &P::name),
            whole("languages", &P::languages),
            whole("events", &P::events),
            whole("insulin kinds", &P::insulinKinds),
            whole("plasma flag", &P::plasmaCalibrated),
            whole("initialised flag", &P::initializedFlag),
            whole("capacity", &P::maxRecords),
            whole("datalog", &P::datalog),
            whole("binary datalog", &P::binaryDatalog),
            whole("damaged records", &P::corruptedRecords),
            whole("favourite insulins", &P::favoriteInsulins),
            whole("favourite oral meds", &P::favoriteOralMeds),
            whole("schedule selection", &P::scheduleSelection),
            whole("meal segments", &P::mealSegments),
            whole("targets", &P::targets),
            whole("attached", &P::attached),
        };
        for (std::size_t i = 0; i < sim::kOptionCount; ++i)
            v.push_back(slot("option " + std::to_string(i), &P::options, i));
        for (std::size_t i = 0; i < sim::kInsulinSlots; ++i)
            v.push_back(slot("insulin name " + std::to_string(i + 1), &P::insulinNames, i));
        for (std::size_t i = 0; i < sim::kOralMedSlots; ++i)
            v.push_back(slot("oral med name " + std::to_string(i + 1), &P::oralMedNames, i));
        return v;
    }();
    return items;
}

// The meter clock as the same setting: within an hour of each other.
bool sameClock(const sim::MeterProfile& a, const sim::MeterProfile& b) {
    return std::abs(static_cast<long>(a.clock) - static_cast<long>(b.clock)) <= 3600;
}

// Names of the items in which got differs from want.
std::string meterDifferences(const sim::MeterProfile& got, const sim::MeterProfile& want) {
    std::string out;
    for (const MeterItem& item : meterItems())
        if (!item.same(got, want)) out += (out.empty() ? "" : ", ") + item.name;
    if (!sameClock(got, want)) out += (out.empty() ? "" : ", ") + std::string("clock");
    return out;
}

// Items that are neither as they were nor as a healthy run leaves them.
std::string meterInvented(const sim::MeterProfile& got, const sim::MeterProfile& before,
                          const sim::MeterProfile& healthy) {
    std::string out;
    for (const MeterItem& item : meterItems())
        if (!item.same(got, before) && !item.same(got, healthy)) out += (out.empty() ? "" : ", ") + item.name;
    if (!sameClock(got, before) && !sameClock(got, healthy)) out += (out.empty() ? "" : ", ") + std::string("clock");
    return out;
}

// "" when the status holds at least one complete report with a non-zero code and
// every report is complete (integer Major and Minor, a description); else what is wrong.
std::string statusProblem(const std::string& xml) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) return "status is not a document";
    bool failure = false;
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
        failure = failure || ma != 0 || mi != 0;
    }
    if (groups == 0) return "no report in the status";
    if (!failure) return "only success reports in the status";
    return "";
}

// The Major code of the last report in the status, 0 when there is none.
std::int32_t summaryCode(const std::string& xml) {
    pugi::xml_document doc;
    doc.load_string(xml.c_str());
    std::int32_t code = 0;
    for (pugi::xml_node n : doc.document_element().children("ErrCode")) code = n.child("Major").text().as_int();
    return code;
}

// The first line in which two printed documents differ.
std::string firstDifference(const std::string& got, const std::string& want) {
    const std::vector<std::string> a = lines(got), b = lines(want);
    for (std::size_t i = 0; i < std::max(a.size(), b.size()); ++i) {
        const std::string x = i < a.size() ? a[i] : "(end)", y = i < b.size() ? b[i] : "(end)";
        if (x != y) return "line " + std::to_string(i + 1) + ": got `" + x + "`, healthy `" + y + "`";
    }
    return "";
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
    int type() const { return GetParam().type; }
    bool usesSettings() const {
        const std::string name = request().name;
        return name == "setDeviceSettings" || name == "getDeviceSettingsListed" || name == "getDeviceCapsListed";
    }

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
            if (request().needsDiscovery) {
                XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
                if (wrapper.discoverDevice(rec, device, conn, status) != ME_SUCCESS) {
                    o.raised = "the meter was not found before the request";
                    return o;
                }
                status = newDoc(doc_kind::status);
            }
            o.meterBefore = sim::meter();
            std::map<std::string, int> before;
            for (const std::string& f : sim::faultableFunctions()) before[f] = sim::callCount(f);
            if (fault) sim::injectFault(fault->function, fault->nth, kFaultCode, fault->persistent);
            detail::errPropagator().reset();
            try {
                o.result = request().run(wrapper, rec, device, status, out, settings);
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
            if (request().name == std::string("closeMeter")) o.output = sim::portOpen() ? "port open" : "port released";
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
            XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status);
            XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
            if (std::int32_t r = wrapper.discoverDevice(rec, device, conn, status))
                return "discovery afterwards returned " + std::to_string(r) + " " + statusText(status);
            XMLWrapper datalog = newDoc(doc_kind::datalog), filter = newDoc(doc_kind::filter);
            bool check = true;
            if (std::int32_t r = wrapper.getReadings(rec, device, datalog, filter, status, check))
                return "readings afterwards returned " + std::to_string(r) + " " + statusText(status);
            const sim::MeterProfile m = sim::meter();
            const bool empty = m.datalog.empty() && m.binaryDatalog.empty();
            if ((entryCount(datalog) == 0) != empty)
                return "readings afterwards gave " + std::to_string(entryCount(datalog)) + " entries";
            wrapper.closeMeter(rec);
        } catch (const std::exception& e) {
            return std::string("recovery raised ") + e.what();
        }
        return "";
    }

    // What is wrong with a faulty run, judged against the healthy one; "" when nothing.
    std::string judge(const Outcome& o, const Outcome& healthy) const {
        if (!o.raised.empty()) return "raised " + o.raised;
        // A settings write returns 0 whenever it walked the whole document; its summary report tells how it went.
        std::int32_t result = o.result;
        if (result == ME_SUCCESS && request().name == std::string("setDeviceSettings")) result = summaryCode(o.status);
        std::string wrong;
        auto add = [&](const std::string& w) { wrong += (wrong.empty() ? "" : "; ") + w; };
        if (result == ME_SUCCESS) {
            if (o.output != healthy.output)
                add("returned 0 with another document (" + firstDifference(o.output, healthy.output) + ")");
            if (o.status != healthy.status)
                add("returned 0 with another status (" + firstDifference(o.status, healthy.status) + ")");
            if (std::string d = meterDifferences(o.meterAfter, healthy.meterAfter); !d.empty())
                add("returned 0 but the meter differs in " + d);
        } else {
            if (request().hasStatus)
                if (std::string p = statusProblem(o.status); !p.empty())
                    add("returned " + std::to_string(result) + " with " + p);
            if (std::string d = meterInvented(o.meterAfter, o.meterBefore, healthy.meterAfter); !d.empty())
                add("returned " + std::to_string(result) + "; meter neither as before nor as asked in " + d);
            if (request().name == std::string("clearMeter") &&
                meterDifferences(o.meterAfter, o.meterBefore).find("datalog") != std::string::npos)
                add("a failed erase lost records");
        }
        if (!o.recovery.empty()) add(o.recovery);
        return wrong;
    }
};

TEST_P(FaultSweep, EveryFailureIsReportedAndNothingIsLost) {
    // The meter's own settings document: what a client lists items from, or edits and sends back.
    std::string settings;
    if (usesSettings()) {
        sim::loadProfile(sim::defaultProfile(type()));
        const Request& get = requests()[1];  // getDeviceSettings, every item
        setThreadClock(std::make_shared<ManualClock>(1000));
        DllWrapper wrapper = detail::wrapperOver(simTransport());
        METER_REC rec{};
        XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status), cfg;
        XMLWrapper conn = connectionDoc(std::to_string(sim::meter().port));
        ASSERT_EQ(wrapper.discoverDevice(rec, device, conn, status), ME_SUCCESS);
        ASSERT_EQ(get.run(wrapper, rec, device, status, cfg, ""), ME_SUCCESS) << statusText(status);
        settings = request().name == std::string("setDeviceSettings") ? editedSettings(cfg.XML()) : cfg.XML();
    }

    const Outcome healthy = run(std::nullopt, settings);
    ASSERT_EQ(healthy.raised, "");
    ASSERT_EQ(healthy.result, ME_SUCCESS) << healthy.status;
    ASSERT_EQ(summaryCode(healthy.status), ME_SUCCESS) << healthy.status;
    ASSERT_EQ(healthy.recovery, "");
    ASSERT_FALSE(healthy.calls.empty());
    if (request().name == std::string("setDeviceSettings")) {
        // The healthy write changes something of every kind the meter has.
        const std::string changed = meterDifferences(healthy.meterAfter, healthy.meterBefore);
        EXPECT_NE(changed.find("clock"), std::string::npos) << changed;
        if (type() == eMorvex || type() == 3) {
            EXPECT_NE(changed.find("option"), std::string::npos) << changed;
        }
        if (type() == eMorvex) {
            for (const char* kind : {"insulin name", "oral med name", "favourite insulins", "favourite oral meds",
                                     "meal segments", "targets", "initialised flag"})
                EXPECT_NE(changed.find(kind), std::string::npos) << kind << " unchanged; changed: " << changed;
        }
    }

    std::vector<std::string> offences;
    int runs = 0;
    for (const auto& [function, count] : healthy.calls)
        for (int k = 1; k <= count; ++k)
            for (bool persistent : {false, true}) {
                const Outcome o = run(Fault{function, k, persistent}, settings);
                ++runs;
                if (std::string wrong = judge(o, healthy); !wrong.empty())
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
