#include <gtest/gtest.h>

#include <algorithm>

#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Readings : WrapperTest {
    XMLWrapper datalog = newDoc(doc_kind::datalog);
    XMLWrapper filter = newDoc(doc_kind::filter);
    std::shared_ptr<pugi::xml_document> tree;  // the datalog the last read wrote
    bool checked = false;

    // Reads into the datalog, keeps it parsed and gives the next read an empty one.
    std::int32_t read() {
        const std::int32_t r = wrapper->getReadings(rec, device, datalog, filter, status, checked);
        tree = parsed(datalog);
        datalog = newDoc(doc_kind::datalog);
        return r;
    }
    // The transfer summary: the counts, then each unit as name=Txt.
    std::vector<std::string> summary() const {
        std::vector<std::string> out;
        pugi::xml_node detail = tree->document_element().child("TransferDetail");
        for (pugi::xml_node n : detail.child("Records").children()) out.push_back(n.child_value());
        for (pugi::xml_node n : detail.child("ExtraInfo").children())
            out.push_back(std::string(n.name()) + "=" + n.attribute("Txt").value());
        return out;
    }
    std::vector<pugi::xml_node> entries(const char* name = "") const {
        std::vector<pugi::xml_node> out;
        for (pugi::xml_node n : tree->document_element().child("Records").children())
            if (!*name || std::string(n.name()) == name) out.push_back(n);
        return out;
    }
    // Kind, value (an error's is its Txt), range, ordinal and date of an entry, against the meter's record.
    static std::string entry(pugi::xml_node n) {
        std::string out = std::string(n.name()) + " " + n.attribute("Val").value() + n.child_value("Txt");
        for (const char* a : {"Range", "Ord", "Y", "MM", "D", "h", "m", "s"})
            out += " " + std::string(n.attribute(a).value());
        return out;
    }
    static std::string expected(const char* kind, int value, const char* range, int ord, std::int32_t seconds) {
        TIME_REC t{};
        sim::fromSeconds(seconds, t);
        const std::string o = ord < 0 ? "" : std::to_string(ord);
        char text[96];
        std::snprintf(text, sizeof text, "%s %d %s %s %d %02d %d %d %d %d", kind, value, range, o.c_str(), t.year,
                      t.mon, t.mday, t.hour, t.min, t.sec);
        return text;
    }
};

TEST_F(Readings, RecordDatalogAsTheMeterHoldsIt) {
    discover(eDunmark);
    filter.AddElement("Anything", "is never read");
    expectExit(read(), ME_SUCCESS, "", false);
    EXPECT_TRUE(checked);

    const sim::MeterProfile meter = sim::meter();
    std::vector<data_rec> valid;
    std::copy_if(meter.datalog.begin(), meter.datalog.end(), std::back_inserter(valid),
                 [](const data_rec& e) { return e.Valid == 0; });
    const auto n = meter.datalog.size(), corrupted = n - valid.size();
    ASSERT_GT(corrupted, 0u);
    EXPECT_EQ(summary(),
              (std::vector<std::string>{std::to_string(n), std::to_string(valid.size()), std::to_string(corrupted),
                                        "255", "GlucCalib=Whole Blood", "GlucUnit=mg/dL"}));
    EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("SN"), meter.serial);
    // One entry per valid record, in order: meter errors as Error, every other test as Gluc; a HI or LO
    // reading says so, a measured one carries no range.
    const auto written = entries();
    ASSERT_EQ(written.size(), valid.size());
    for (std::size_t i = 0; i < valid.size(); ++i) {
        const std::int16_t f = valid[i].Test.Flags;
        EXPECT_EQ(entry(written[i]), expected(f == 3 ? "Error" : "Gluc", valid[i].Test.Result,
                                              f == 1   ? "High"
                                              : f == 2 ? "Low"
                                                       : "",
                                              -1, valid[i].D_Time));
    }
    EXPECT_TRUE(std::any_of(valid.begin(), valid.end(), [](const data_rec& e) { return e.Test.Flags == 1; }));
    EXPECT_TRUE(std::any_of(valid.begin(), valid.end(), [](const data_rec& e) { return e.Test.Flags == 2; }));
}

TEST_F(Readings, BinaryDatalogWithOrdinalsAndEveryUnit) {
    discover(eMorvex);
    ASSERT_EQ(read(), ME_SUCCESS);
    const sim::MeterProfile meter = sim::meter();
    const std::string n = std::to_string(meter.binaryDatalog.size());
    EXPECT_EQ(summary(), (std::vector<std::string>{n, n, "0", "1000", "GlucCalib=Plasma", "GlucUnit=mg/dL",
                                                   "OMedUnit=Each", "InsUnit=Units", "CholesUnit=mg/dL"}));
    std::vector<RECORD_DATA> glucose;
    std::copy_if(meter.binaryDatalog.begin(), meter.binaryDatalog.end(), std::back_inserter(glucose),
                 [](const RECORD_DATA& r) { return r.recType == 0; });
    const auto gluc = entries("Gluc");
    ASSERT_EQ(gluc.size(), glucose.size());
    for (std::size_t i = 0; i < glucose.size(); i += 5)
        EXPECT_EQ(entry(gluc[i]), expected("Gluc", glucose[i].reading, "", glucose[i].Ordinal, glucose[i].timeStamp));

    // Records damaged in the meter are counted once, apart from the valid ones.
    sim::MeterProfile damaged = meter;
    damaged.corruptedRecords = {3, 50, 100};
    discover(damaged);
    ASSERT_EQ(read(), ME_SUCCESS);
    std::vector<std::string> counts = summary();
    counts.resize(3);
    EXPECT_EQ(counts, (std::vector<std::string>{n, std::to_string(meter.binaryDatalog.size() - 3), "3"}));
}

// The device information and transport failures: device_info_test and the fault sweep.
TEST_F(Readings, ADatalogWithoutDeviceInfoIsAnUnexpectedError) {
    discover(eDunmark);
    // A datalog without DeviceInfo: the unexpected-error handler.
    fresh();
    datalog = newDoc(doc_kind::filter);
    EXPECT_EQ(unexpectedTrace([&] { read(); }), "91 getReadings --> ");
    expectUnexpected("Unknown status;Error number = 91 Error description = ");
}

// A record that cannot be read or dated is lost alone: every other entry is written with
// its own date, the counts add up, and the request fails saying how many records were lost.
TEST_F(Readings, UnreadableRecordsAreCountedAndReportedWithEveryOtherEntryKept) {
    // A binary datalog of plain glucose tests: one entry per record, in record order.
    sim::MeterProfile binary = sim::defaultProfile(eMorvex);
    binary.binaryDatalog.clear();
    for (std::int16_t i = 0; i < 8; ++i) {
        RECORD_DATA& r = binary.binaryDatalog.emplace_back();
        r.timeStamp = sim::secondsOf(2004, 3, 1 + i, 8, 30, i), r.Ordinal = i, r.reading = 100 + i;
    }
    struct Case {
        int type;
        const char* function;
        int record;       // the record whose read fails, 0-based among the records that are read
        int tries;        // failing calls from that record's first one: 1 is retried, 2 loses it
        bool persistent;  // every later call fails too: every record from there on is lost
    };
    // A failure that is retried once loses nothing: the fault sweep. Here, records lost for good.
    for (const Case& c : {Case{eDunmark, "convert_from_seconds", 5, 2, false},
                          {eDunmark, "convert_from_seconds", 30, 1, true},
                          {eMorvex, "GetMeterDatalogRecordData", 4, 2, false},
                          {eMorvex, "GetMeterDatalogRecordData", 2, 1, true},
                          {eMorvex, "convert_from_seconds", 3, 1, true}}) {
        SCOPED_TRACE(std::to_string(c.type) + " " + c.function + " " + std::to_string(c.record));
        c.type == eMorvex ? discover(binary) : discover(c.type);
        const auto texts = [this] {
            std::vector<std::string> out;
            for (pugi::xml_node n : entries()) out.push_back(nodeText(n));
            return out;
        };
        ASSERT_EQ(read(), ME_SUCCESS);
        std::vector<std::string> counts = summary(), kept = texts();
        const int lost = c.persistent ? std::stoi(counts[1]) - c.record : 1;
        kept.erase(kept.begin() + c.record, kept.begin() + c.record + lost);
        counts[1] = std::to_string(std::stoi(counts[1]) - lost);
        counts[2] = std::to_string(std::stoi(counts[2]) + lost);

        fresh();
        // A failing call and its retry are the record's two calls.
        for (int i = 0; i < c.tries; ++i) sim::injectFault(c.function, c.record + 1, ME_TIME_OUT, c.persistent);
        expectExit(read(), ME_TIME_OUT,
                   "-17/-2/Timeout error ; " + std::to_string(lost) + " of " + counts[0] + " records could not be read",
                   false);
        sim::clearFaults();
        EXPECT_EQ(texts(), kept);
        EXPECT_EQ(summary(), counts);
    }
}

}  // namespace
