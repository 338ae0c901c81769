#include <gtest/gtest.h>

#include <algorithm>
#include <set>

#include "component/err_propagator.h"
#include "platform/message_pump.h"
#include "support/wrapper_fixture.h"

using namespace varnel;
using namespace varnel::test;

namespace {

struct Readings : WrapperTest {
    XMLWrapper datalog = newDoc(doc_kind::datalog);
    XMLWrapper filter = newDoc(doc_kind::filter);
    bool checked = false;

    std::int32_t read(const std::string& port, const std::string& sn, const std::string& type) {
        XMLWrapper doc = deviceDoc(port, sn, type);
        return wrapper->getReadings(rec, doc, datalog, filter, status, checked);
    }
    // Reads with the device information that discovery wrote.
    std::int32_t read() {
        return read(std::to_string(sim::meter().port), sim::meter().serial, std::to_string(sim::meter().type));
    }
    static std::vector<pugi::xml_node> entries(const pugi::xml_document& doc) {
        std::vector<pugi::xml_node> out;
        for (pugi::xml_node n : doc.document_element().child("Records").children()) out.push_back(n);
        return out;
    }
    static std::string attr(pugi::xml_node n, const char* name) { return n.attribute(name).value(); }
    static std::string count(const pugi::xml_document& doc, const char* name) {
        return doc.document_element().child("TransferDetail").child("Records").child_value(name);
    }
    // The date attributes of an entry made from a meter time.
    static void expectDate(pugi::xml_node entry, std::int32_t seconds) {
        TIME_REC t{};
        ASSERT_TRUE(sim::fromSeconds(seconds, t));
        char mm[8];
        std::snprintf(mm, sizeof mm, "%02d", t.mon);
        EXPECT_EQ(attr(entry, "D"), std::to_string(t.mday));
        EXPECT_EQ(attr(entry, "MM"), mm);
        EXPECT_EQ(attr(entry, "Y"), std::to_string(t.year));
        EXPECT_EQ(attr(entry, "h"), std::to_string(t.hour));
        EXPECT_EQ(attr(entry, "m"), std::to_string(t.min));
        EXPECT_EQ(attr(entry, "s"), std::to_string(t.sec));
    }
};

TEST_F(Readings, RecordDatalogIsWrittenAsTheMeterHoldsIt) {
    discover(eDunmark);
    filter.AddElement("Anything", "at all");
    ASSERT_EQ(read(), ME_SUCCESS);
    EXPECT_TRUE(checked);
    EXPECT_TRUE(statusGroups(status).empty());
    EXPECT_EQ(completions, 1);

    const sim::MeterProfile meter = sim::meter();
    auto doc = parsed(datalog);
    pugi::xml_node info = doc->document_element().child("DeviceInfo");
    EXPECT_EQ(std::string(info.child_value("SN")), meter.serial);
    EXPECT_STREQ(info.child_value("MasterSWVer"), "DM2215");
    EXPECT_STREQ(info.child("MasterSWVer").attribute("Y").value(), "1999");
    EXPECT_STREQ(info.child_value("TypeID"), "3");
    EXPECT_STREQ(info.child("CommState").attribute("Txt").value(), "On");
    EXPECT_FALSE(info.child("PortID"));

    std::vector<data_rec> valid;
    std::copy_if(meter.datalog.begin(), meter.datalog.end(), std::back_inserter(valid),
                 [](const data_rec& e) { return e.Valid == 0; });
    ASSERT_LT(valid.size(), meter.datalog.size());
    EXPECT_EQ(count(*doc, "Total"), std::to_string(meter.datalog.size()));
    EXPECT_EQ(count(*doc, "Valid"), std::to_string(valid.size()));
    EXPECT_EQ(count(*doc, "Corrupted"), std::to_string(meter.datalog.size() - valid.size()));
    EXPECT_EQ(count(*doc, "Capacity"), std::to_string(meter.maxRecords));

    pugi::xml_node extra = doc->document_element().child("TransferDetail").child("ExtraInfo");
    std::vector<std::string> units;
    for (pugi::xml_node n : extra.children()) units.push_back(std::string(n.name()) + "=" + attr(n, "Txt"));
    EXPECT_EQ(units, (std::vector<std::string>{"GlucCalib=Whole Blood", "GlucUnit=mg/dL"}));

    // One entry per valid record, in order: meter errors as Error, every other test as Gluc.
    const auto written = entries(*doc);
    ASSERT_EQ(written.size(), valid.size());
    for (std::size_t i = 0; i < valid.size(); ++i) {
        SCOPED_TRACE(i);
        const bool error = valid[i].Test.Flags == 3;
        EXPECT_STREQ(written[i].name(), error ? "Error" : "Gluc");
        const std::string value = error ? written[i].child_value("Txt") : attr(written[i], "Val");
        EXPECT_EQ(value, std::to_string(valid[i].Test.Result));
        if (!error && valid[i].Test.T_Type == 5) {
            EXPECT_EQ(attr(written[i], "Txt"), "Control");
        }
        EXPECT_TRUE(attr(written[i], "Ord").empty());
        expectDate(written[i], valid[i].D_Time);
    }

    // The filter is never read: an empty one gives the same document.
    const std::string first = datalog.XML();
    datalog = newDoc(doc_kind::datalog);
    filter = newDoc(doc_kind::filter);
    ASSERT_EQ(read(), ME_SUCCESS);
    EXPECT_EQ(datalog.XML(), first);
}

TEST_F(Readings, BinaryDatalogIsWrittenWithOrdinalsAndAllUnits) {
    discover(eMorvex);
    ASSERT_EQ(read(), ME_SUCCESS);
    const sim::MeterProfile meter = sim::meter();
    auto doc = parsed(datalog);
    const std::string n = std::to_string(meter.binaryDatalog.size());
    EXPECT_EQ(count(*doc, "Total"), n);
    EXPECT_EQ(count(*doc, "Valid"), n);
    EXPECT_EQ(count(*doc, "Corrupted"), "0");
    EXPECT_EQ(count(*doc, "Capacity"), std::to_string(meter.maxRecords));

    pugi::xml_node extra = doc->document_element().child("TransferDetail").child("ExtraInfo");
    std::vector<std::string> units;
    for (pugi::xml_node u : extra.children()) units.push_back(std::string(u.name()) + "=" + attr(u, "Txt"));
    EXPECT_EQ(units, (std::vector<std::string>{"GlucCalib=Plasma", "GlucUnit=mg/dL", "OMedUnit=Each",
                                               "InsUnit=Units", "CholesUnit=mg/dL"}));

    // Every glucose record becomes a Gluc entry carrying its ordinal, in meter order.
    std::vector<RECORD_DATA> glucose;
    std::copy_if(meter.binaryDatalog.begin(), meter.binaryDatalog.end(), std::back_inserter(glucose),
                 [](const RECORD_DATA& r) { return r.recType == 0; });
    std::vector<pugi::xml_node> gluc;
    std::set<std::string> ordinals;
    for (pugi::xml_node e : entries(*doc)) {
        if (std::string(e.name()) == "Gluc") gluc.push_back(e);
        if (std::string(e.name()) != "Change" && std::string(e.name()) != "Error") {
            EXPECT_FALSE(attr(e, "Ord").empty()) << e.name();
            ordinals.insert(attr(e, "Ord"));
        }
    }
    ASSERT_EQ(gluc.size(), glucose.size());
    for (std::size_t i = 0; i < glucose.size(); i += 7) {
        SCOPED_TRACE(i);
        EXPECT_EQ(attr(gluc[i], "Val"), std::to_string(glucose[i].reading));
        EXPECT_EQ(attr(gluc[i], "Ord"), std::to_string(glucose[i].Ordinal));
        expectDate(gluc[i], glucose[i].timeStamp);
    }
    EXPECT_GT(ordinals.size(), glucose.size());
}

TEST_F(Readings, InsulinUnitForTheInsulinLoggingMeter) {
    discover(eCVPellis);
    ASSERT_EQ(read(), ME_SUCCESS);
    auto doc = parsed(datalog);
    pugi::xml_node extra = doc->document_element().child("TransferDetail").child("ExtraInfo");
    EXPECT_TRUE(extra.child("InsUnit"));
    EXPECT_FALSE(extra.child("OMedUnit"));
    EXPECT_FALSE(extra.child("CholesUnit"));
}

TEST_F(Readings, UploadReportsTheFirstHalfAndConversionTheSecond) {
    discover(eDunmark);
    ASSERT_EQ(read(), ME_SUCCESS);
    ASSERT_FALSE(progress.empty());
    EXPECT_TRUE(std::is_sorted(progress.begin(), progress.end()));
    const auto half = std::find_if(progress.begin(), progress.end(), [](int p) { return p > 50; });
    EXPECT_NE(half, progress.begin()) << "no upload progress";
    EXPECT_GE(std::count_if(half, progress.end(), [](int) { return true; }), 5);
    EXPECT_GT(progress.front(), 0);
    // The conversion reports in steps of 10 and never its own 100.
    EXPECT_GE(progress.back(), 90);
    EXPECT_LE(progress.back(), 100);
}

TEST_F(Readings, ChecksBeforeTheUploadEndTheRequest) {
    discover(eDunmark);
    const std::string sn = sim::meter().serial;
    struct Case {
        const char* port;
        std::string sn;
        const char* type;
        const char* context;
        bool closes;
    };
    for (const Case& c : {Case{"-1", sn, "3", " ; Port number from XML file is invalid", false},
                          Case{"1", "", "3", " ; Device SN from Device Info XML is invalid", true},
                          Case{"1", sn, "9", " ; Device Type from Device Info XML is invalid", true}}) {
        SCOPED_TRACE(c.context);
        status = newDoc(doc_kind::status);
        datalog = newDoc(doc_kind::datalog);
        completions = 0;
        checked = false;
        const int closed = closes();
        EXPECT_EQ(read(c.port, c.sn, c.type), ME_BAD_PARAMETER);
        EXPECT_EQ(statusGroups(status),
                  (std::vector<StatusGroup>{
                      {"-17", "-19", std::string("Bad parameter passed to the function") + c.context, "none"}}));
        EXPECT_EQ(closes(), closed + (c.closes ? 1 : 0));
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(checked, c.closes);
        EXPECT_EQ(sim::callCount("vb_Upload_Meter_Datalog"), 0);
        EXPECT_EQ(datalog.XML(), newDoc(doc_kind::datalog).XML());
    }
}

TEST_F(Readings, FailedUploadClosesUnlessToldToKeepTheMeterAndAlwaysCompletes) {
    discover(eDunmark);
    for (std::int16_t keep : {0, -50}) {
        SCOPED_TRACE(keep);
        sim::injectFault("vb_Upload_Meter_Datalog", 1, ME_TIME_OUT, false);
        status = newDoc(doc_kind::status);
        completions = 0;
        rec.Error_code = keep;
        const int closed = closes();
        EXPECT_EQ(read(), ME_TIME_OUT);
        EXPECT_EQ(statusGroups(status), (std::vector<StatusGroup>{{"-17", "-2",
                                                                   "Timeout error ; GetReadingFromMeter failed",
                                                                   "none"}}));
        EXPECT_EQ(closes(), closed + (keep == -50 ? 0 : 1));
        EXPECT_EQ(completions, 1);
        EXPECT_FALSE(detail::frmTimer().tmrStatus().enabled());
    }
}

TEST_F(Readings, IdentityChecksAfterTheUploadLeaveTheWholeDocument) {
    discover(eDunmark);
    const std::string sn = sim::meter().serial;
    const std::vector<data_rec> held = sim::meter().datalog;
    const auto valid = static_cast<std::size_t>(
        std::count_if(held.begin(), held.end(), [](const data_rec& e) { return e.Valid == 0; }));
    struct Case {
        std::string sn;
        const char* type;
        std::int16_t fault;  // of the final identity question
        std::int32_t result;
        StatusGroup group;
    };
    const std::string different = "Different device detected ; Device ";
    for (const Case& c :
         {Case{sn, "3", ME_COM_ERROR, ME_COM_ERROR, {"-17", "-3", "Communication error", "none"}},
          Case{"OTHER1", "3", 0, ME_DIFFERENT_DEVICE,
               {"-8", "-8", different + "SN from Device Info XML - OTHER1 Device SN from device - " + sn + " do not match",
                "none"}},
          Case{sn, "7", 0, ME_FAIL,
               {"-8", "-8", different + "Type from Device Info XML - 7 Device Type from device - 3 do not match",
                "none"}}}) {
        SCOPED_TRACE(c.result);
        if (c.fault) sim::injectFault("vb_Chk4Meter", 1, c.fault, false);
        status = newDoc(doc_kind::status);
        datalog = newDoc(doc_kind::datalog);
        completions = 0;
        const int closed = closes();
        EXPECT_EQ(read("1", c.sn, c.type), c.result);
        EXPECT_EQ(statusGroups(status), std::vector<StatusGroup>{c.group});
        EXPECT_EQ(closes(), closed);
        EXPECT_EQ(completions, 1);
        EXPECT_EQ(entries(*parsed(datalog)).size(), valid);
    }
}

TEST_F(Readings, DatalogWithoutDeviceInfoFailsThroughTheErrorHandler) {
    discover(eDunmark);
    datalog = newDoc(doc_kind::filter);
    const int closed = closes();
    try {
        read();
        FAIL() << "no error";
    } catch (const ComponentError& e) {
        EXPECT_EQ(e.number(), errc::missing_object);
        EXPECT_EQ(e.description(), "getReadings --> ");
    }
    const auto groups = statusGroups(status);
    ASSERT_EQ(groups.size(), 1u);
    EXPECT_EQ(groups[0].major, "-17");
    EXPECT_EQ(groups[0].minor, "-16");
    EXPECT_EQ(groups[0].desc.rfind("Unknown status;Error number = 91 Error description = ", 0), 0u);
    EXPECT_EQ(groups[0].trace, "0");
    EXPECT_EQ(closes(), closed + 1);
    EXPECT_EQ(completions, 1);
}

// The real transport library, loaded the way a client's DllWrapper loads it.
TEST(ReadingsOverTheTransportLibrary, DiscoverAndReadTheSimulatedMeter) {
    setThreadClock(std::make_shared<ManualClock>(1000));
    EXPECT_NE(DllWrapper::defaultTransportPath().find("libvantrix32.so"), std::string::npos);
    for (bool byDefault : {true, false}) {
        SCOPED_TRACE(byDefault);
        auto wrapper = byDefault ? std::make_unique<DllWrapper>()
                                 : std::make_unique<DllWrapper>(std::string(VARNEL_TEST_TRANSPORT_PATH));
        METER_REC rec{};
        XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status);
        XMLWrapper conn = connectionDoc("1");
        try {
            ASSERT_EQ(wrapper->discoverDevice(rec, device, conn, status), ME_SUCCESS);
        } catch (const ComponentError& e) {
            FAIL() << e.number() << " " << statusGroups(status)[0].desc;
        }
        XMLWrapper datalog = newDoc(doc_kind::datalog), filter = newDoc(doc_kind::filter);
        bool checked = false;
        ASSERT_EQ(wrapper->getReadings(rec, device, datalog, filter, status, checked), ME_SUCCESS);
        auto doc = parsed(datalog);
        EXPECT_EQ(std::string(doc->document_element().child("TransferDetail").child("Records").child_value("Total")),
                  std::to_string(sim::defaultProfile(eMorvex).binaryDatalog.size()));
        EXPECT_EQ(wrapper->closeMeter(rec), ME_SUCCESS);
    }
    setThreadClock(nullptr);
}

}  // namespace
