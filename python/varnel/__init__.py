"""Varnel from Python: the C interface of libvarnel through ctypes.

    import varnel
    with varnel.Component() as c:
        device = c.discover(port=1)
        log = c.get_readings()
        glucose = [r for r in varnel.readings(log) if r["kind"] == "glucose"]
"""
import ctypes
import os
import sys
import xml.etree.ElementTree as ET
from pathlib import Path

__all__ = ["Component", "RequestError", "ComponentError", "METER_REC", "library", "readings", "readings_frame"]

__version__ = "0.1.0"

_LIBRARY_NAME = "libvarnel.so.0"

# Codes of records.h the package itself needs.
ME_SUCCESS = 0
ME_BAD_PARAMETER = -19

# Document kinds of XMLWrapper.InitDocument.
_DEVICE_INFO, _DEVICE_SETTINGS, _CONNECTION_INFO, _DEVICE_CAPS, _DATALOG, _FILTER, _STATUS = range(1, 8)


class RequestError(Exception):
    """A request that failed: its result code and the status document's ErrDesc texts.

    ``document`` is what the request wrote all the same (an Element, or None): on a
    partial outcome (-31, some settings items unknown to the meter; an upload with
    unreadable records) it holds everything that was read. It is never a success:
    a datalog carried here is not all the meter holds, so do not erase the meter.
    """

    def __init__(self, request, code, descriptions, document=None):
        self.code = code
        self.descriptions = list(descriptions)
        self.document = document
        super().__init__(f"{request} failed with {code}: " + "; ".join(self.descriptions))


class ComponentError(Exception):
    """An unexpected failure inside the component: its number and its text (reason and routine trace)."""

    def __init__(self, number, text):
        self.number = number
        self.text = text
        super().__init__(f"error {number}: {text}")


class METER_REC(ctypes.Structure):
    """The meter record of records.h, 2080 bytes; only the leading fields are named."""

    _pack_ = 4
    _fields_ = [
        ("M_Type", ctypes.c_int16),
        ("Error_code", ctypes.c_int16),
        ("Serial_number", ctypes.c_uint8 * 20),
        ("_rest", ctypes.c_uint8 * 2056),
    ]


assert ctypes.sizeof(METER_REC) == 2080


def _candidates():
    """Where libvarnel is looked for, in order; the first that loads is used."""
    explicit = os.environ.get("VARNEL_LIBRARY")
    if explicit:
        return [explicit]
    here = Path(__file__).resolve().parent
    # Beside the package, or in the lib directory above it (cmake --install puts the
    # package in PREFIX/lib/python3/dist-packages).
    found = [here / _LIBRARY_NAME] + [parent / _LIBRARY_NAME for parent in list(here.parents)[:4]]
    # The prefix pip installed into.
    found.append(Path(sys.prefix) / "lib" / _LIBRARY_NAME)
    # The build tree of a source checkout.
    found.append(here.parent.parent / "build" / "lib" / _LIBRARY_NAME)
    # Last, the system loader's own search (ld.so.conf, LD_LIBRARY_PATH).
    return [str(p) for p in found if p.exists()] + [_LIBRARY_NAME]


_PROGRESS = ctypes.CFUNCTYPE(None, ctypes.POINTER(ctypes.c_int16), ctypes.c_void_p)
_COMPLETE = ctypes.CFUNCTYPE(None, ctypes.c_void_p)
_lib = None


def library():
    """The loaded libvarnel: VARNEL_LIBRARY when set, else beside the package, in the lib
    directory above it, in the install prefix (sys.prefix/lib), the build tree, the system loader."""
    global _lib
    if _lib is not None:
        return _lib
    errors = []
    for path in _candidates():
        try:
            lib = ctypes.CDLL(path)
            break
        except OSError as e:
            errors.append(str(e))
    else:
        raise OSError("Cannot load libvarnel: " + "; ".join(errors))
    doc, comp, rec = ctypes.c_void_p, ctypes.c_void_p, ctypes.POINTER(METER_REC)
    i32, c_int = ctypes.c_int32, ctypes.c_int
    signatures = {
        "varnel_doc_new": (doc, []),
        "varnel_doc_new_kind": (doc, [i32]),
        "varnel_doc_load": (c_int, [doc, ctypes.c_char_p]),
        "varnel_doc_xml": (ctypes.c_void_p, [doc]),
        "varnel_doc_free": (None, [doc]),
        "varnel_free": (None, [ctypes.c_void_p]),
        "varnel_new": (comp, [ctypes.c_char_p]),
        "varnel_delete": (None, [comp]),
        "varnel_discover_device": (i32, [comp, rec, doc, doc, doc]),
        "varnel_set_device_settings": (i32, [comp, rec, doc, doc, doc]),
        "varnel_get_device_settings": (i32, [comp, rec, doc, doc, c_int, doc, ctypes.c_void_p]),
        "varnel_get_device_caps": (i32, [comp, rec, doc, doc, c_int, doc, ctypes.c_void_p]),
        "varnel_get_readings": (i32, [comp, rec, doc, doc, doc, doc, ctypes.c_void_p]),
        "varnel_clear_meter": (i32, [comp, rec, doc, doc]),
        "varnel_close_meter": (i32, [comp, rec]),
        "varnel_on_progress": (None, [comp, _PROGRESS, ctypes.c_void_p]),
        "varnel_on_complete": (None, [comp, _COMPLETE, ctypes.c_void_p]),
        "varnel_error_number": (i32, [comp]),
        "varnel_error_text": (ctypes.c_char_p, [comp]),
    }
    for name, (restype, argtypes) in signatures.items():
        fn = getattr(lib, name)
        fn.restype, fn.argtypes = restype, argtypes
    _lib = lib
    return lib


class _Doc:
    """One document of the component, released with the object."""

    def __init__(self, kind=None, text=None):
        lib = library()
        self._lib = lib
        self.handle = lib.varnel_doc_new_kind(kind) if kind is not None else lib.varnel_doc_new()
        if not self.handle:
            raise MemoryError("varnel: cannot create a document")
        if text is not None and lib.varnel_doc_load(self.handle, text.encode("utf-8")) != 0:
            raise ValueError("varnel: the document is not well-formed XML")

    def text(self):
        raw = self._lib.varnel_doc_xml(self.handle)
        if not raw:
            raise MemoryError("varnel: cannot read a document")
        try:
            return ctypes.string_at(raw).decode("utf-8")
        finally:
            self._lib.varnel_free(raw)

    def element(self):
        return ET.fromstring(self.text())

    def __del__(self):
        if getattr(self, "handle", None):
            self._lib.varnel_doc_free(self.handle)
            self.handle = None


def _listing(root, items, records=False):
    """A listing-mode request document naming the items wanted."""
    doc = ET.Element(root)
    ET.SubElement(doc, "DeviceInfo")
    settings = ET.SubElement(doc, "Settings")
    for name in items:
        ET.SubElement(settings, name)
    if records:
        ET.SubElement(doc, "Records")
    return ET.tostring(doc, encoding="unicode")


class Component:
    """One component over a transport library (default: the simulated meters shipped with Varnel)."""

    def __init__(self, transport=None):
        lib = library()
        self._lib = lib
        self._handle = lib.varnel_new(transport.encode() if transport is not None else None)
        if not self._handle:
            raise MemoryError("varnel: cannot create a component")
        self.rec = METER_REC()
        self._device = None
        self._on_progress = None
        self._progress_ref = None

    # --- progress ---
    @property
    def on_progress(self):
        return self._on_progress

    @on_progress.setter
    def on_progress(self, fn):
        self._on_progress = fn
        if fn is None:
            self._progress_ref = _PROGRESS()
        else:
            def relay(percent, _user):
                fn(percent[0])
            # Kept alive as long as the component may call it.
            self._progress_ref = _PROGRESS(relay)
        self._lib.varnel_on_progress(self._handle, self._progress_ref, None)

    # --- requests ---
    def discover(self, port=1):
        """Finds the meter on a serial port; the device document as an Element."""
        conn = _Doc(text=f"<ConnectionInfo><Ports><COM><PortsToSearch>{int(port)}</PortsToSearch>"
                         "</COM></Ports></ConnectionInfo>")
        device = _Doc(_DEVICE_INFO)
        self._run("discover", self._lib.varnel_discover_device, self.rec, device.handle, conn.handle)
        self._device = device
        return device.element()

    def get_readings(self):
        """Uploads the meter's readings; the datalog document as an Element."""
        datalog = _Doc(_DATALOG)
        self._run("get_readings", self._lib.varnel_get_readings, self.rec, self._found(), datalog.handle, None,
                  check_meter=True, document=datalog)
        return datalog.element()

    def get_settings(self, items=None):
        """The meter's settings (all, or the items named) as the settings document."""
        cfg = _Doc(_DEVICE_SETTINGS) if items is None else _Doc(text=_listing("DeviceSettings", items))
        self._run("get_settings", self._lib.varnel_get_device_settings, self.rec, self._found(), cfg.handle,
                  int(items is None), check_meter=True, document=cfg)
        return cfg.element()

    def get_caps(self, items=None):
        """What the meter supports (all, or the setting items named) as the capabilities document."""
        caps = _Doc(_DEVICE_CAPS) if items is None else _Doc(text=_listing("DeviceCaps", items, records=True))
        self._run("get_caps", self._lib.varnel_get_device_caps, self.rec, self._found(), caps.handle,
                  int(items is None), check_meter=True, document=caps)
        return caps.element()

    def set_settings(self, document):
        """Writes a settings document (an Element or XML text) to the meter."""
        text = document if isinstance(document, str) else ET.tostring(document, encoding="unicode")
        cfg = _Doc(text=text)
        self._run("set_settings", self._lib.varnel_set_device_settings, self.rec, self._found(), cfg.handle)

    def clear_meter(self):
        """Erases the meter's memory."""
        self._run("clear_meter", self._lib.varnel_clear_meter, self.rec, self._found())

    def close(self):
        """Releases the meter if one was found, then the component."""
        if self._handle is None:
            return
        try:
            if self._device is not None:
                self._device = None
                code = self._lib.varnel_close_meter(self._handle, self.rec)
                self._raise_for("close_meter", code, None)
        finally:
            self._lib.varnel_delete(self._handle)
            self._handle = None

    def __enter__(self):
        return self

    def __exit__(self, exc_type, exc, tb):
        if exc_type is None:
            self.close()
            return False
        # Already failing: a failure to release the meter must not hide why.
        try:
            self.close()
        except (RequestError, ComponentError):
            pass
        return False

    # --- internals ---
    def _found(self):
        if self._device is None:
            raise RequestError("request", ME_BAD_PARAMETER, ["No meter found yet: call discover() first"])
        return self._device.handle

    def _run(self, request, fn, *args, check_meter=False, document=None):
        if self._handle is None:
            raise ValueError("varnel: the component is closed")
        status = _Doc(_STATUS)
        call = list(args) + [status.handle] + ([None] if check_meter else [])
        code = fn(self._handle, *call)
        self._raise_for(request, code, status, document)

    def _raise_for(self, request, code, status, document=None):
        if code == ME_SUCCESS:
            return
        number = self._lib.varnel_error_number(self._handle)
        if number:
            text = self._lib.varnel_error_text(self._handle)
            raise ComponentError(number, text.decode("utf-8", "replace") if text else "")
        descriptions = [e.text or "" for e in status.element().iter("ErrDesc")] if status else []
        written = None
        if document is not None:
            try:
                written = document.element()
            except ET.ParseError:
                written = None
        raise RequestError(request, code, descriptions, written)


from .readings import readings, readings_frame  # noqa: E402  (needs the names above)
