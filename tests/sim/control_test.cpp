// Injected faults and the C controls, in-process and in the shared library.

#include "fixture.h"
#include "support/loaded_library.h"
#include "support/temp_dir.h"
#include "varnel/vxsim.h"

using namespace varnel::sim;
using simtest::SimTest;
using simtest::text;

using varnel::test::TempDir;

using Faults = SimTest;

TEST_F(Faults, EveryInjectedFaultSurfacesWithErrorCodeAndChangesNothing) {
    INSULIN_OR_ORAL_MED_NAME_TYPE name{12, 0, {'X'}};
    MEAL_SEGMENTS_TYPE seg{{1, 2, 3, 4, 5, 6, 7}};
    auto bin = std::make_unique<METER_BIN_DATALOG>();
    const std::vector<std::pair<const char*, std::function<std::int16_t()>>> calls = {
        {"vb_Set_Meter_Option", [&] { return vb_Set_Meter_Option(&rec, eUnits, 1); }},
        {"vb_Set_Meter_Clock", [&] { return vb_Set_Meter_Clock(&rec, secondsOf(2012, 1, 1)); }},
        {"SetInsulinName", [&] { return SetInsulinName(&rec, &name); }},
        {"SetMealSegments", [&] { return SetMealSegments(&rec, &seg); }},
        {"vb_Clear_Meter_Datalog", [&] { return vb_Clear_Meter_Datalog(&rec); }},
        {"GetMeterDatalog", [&] { return GetMeterDatalog(&rec, bin.get(), 0); }},
    };
    connect(7);
    const MeterProfile before = meter();
    for (const auto& [function, run] : calls) {
        SCOPED_TRACE(function);
        injectFault(function, 1, ME_TIME_OUT, false);
        rec.Error_code = 0;
        bin->recordCount = 77;
        const std::int16_t code = run();
        EXPECT_EQ(std::tuple(code, rec.Error_code, bin->recordCount), std::tuple(ME_TIME_OUT, ME_TIME_OUT, 77));
        EXPECT_EQ(meter(), before);
    }
    // Without faults the same calls do change the meter.
    for (const auto& [function, run] : calls) EXPECT_EQ(run(), ME_SUCCESS) << function;
    EXPECT_NE(meter(), before);
}

TEST_F(Faults, NthCallFailsOnceOrFromThenOnAndBadRequestsAreRefused) {
    connect(1);
    injectFault("vb_Chk4Meter", 2, ME_COM_ERROR, false);
    injectFault("vb_Read_Meter_Options", 2, ME_CHKSUM_ERROR, true);
    std::vector<int> once, persistent;
    for (int i = 0; i < 3; ++i) once.push_back(vb_Chk4Meter(&rec)), persistent.push_back(vb_Read_Meter_Options(&rec));
    EXPECT_EQ(once, (std::vector<int>{0, ME_COM_ERROR, 0}));
    EXPECT_EQ(persistent, (std::vector<int>{0, ME_CHKSUM_ERROR, ME_CHKSUM_ERROR}));
    EXPECT_EQ(callCount("vb_Read_Meter_Options"), 3);
    clearFaults();
    EXPECT_EQ(vb_Read_Meter_Options(&rec), ME_SUCCESS);

    // Only functions that report a status fail, from the first call on, with a negative code.
    for (auto [function, nth, code] :
         {std::tuple{"convert_to_seconds", 1, -17}, {"vb_Chk4Meter", 0, -17}, {"vb_Chk4Meter", 1, 0}})
        EXPECT_THROW(injectFault(function, nth, std::int16_t(code), false), std::invalid_argument) << function << nth;
}

using Controls = SimTest;

TEST_F(Controls, CControlsSelectAttachRenameFailAndReload) {
    EXPECT_EQ(vxsim_select_type(9), ME_BAD_PARAMETER);
    ASSERT_EQ(vxsim_select_type(4), ME_SUCCESS);
    EXPECT_EQ(meter().type, eQuillaandBremo);
    for (const char* bad : {"", "ABCDEFGHIJKLMNOPQRSTU"}) EXPECT_EQ(vxsim_set_serial(bad), ME_BAD_PARAMETER) << bad;
    EXPECT_EQ(vxsim_set_serial("QLB40088300"), ME_SUCCESS);

    ASSERT_EQ(vxsim_detach(), ME_SUCCESS);
    EXPECT_EQ(find_meter(&rec, found, ports), ME_NO_DEVICE);
    ASSERT_EQ(vxsim_attach(), ME_SUCCESS);
    ASSERT_EQ(find_meter(&rec, found, ports), ME_SUCCESS);
    EXPECT_EQ(text(rec.Serial_number), "QLB40088300");

    EXPECT_EQ(vxsim_fail_call("vb_Nothing", 1, -3, 0), ME_BAD_PARAMETER);
    EXPECT_NE(std::string(vxsim_last_error()).find("vb_Nothing"), std::string::npos);
    ASSERT_EQ(vxsim_fail_call("vb_Tickle_Meter", 1, -3, 1), ME_SUCCESS);
    EXPECT_EQ(vb_Tickle_Meter(&rec), ME_COM_ERROR);
    ASSERT_EQ(vxsim_clear_faults(), ME_SUCCESS);
    EXPECT_EQ(vb_Tickle_Meter(&rec), ME_SUCCESS);

    TempDir dir;
    const std::string saved = dir.file("saved.xml");
    ASSERT_EQ(vxsim_save_profile(saved.c_str()), ME_SUCCESS);
    ASSERT_EQ(vxsim_reset(), ME_SUCCESS);
    EXPECT_EQ(meter().type, eMorvex);
    ASSERT_EQ(vxsim_load_profile(saved.c_str()), ME_SUCCESS);
    EXPECT_EQ(meter().serial, "QLB40088300");
}

TEST_F(Controls, SharedLibraryExportsTheTransportAndHasItsOwnSimulator) {
    const varnel::test::LoadedLibrary lib{VARNEL_TEST_TRANSPORT_PATH};
    ASSERT_NE(lib.handle, nullptr) << lib.error;
    auto select = lib.function<decltype(&vxsim_select_type)>("vxsim_select_type");
    auto find = lib.function<decltype(&find_meter)>("find_meter");
    ASSERT_TRUE(select && find);
    ASSERT_EQ(select(3), 0);
    ASSERT_EQ(find(&rec, found, ports), ME_SUCCESS);
    EXPECT_EQ(rec.M_Type, eDunmark);
    EXPECT_EQ(meter().type, eMorvex);  // the library's meter is not this program's
}
