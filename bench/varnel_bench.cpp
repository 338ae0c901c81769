// Costs of the component's requests on the simulated meters (manual clock, so
// no simulated line time is ever waited for), the simulator's own share of an
// upload, and the floor: raw pugixml building the same datalog. After the run
// it prints the figures docs/performance.md tracks, each a ratio or a count
// taken within this one run, so runs on one machine compare.
#include <benchmark/benchmark.h>

#include <pugixml.hpp>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <map>
#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "component/wrapper_access.h"
#include "platform/message_pump.h"
#include "simulator.h"
#include "support/sim_transport.h"
#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/vantrix32.h"
#include "varnel/xml_wrapper.h"

// --- every heap allocation of the process, pugixml's pages included ---

namespace {
std::uint64_t gAllocations = 0;

void* counted(std::size_t n) {
    ++gAllocations;
    return std::malloc(n ? n : 1);
}
void* pugiAllocate(std::size_t n) { return counted(n); }
}  // namespace

void* operator new(std::size_t n) {
    if (void* p = counted(n)) return p;
    throw std::bad_alloc();
}
void* operator new[](std::size_t n) { return operator new(n); }
void operator delete(void* p) noexcept { std::free(p); }
void operator delete[](void* p) noexcept { std::free(p); }
void operator delete(void* p, std::size_t) noexcept { std::free(p); }
void operator delete[](void* p, std::size_t) noexcept { std::free(p); }

namespace {

using namespace varnel;

[[noreturn]] void fail(const std::string& what) {
    std::fprintf(stderr, "varnel_bench: %s\n", what.c_str());
    std::exit(2);
}

XMLWrapper newDoc(std::int32_t kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

// --- the meters ---

// The default type-7 meter with its memory full: its records repeated, each copy
// three weeks earlier, until the binary datalog has no room for another record.
sim::MeterProfile fullBinaryMeter() {
    sim::MeterProfile p = sim::defaultProfile(eMorvex);
    const std::vector<RECORD_DATA> weeks = p.binaryDatalog;
    std::vector<RECORD_DATA> all = weeks;
    for (std::int32_t shift = 21 * 86400;; shift += 21 * 86400) {
        std::vector<RECORD_DATA> earlier = weeks;
        for (RECORD_DATA& r : earlier) r.timeStamp -= shift;
        earlier.insert(earlier.end(), all.begin(), all.end());
        if (sim::encodedSize(earlier) <= sizeof(METER_BIN_DATALOG::binBuf)) {
            all = std::move(earlier);
            continue;
        }
        // The last copy fits only in part: its latest records go in first.
        for (auto r = weeks.rbegin(); r != weeks.rend(); ++r) {
            RECORD_DATA one = *r;
            one.timeStamp -= shift;
            all.insert(all.begin(), one);
            if (sim::encodedSize(all) > sizeof(METER_BIN_DATALOG::binBuf)) {
                all.erase(all.begin());
                break;
            }
        }
        break;
    }
    p.binaryDatalog = all;
    p.maxRecords = static_cast<std::int16_t>(all.size());
    return p;
}

// The default type-1 meter with all 255 entries of its record datalog taken.
sim::MeterProfile fullRecordMeter() {
    sim::MeterProfile p = sim::defaultProfile(1);
    const std::vector<data_rec> weeks = p.datalog;
    std::vector<data_rec> all;
    for (std::int32_t shift = 0; all.size() < 255; shift += 30 * 86400)
        for (auto r = weeks.rbegin(); r != weeks.rend() && all.size() < 255; ++r) {
            data_rec one = *r;
            one.D_Time -= shift;
            all.insert(all.begin(), one);
        }
    p.datalog = all;
    p.maxRecords = 255;
    return p;
}

// The meter in the simulator, on the thread's manual clock, before a component exists.
struct Loaded {
    std::shared_ptr<ManualClock> clock = std::make_shared<ManualClock>(1000);
    std::int32_t records = 0;

    explicit Loaded(const sim::MeterProfile& profile) {
        setThreadClock(clock);
        sim::loadProfile(profile);
        records = static_cast<std::int32_t>(profile.usesBinaryDatalog() ? profile.binaryDatalog.size()
                                                                         : profile.datalog.size());
    }
};

// A component discovering one meter.
struct Session : Loaded {
    DllWrapper component = detail::wrapperOver(test::simTransport());
    DllWrapper* wrapper = &component;
    METER_REC rec{};
    XMLWrapper device;

    explicit Session(const sim::MeterProfile& profile) : Loaded(profile) {
        if (discover() != ME_SUCCESS) fail("the simulated meter was not found");
    }
    std::int32_t discover() {
        device = newDoc(doc_kind::device_info);
        XMLWrapper conn = newDoc(doc_kind::connection_info);
        conn.SelectElement("Ports");
        conn.AddElement("COM");
        conn.AddChildElement("PortsToSearch", "", std::to_string(sim::meter().port));
        XMLWrapper status = newDoc(doc_kind::status);
        return wrapper->discoverDevice(rec, device, conn, status);
    }
    // One getReadings and the datalog as text, as a client would keep it.
    std::string readings() {
        XMLWrapper log = newDoc(doc_kind::datalog), filter = newDoc(doc_kind::filter);
        XMLWrapper status = newDoc(doc_kind::status);
        bool checked = false;
        if (wrapper->getReadings(rec, device, log, filter, status, checked) != ME_SUCCESS)
            fail("getReadings failed: " + status.XML());
        return log.XML();
    }
};

// The process has one simulator, so one session at a time: asking for the
// other meter replaces it.
Session& session(bool binary) {
    static std::unique_ptr<Session> current;
    static bool currentBinary = false;
    if (!current || currentBinary != binary) {
        current.reset();
        current = std::make_unique<Session>(binary ? fullBinaryMeter() : fullRecordMeter());
        currentBinary = binary;
    }
    return *current;
}
Session& binarySession() { return session(true); }
Session& recordSession() { return session(false); }

// Allocations of one iteration per record, as a counter.
void perRecord(benchmark::State& state, std::uint64_t allocations, std::int32_t records) {
    state.counters["records"] = records;
    state.counters["allocs/record"] =
        double(allocations) / double(state.iterations()) / double(records > 0 ? records : 1);
}

void BM_GetReadingsBinary(benchmark::State& state) {
    Session& s = binarySession();
    const std::uint64_t before = gAllocations;
    for (auto _ : state) benchmark::DoNotOptimize(s.readings());
    perRecord(state, gAllocations - before, s.records);
}

void BM_GetReadingsRecords(benchmark::State& state) {
    Session& s = recordSession();
    const std::uint64_t before = gAllocations;
    for (auto _ : state) benchmark::DoNotOptimize(s.readings());
    perRecord(state, gAllocations - before, s.records);
}

// --- the simulator alone: the transport calls getReadings makes, in its order ---

std::map<std::string, int> callCounts() {
    std::map<std::string, int> counts;
#define VARNEL_BENCH_COUNT(ret, name, ...) counts[#name] = sim::callCount(#name);
    VX_METER_FUNCTIONS(VARNEL_BENCH_COUNT)
#undef VARNEL_BENCH_COUNT
    return counts;
}

std::map<std::string, int> callsOf(const std::function<void()>& run) {
    const std::map<std::string, int> before = callCounts();
    run();
    std::map<std::string, int> calls = callCounts();
    for (auto& [name, n] : calls) n -= before.at(name);
    return calls;
}

// The transport sequence of a binary getReadings without the component.
struct BinaryTransportSequence {
    METER_REC rec;
    std::unique_ptr<METER_BIN_DATALOG> log = std::make_unique<METER_BIN_DATALOG>();
    RECORD_DATA record{};
    TIME_REC time{};

    void run() {
        // The component's message pump is its own share: the simulator yields to nothing here.
        vx_set_yield_hook(nullptr, nullptr);
        struct Restore {
            ~Restore() { vx_set_yield_hook(&detail::pumpFromTransport, nullptr); }
        } restore;
        METER_REC r = rec;
        initialize_meter_type_structure(&r, eMorvex);
        vb_Chk4Meter(&r);
        vb_Get_Meter_Firmware(&r);
        INSULIN_OR_ORAL_MED_NAME_TYPE name{};
        for (std::int16_t i = 1; i <= sim::kInsulinSlots; ++i) {
            name.index = i;
            GetInsulinName(&r, &name);
        }
        for (std::int16_t i = 1; i <= sim::kOralMedSlots; ++i) {
            name.index = i;
            GetOralMedicationName(&r, &name);
        }
        // The favourites, read once per slot.
        PREDEFINED_INSULINS_TYPE insulins{};
        for (int i = 0; i < 3; ++i) GetPredefinedInsulins(&r, &insulins);
        PREDEFINED_ORAL_MEDS_TYPE meds{};
        for (int i = 0; i < 5; ++i) GetPredefinedOralMeds(&r, &meds);
        TIME_REC start{0, 0, 0, 1, 1, 2000, 0, 0, 0};
        GetMeterDatalog(&r, log.get(), convert_to_seconds(&start));
        for (std::int16_t i = 0; i < log->recordCount; ++i) {
            GetMeterDatalogRecordData(log.get(), i, &record);
            convert_from_seconds(record.timeStamp, &time);
        }
    }
};

void BM_SimulatorBinary(benchmark::State& state) {
    Session& s = binarySession();
    BinaryTransportSequence seq{s.rec};
    const std::uint64_t before = gAllocations;
    for (auto _ : state) seq.run();
    perRecord(state, gAllocations - before, s.records);
}

// --- the floor: raw pugixml building the same datalog from ready-made values ---

struct Element {
    std::size_t parent;  // index into the list; the document element's is its own
    std::string name, text;
    std::vector<std::pair<std::string, std::string>> attributes;
};

std::vector<Element> elementsOf(const std::string& xml) {
    pugi::xml_document doc;
    if (!doc.load_string(xml.c_str())) fail("the datalog does not load");
    std::vector<Element> out;
    auto walk = [&](auto&& self, pugi::xml_node n, std::size_t parent) -> void {
        const std::size_t at = out.size();
        Element e{parent == SIZE_MAX ? at : parent, n.name(), n.child_value(), {}};
        for (pugi::xml_attribute a : n.attributes()) e.attributes.emplace_back(a.name(), a.value());
        out.push_back(std::move(e));
        for (pugi::xml_node c : n.children())
            if (c.type() == pugi::node_element) self(self, c, at);
    };
    walk(walk, doc.document_element(), SIZE_MAX);
    return out;
}

struct StringWriter : pugi::xml_writer {
    std::string out;
    void write(const void* data, std::size_t size) override { out.append(static_cast<const char*>(data), size); }
};

std::string rawDatalog(const std::vector<Element>& elements) {
    pugi::xml_document doc;
    std::vector<pugi::xml_node> nodes(elements.size());
    for (std::size_t i = 0; i < elements.size(); ++i) {
        const Element& e = elements[i];
        pugi::xml_node n = (e.parent == i ? pugi::xml_node(doc) : nodes[e.parent]).append_child(e.name.c_str());
        for (const auto& [name, value] : e.attributes) n.append_attribute(name.c_str()).set_value(value.c_str());
        if (!e.text.empty()) n.text().set(e.text.c_str());
        nodes[i] = n;
    }
    StringWriter w;
    doc.save(w, "  ", pugi::format_default | pugi::format_no_declaration, pugi::encoding_utf8);
    return std::move(w.out);
}

void BM_RawPugixmlBinary(benchmark::State& state) {
    Session& s = binarySession();
    const std::string reference = s.readings();
    const std::vector<Element> elements = elementsOf(reference);
    if (rawDatalog(elements) != reference) fail("raw pugixml does not build the identical datalog");
    const std::uint64_t before = gAllocations;
    for (auto _ : state) benchmark::DoNotOptimize(rawDatalog(elements));
    perRecord(state, gAllocations - before, s.records);
}

// --- the other requests ---

// A get-request in the all-information mode on a document of `kind`, and its text.
using GetRequest = std::int32_t (DllWrapper::*)(METER_REC&, XMLWrapper&, XMLWrapper&, bool, XMLWrapper&, bool&);

void getAll(benchmark::State& state, GetRequest request, std::int32_t kind, const char* name) {
    Session& s = binarySession();
    for (auto _ : state) {
        XMLWrapper doc = newDoc(kind), status = newDoc(doc_kind::status);
        bool checked = false;
        if ((s.wrapper->*request)(s.rec, s.device, doc, true, status, checked) != ME_SUCCESS)
            fail(std::string(name) + " failed: " + status.XML());
        benchmark::DoNotOptimize(doc.XML());
    }
}

void BM_GetDeviceSettings(benchmark::State& state) {
    getAll(state, &DllWrapper::getDeviceSettings, doc_kind::device_settings, "getDeviceSettings");
}

void BM_GetDeviceCaps(benchmark::State& state) {
    getAll(state, &DllWrapper::getDeviceCaps, doc_kind::device_caps, "getDeviceCaps");
}

void BM_Discover(benchmark::State& state) {
    Session& s = binarySession();
    for (auto _ : state)
        if (s.discover() != ME_SUCCESS) fail("discoverDevice failed");
}

// --- the figures of one run ---

// Keeps each benchmark's CPU time (its median when repeated) and counters.
class Figures : public benchmark::ConsoleReporter {
public:
    struct Figure {
        double cpu = 0;  // per iteration, in the benchmark's time unit
        std::map<std::string, double> counters;
        bool median = false;
    };
    std::map<std::string, Figure> byName;

    void ReportRuns(const std::vector<Run>& runs) override {
        for (const Run& r : runs) {
            const bool median = r.run_type == Run::RT_Aggregate && r.aggregate_name == "median";
            if (r.run_type == Run::RT_Aggregate && !median) continue;
            Figure& f = byName[r.run_name.function_name];
            if (f.median && !median) continue;
            f.cpu = r.GetAdjustedCPUTime();
            f.median = median;
            f.counters.clear();
            for (const auto& [name, c] : r.counters) f.counters[name] = c.value;
        }
        ConsoleReporter::ReportRuns(runs);
    }

    void summary() const {
        auto get = [&](const char* name) -> const Figure* {
            auto it = byName.find(name);
            return it == byName.end() ? nullptr : &it->second;
        };
        const Figure* whole = get("BM_GetReadingsBinary");
        const Figure* simulator = get("BM_SimulatorBinary");
        const Figure* raw = get("BM_RawPugixmlBinary");
        if (!whole || !simulator || !raw) return;
        const double component = whole->cpu - simulator->cpu;
        const double allocs = whole->counters.at("allocs/record") - simulator->counters.at("allocs/record");
        std::printf("\nFull binary datalog, %.0f records (CPU time, this run):\n", whole->counters.at("records"));
        std::printf("  component / raw pugixml           %6.2f   (target <= 2)\n", component / raw->cpu);
        std::printf("  with the simulator / raw pugixml  %6.2f\n", whole->cpu / raw->cpu);
        std::printf("  simulator share of the upload     %5.1f%%   (target < 33.3%%)\n",
                    100.0 * simulator->cpu / whole->cpu);
        std::printf("  component allocations per record  %6.2f   (target <= 3)\n", allocs);
        std::printf("  with the simulator                %6.2f\n", whole->counters.at("allocs/record"));
        std::printf("  raw pugixml allocations per record %5.2f\n", raw->counters.at("allocs/record"));
    }
};

}  // namespace

BENCHMARK(BM_GetReadingsBinary)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_SimulatorBinary)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_RawPugixmlBinary)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_GetReadingsRecords)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_GetDeviceSettings)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_GetDeviceCaps)->Unit(benchmark::kMicrosecond);
BENCHMARK(BM_Discover)->Unit(benchmark::kMicrosecond);

int main(int argc, char** argv) {
    pugi::set_memory_management_functions(pugiAllocate, std::free);
    benchmark::Initialize(&argc, argv);
    if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 1;
    // The simulator-alone sequence must be the one the component runs, call for call.
    Session& s = binarySession();
    BinaryTransportSequence seq{s.rec};
    const auto component = callsOf([&] { s.readings(); });
    const auto alone = callsOf([&] { seq.run(); });
    if (component != alone) {
        for (const auto& [name, n] : component)
            if (n != alone.at(name)) std::fprintf(stderr, "  %s: component %d, alone %d\n", name.c_str(), n, alone.at(name));
        fail("the simulator-alone sequence differs from getReadings' transport calls");
    }
    Figures figures;
    benchmark::RunSpecifiedBenchmarks(&figures);
    figures.summary();
    benchmark::Shutdown();
    return 0;
}
