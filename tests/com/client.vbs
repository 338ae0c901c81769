' The kind of client the component serves: late-bound objects created by ProgID.
Option Explicit
Dim failures : failures = 0
Sub Check(ok, what)
    If Not ok Then
        WScript.Echo "FAILED: " & what
        failures = failures + 1
    End If
End Sub

Dim meter, doc, checker
Set meter = CreateObject("Varnel.DllWrapper")
Set doc = CreateObject("Varnel.XMLWrapper")
Set checker = CreateObject("Varnel.UniqueChecker")

Check meter.GetTrueString() = "true", "GetTrueString"
Check meter.GetFalseString() = "false", "GetFalseString"

' A connection document built and read back.
doc.InitDocument 3
doc.SelectElement "Ports"
doc.AddElement "COM"
doc.AddChildElement "PortsToSearch", "", "1"
doc.SetChildAttribute "kind", "serial"
doc.MoveToRoot
Check doc.GetRootName() = "ConnectionInfo", "GetRootName"
Check doc.CountElements("PortsToSearch") = 1, "CountElements"
doc.SelectElement "COM"
Check doc.GetChildValue("PortsToSearch") = "1", "GetChildValue"
Check doc.GetChildAttribute("PortsToSearch", "kind") = "serial", "GetChildAttribute"
Check doc.GetChildName(0) = "PortsToSearch", "GetChildName"
Check InStr(doc.XML, "<PortsToSearch kind=""serial"">1</PortsToSearch>") > 0, "XML"

' A failing operation is a run-time error the script can catch.
On Error Resume Next
doc.MoveToChild "Nothing"
Check Err.Number = 91, "MoveToChild of a missing child raises 91, got " & Err.Number
Err.Clear
On Error GoTo 0

Dim value : value = "Glucose"
Check checker.AddValue(value) = True, "AddValue of a new text"
value = "GLUCOSE"
Check checker.AddValue(value) = False, "AddValue of a text seen, in other case"
checker.Clear
Check checker.AddValue(value) = True, "AddValue after Clear"
Check CInt(checker.AddValue(value)) = 0, "VARIANT_BOOL false is 0"
value = "Ketone"
Check CInt(checker.AddValue(value)) = -1, "VARIANT_BOOL true is -1"

If failures = 0 Then WScript.Echo "vbscript passed"
