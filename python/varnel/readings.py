"""The readings of a datalog as Python values: a list of dicts, or a pandas DataFrame.

    log = component.get_readings()
    for r in varnel.readings(log):
        if r["kind"] == "glucose":
            print(r["time"], r["values"][0]["value"])
"""
import ctypes
import json
import xml.etree.ElementTree as ET
from datetime import datetime


def _readings_json(datalog, mmol):
    from . import _Doc, library

    lib = library()
    fn = lib.varnel_doc_readings_json
    fn.restype, fn.argtypes = ctypes.c_void_p, [ctypes.c_void_p, ctypes.c_int]
    text = datalog if isinstance(datalog, str) else ET.tostring(datalog, encoding="unicode")
    doc = _Doc(text=text)
    raw = fn(doc.handle, int(bool(mmol)))
    if not raw:
        raise ValueError("varnel: not a datalog document")
    try:
        return json.loads(ctypes.string_at(raw).decode("utf-8"))
    finally:
        lib.varnel_free(raw)


def readings(datalog, mmol=False):
    """Every entry of a datalog (an Element or XML text), in the datalog's order, as dicts:
    ``serial``, ``model`` (the meter), ``ord`` (the meter's number of the entry, or None),
    ``time`` (a naive datetime on the meter's clock, or None), ``kind`` ("glucose",
    "control", "check_strip", "insulin", ...), ``values`` (dicts with ``quantity``,
    ``value`` and, when known, ``unit`` and ``range``), ``limits``, ``slot`` and
    ``comments``. Control-solution and check-strip readings have their own kinds: they
    are not glucose. With mmol=True glucose is in mmol/L."""
    doc = _readings_json(datalog, mmol)
    meter = doc["meter"]
    out = []
    for r in doc["readings"]:
        item = {"serial": meter["serial"], "model": meter["model"], "ord": r["ord"],
                "time": datetime.fromisoformat(r["time"]) if r["time"] else None, "kind": r["kind"],
                "values": r["values"], "limits": r.get("limits", []), "slot": r.get("slot"),
                "comments": r["comments"]}
        out.append(item)
    return out


def readings_frame(datalog, mmol=False):
    """The readings as a pandas DataFrame, one row per value (a blood pressure gives two),
    with the columns serial, model, ord, time, kind, quantity, value, unit, range, slot,
    comments. Needs pandas, which the package itself does not depend on."""
    try:
        import pandas
    except ImportError as e:
        raise ImportError("varnel.readings_frame needs pandas; varnel.readings gives the same as dicts") from e
    rows = []
    for r in readings(datalog, mmol):
        base = {k: r[k] for k in ("serial", "model", "ord", "time", "kind")}
        tail = {"slot": r["slot"], "comments": "; ".join(r["comments"])}
        for v in r["values"] or [{}]:
            rows.append({**base, "quantity": v.get("quantity"), "value": v.get("value"), "unit": v.get("unit"),
                         "range": v.get("range"), **tail})
    columns = ["serial", "model", "ord", "time", "kind", "quantity", "value", "unit", "range", "slot", "comments"]
    return pandas.DataFrame(rows, columns=columns)
