"""Finds the meter on port 1 (the simulated transport shipped with Varnel) and
prints one line per glucose reading; leaving the block releases the meter."""
import varnel

with varnel.Component() as meter:
    device = meter.discover(port=1)
    info = device.find("DeviceInfo")
    print(f"meter: {info.findtext('Name')}, type {info.findtext('TypeID')}, serial number {info.findtext('SN')}")
    log = meter.get_readings()
    for reading in log.find("Records").findall("Gluc"):
        a = reading.attrib
        print(f"{a['Y']}-{int(a['MM']):02}-{int(a['D']):02} {int(a['h']):02}:{int(a['m']):02}  {a['Val']}")
