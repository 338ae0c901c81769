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
    std::int32_t read(const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        const std::int32_t r = wrapper->getReadings(rec, doc, datalog, filter, status, checked);
        tree = parsed(datalog);
        datalog = newDoc(doc_kind::datalog);
        return r;
    }
    std::int32_t read() { return read("1", sim::meter().serial, std::to_string(sim::meter().type)); }
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
    // Value and date of an entry (an error's value is its Txt), against the meter's value and time.
    static std::string entry(pugi::xml_node n) {
        std::string out = std::string(n.attribute("Val").value()) + n.child_value("Txt");
        for (const char* a : {"Y", "MM", "D", "h", "m", "s"}) out += std::string(" ") + n.attribute(a).value();
        return out;
    }
    static std::string expected(int value, std::int32_t seconds) {
        TIME_REC t{};
        sim::fromSeconds(seconds, t);
        char text[64];
        std::snprintf(text, sizeof text, "%d %d %02d %d %d %d %d", value, t.year, t.mon, t.mday, t.hour, t.min, t.sec);
        return text;
    }
};

TEST_F(Readings, RecordDatalogAsTheMeterHoldsIt) {
    discover(eDunmark);
    filter.AddElement("Anything", "is never read");
    expectExit(read(), ME_SUCCESS, "", false);
    EXPECT_TRUE(checked);
    // The upload reports into 0-50, the conversion into 50-100 in steps of 10, never its own 100.
    ASSERT_FALSE(progress.empty());
    EXPECT_TRUE(std::is_sorted(progress.begin(), progress.end()));
    EXPECT_TRUE(progress.front() > 0 && progress.front() <= 50) << progress.front();
    EXPECT_GE(std::count_if(progress.begin(), progress.end(), [](int p) { return p > 50; }), 5);
    EXPECT_GE(progress.back(), 90);

    const sim::MeterProfile meter = sim::meter();
    std::vector<data_rec> valid;
    std::copy_if(meter.datalog.begin(), meter.datalog.end(), std::back_inserter(valid),
                 [](const data_rec& e) { return e.Valid == 0; });
    const auto n = meter.datalog.size(), corrupted = n - valid.size();
    ASSERT_GT(corrupted, 0u);
    EXPECT_EQ(summary(), (std::vector<std::string>{std::to_string(n), std::to_string(valid.size()),
                                                   std::to_string(corrupted), "255", "GlucCalib=Whole Blood",
                                                   "GlucUnit=mg/dL"}));
    EXPECT_EQ(tree->document_element().child("DeviceInfo").child_value("SN"), meter.serial);
    // One entry per valid record, in order: meter errors as Error, every other test as Gluc.
    const auto written = entries();
    ASSERT_EQ(written.size(), valid.size());
    for (std::size_t i = 0; i < valid.size(); ++i) {
        const bool error = valid[i].Test.Flags == 3;
        EXPECT_STREQ(written[i].name(), error ? "Error" : "Gluc") << i;
        EXPECT_EQ(entry(written[i]), expected(valid[i].Test.Result, valid[i].D_Time)) << i;
    }
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
    for (std::size_t i = 0; i < glucose.size(); i += 5) {
        EXPECT_EQ(entry(gluc[i]), expected(glucose[i].reading, glucose[i].timeStamp)) << i;
        EXPECT_EQ(gluc[i].attribute("Ord").as_int(), glucose[i].Ordinal) << i;
    }

    // Records damaged in the meter are counted once, apart from the valid ones.
    sim::MeterProfile damaged = meter;
    damaged.corruptedRecords = {3, 50, 100};
    discover(damaged);
    ASSERT_EQ(read(), ME_SUCCESS);
    std::vector<std::string> counts = summary();
    counts.resize(3);
    EXPECT_EQ(counts, (std::vector<std::string>{n, std::to_string(meter.binaryDatalog.size() - 3), "3"}));

    discover(eCVPellis);
    ASSERT_EQ(read(), ME_SUCCESS);
    EXPECT_EQ(summary().back(), "InsUnit=Units");
}

TEST_F(Readings, EveryExit) {
    discover(eDunmark);
    const std::string sn = sim::meter().serial, bad = "-17/-19/Bad parameter passed to the function ; ";
    const std::string other = "-8/-8/Different device detected ; Device ";
    const std::string upload = "-17/-2/Timeout error ; GetReadingFromMeter failed";
    const std::vector<data_rec> held = sim::meter().datalog;
    const auto records = static_cast<std::size_t>(
        std::count_if(held.begin(), held.end(), [](const data_rec& e) { return e.Valid == 0; }));
    struct Case {
        std::string sn, type, group;
        std::int32_t result;
        bool closes;
        std::size_t entries = 0;
        const char* fault = nullptr;  // transport function failing once with the result
        std::int16_t keep = 0;
        std::string port = "1";
    };
    for (const Case& c : {
             Case{sn, "3", bad + "Port number from XML file is invalid", ME_BAD_PARAMETER, false, 0, nullptr, 0, "-1"},
             Case{"", "3", bad + "Device SN from Device Info XML is invalid", ME_BAD_PARAMETER, true},
             Case{sn, "9", bad + "Device Type from Device Info XML is invalid", ME_BAD_PARAMETER, true},
             Case{sn, "3", upload, ME_TIME_OUT, true, 0, "vb_Upload_Meter_Datalog"},
             Case{sn, "3", upload, ME_TIME_OUT, false, 0, "vb_Upload_Meter_Datalog", -50},
             Case{sn, "3", "-17/-3/Communication error", ME_COM_ERROR, false, records, "vb_Chk4Meter"},
             Case{"OTHER1", "3",
                  other + "SN from Device Info XML - OTHER1 Device SN from device - " + sn + " do not match",
                  ME_DIFFERENT_DEVICE, false, records},
             Case{sn, "7", other + "Type from Device Info XML - 7 Device Type from device - 3 do not match", ME_FAIL,
                  false, records},
         }) {
        SCOPED_TRACE(c.group);
        if (c.fault) sim::injectFault(c.fault, 1, static_cast<std::int16_t>(c.result), false);
        fresh();
        rec.Error_code = c.keep;
        expectExit(read(c.port, c.sn, c.type), c.result, c.group, c.closes);
        EXPECT_EQ(entries().size(), c.entries);
        EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    }

    // A datalog without DeviceInfo: the unexpected-error handler.
    fresh();
    datalog = newDoc(doc_kind::filter);
    EXPECT_EQ(unexpectedTrace([&] { read(); }), "91 getReadings --> ");
    expectUnexpected("Unknown status;Error number = 91 Error description = ");
}

// The transport library itself, found where a client's DllWrapper looks by default.
TEST(ReadingsOverTheTransportLibrary, DiscoverAndRead) {
    setThreadClock(std::make_shared<ManualClock>(1000));
    DllWrapper wrapper;
    METER_REC rec{};
    XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status);
    XMLWrapper conn = connectionDoc("1"), datalog = newDoc(doc_kind::datalog), filter = newDoc(doc_kind::filter);
    bool checked = false;
    ASSERT_EQ(wrapper.discoverDevice(rec, device, conn, status), ME_SUCCESS);
    ASSERT_EQ(wrapper.getReadings(rec, device, datalog, filter, status, checked), ME_SUCCESS);
    EXPECT_EQ(parsed(datalog)->first_element_by_path("Datalog/TransferDetail/Records/Total").text().as_uint(),
              sim::defaultProfile(eMorvex).binaryDatalog.size());
    EXPECT_EQ(wrapper.closeMeter(rec), ME_SUCCESS);
    setThreadClock(nullptr);
}

}  // namespace
