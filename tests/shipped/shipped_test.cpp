// The shipped library as a client links it: the public API only, and the
// transport library that a default DllWrapper finds beside libvarnel.
#include <gtest/gtest.h>

#include <filesystem>
#include <memory>
#include <string>

#include "varnel/clock.h"
#include "varnel/dll_wrapper.h"
#include "varnel/records.h"
#include "varnel/return_codes.h"
#include "varnel/xml_wrapper.h"

using namespace varnel;

namespace {

XMLWrapper newDoc(std::int32_t kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

// Found from libvarnel's own place whatever the program's run path (sanitizer runtimes ignore it).
TEST(ShippedLibrary, TheDefaultTransportIsFoundBesideTheComponent) {
    const std::string path = DllWrapper::defaultTransportPath();
    ASSERT_TRUE(std::filesystem::path(path).is_absolute()) << path;
    EXPECT_TRUE(std::filesystem::equivalent(path, VARNEL_TEST_TRANSPORT_PATH)) << path;
}

// A default DllWrapper discovers the simulated meter and uploads its readings on a virtual clock.
TEST(ShippedLibrary, DefaultWrapperDiscoversAndReads) {
    setThreadClock(std::make_shared<ManualClock>(1000));
    DllWrapper wrapper;
    METER_REC rec{};
    XMLWrapper device = newDoc(doc_kind::device_info), status = newDoc(doc_kind::status);
    XMLWrapper conn = newDoc(doc_kind::connection_info), datalog = newDoc(doc_kind::datalog);
    XMLWrapper filter = newDoc(doc_kind::filter);
    conn.SelectElement("Ports");
    conn.AddElement("COM");
    conn.AddChildElement("PortsToSearch", "", "1");
    bool checked = false;
    ASSERT_EQ(wrapper.discoverDevice(rec, device, conn, status), ME_SUCCESS) << status.XML();
    ASSERT_EQ(wrapper.getReadings(rec, device, datalog, filter, status, checked), ME_SUCCESS) << status.XML();
    datalog.MoveToRoot();
    datalog.MoveToChild("TransferDetail");
    datalog.MoveToChild("Records");
    EXPECT_GT(std::stoi(datalog.GetChildValue("Total")), 0) << datalog.XML();
    EXPECT_EQ(wrapper.closeMeter(rec), ME_SUCCESS);
    setThreadClock(nullptr);
}

}  // namespace
