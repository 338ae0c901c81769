"""Finds the meter on port 1 (the simulated transport shipped with Varnel) and
prints one line per glucose reading; leaving the block releases the meter."""
import varnel

with varnel.Component() as meter:
    device = meter.discover(port=1)
    info = device.find("DeviceInfo")
    print(f"meter: {info.findtext('Name')}, type {info.findtext('TypeID')}, serial number {info.findtext('SN')}")
    # Blood glucose only: control-solution and check-strip readings test the meter, not the blood.
    for reading in varnel.readings(meter.get_readings()):
        if reading["kind"] == "glucose":
            print(f"{reading['time']:%Y-%m-%d %H:%M}  {reading['values'][0]['value']}")
