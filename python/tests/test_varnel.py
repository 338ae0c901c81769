"""The Python package over the built libvarnel and the shipped simulated meters (real time: ~5 s)."""
import ctypes
import xml.etree.ElementTree as ET
from datetime import datetime
from pathlib import Path

import pytest

import varnel


def test_meter_record_matches_the_c_layout():
    # records.h pins the size and these offsets; a wrong layout corrupts the record the transport fills.
    assert ctypes.sizeof(varnel.METER_REC) == 2080
    assert [getattr(varnel.METER_REC, f).offset for f in ("M_Type", "Error_code", "Serial_number")] == [0, 2, 4]


def test_a_whole_session_through_the_package():
    progress = []
    with varnel.Component() as c:
        c.on_progress = progress.append
        device = c.discover(port=1)
        assert device.find("PortInfo/PortID").text == "1"
        assert c.rec.M_Type == int(device.find("DeviceInfo/TypeID").text)

        settings = c.get_settings()
        assert settings.find("Settings/Clock") is not None
        listed = c.get_settings(items=["Clock", "Beep"])
        assert [e.tag for e in listed.find("Settings")] == ["Clock", "Beep"]
        assert len(c.get_caps().find("Records")) > 0

        # What was read goes back, as an Element and as text.
        c.set_settings(settings)
        c.set_settings(ET.tostring(listed, encoding="unicode"))

        progress.clear()
        log = c.get_readings()
        assert len(log.find("Records")) > 0
        assert progress and progress == sorted(progress) and all(0 < p <= 100 for p in progress)

        c.on_progress = None
        c.clear_meter()
        assert len(c.get_readings().find("Records")) == 0

        # A bad port is a failed request with the status document's reasons.
        with pytest.raises(varnel.RequestError) as failed:
            c.discover(port=300)
        assert failed.value.code < 0
        assert failed.value.descriptions == ["300 is not a valid port"]
    assert c._handle is None  # closed on leaving the block

    # A transport that cannot be loaded is named with the loader's reason.
    with varnel.Component(transport="/nonexistent/libnotransport.so") as broken:
        with pytest.raises(varnel.ComponentError, match="/nonexistent/libnotransport.so.*cannot open shared object"):
            broken.discover()


def simulator():
    """The simulated transport beside libvarnel, the instance the component loads, reset to its shipped meter."""
    sim = ctypes.CDLL(str(Path(varnel.library()._name).resolve().parent / "libvantrix32.so.0"))
    assert sim.vxsim_reset() == 0
    return sim


def test_readings_as_python_values_with_or_without_pandas():
    simulator()  # a test before may have erased it
    with varnel.Component() as c:
        c.discover(port=1)
        log = c.get_readings()
    entries, got = log.find("Records"), varnel.readings(log)
    assert all(r["serial"] == log.findtext("DeviceInfo/SN") for r in got)
    # Each entry's own number and date, as Python values.
    assert [r["ord"] for r in got] == [int(e.get("Ord")) if e.get("Ord") else None for e in entries]
    a = entries[0].attrib
    assert got[0]["time"] == datetime(*(int(a[k]) for k in ("Y", "MM", "D", "h", "m", "s")))
    # A control-solution reading is not glucose.
    control = [r for r in varnel.readings(ET.tostring(log, encoding="unicode"), mmol=True) if r["kind"] == "control"]
    assert [(r["time"].strftime("%Y-%m-%d %H:%M"), r["values"]) for r in control] == [
        ("2008-02-27 06:07", [{"quantity": "control", "value": 6.7, "unit": "mmol/L"}])]
    with pytest.raises(ValueError):
        varnel.readings("<DeviceSettings/>")
    try:
        import pandas
    except ImportError:
        with pytest.raises(ImportError, match="needs pandas"):
            varnel.readings_frame(log)
        return
    assert varnel.readings_frame(log)["time"][0] == pandas.Timestamp(got[0]["time"])


def test_a_partial_outcome_raises_and_carries_what_was_read():
    sim = simulator()  # the default meter, type 7, with its readings
    try:
        with varnel.Component() as c:
            c.discover(port=1)
            with pytest.raises(varnel.RequestError) as partial:
                c.get_caps(items=["Clock", "NoSuchItem"])
            assert partial.value.code == -31
            assert partial.value.document.find("Settings/Clock") is not None

            # Records 3 onwards cannot be decoded: the two read before are carried, the failure stands.
            sim.vxsim_fail_call(b"GetMeterDatalogRecordData", 3, -2, 1)
            with pytest.raises(varnel.RequestError) as lost:
                c.get_readings()
            assert lost.value.code < 0 and "records could not be read" in lost.value.descriptions[-1]
            assert len(lost.value.document.find("Records")) == 2
    finally:
        sim.vxsim_reset()
