#include "errors/error_description.h"

#include <algorithm>
#include <iterator>

#include "varnel/records.h"

namespace varnel::detail {

namespace {

struct CodeText {
    ReturnValues_Enum code;
    const char* text;
};

// ME_CLOCK_ERROR and ME_UNKNOWN deliberately have no text of their own.
constexpr CodeText kTexts[] = {
    {ME_SUCCESS, "Operation completed successfully"},
    {ME_CHKSUM_ERROR, "Checksum error"},
    {ME_TIME_OUT, "Timeout error"},
    {ME_COM_ERROR, "Communication error"},
    {ME_COMP_FAIL, "Datalog comparison failure"},
    {ME_EMPTY, "Datalog empty return code"},
    {ME_NOMEM, "Memory allocation failure"},
    {ME_DIFFERENT_DEVICE, "Different device detected"},
    {ME_VALIDATION_ERROR, "Data failed validation"},
    {ME_NOT_SUPPORTED, "Function is not supported"},
    {ME_NO_DEVICE, "No device found"},
    {ME_RESET_METER, "Meter is in Reset Meter mode"},
    {ME_NO_SERIAL_PORTS, "No serial ports found on the system"},
    {ME_FAIL, "Operation failed"},
    {ME_NO_PORT_OPENED, "Serial port has not been opened yet"},
    {ME_BAD_PARAMETER, "Bad parameter passed to the function"},
    {ME_OVERFLOW, "General overflow error"},
    {ME_BUFREMPTY, "No data received from serial port"},
    {ME_WRONG_TYPE, "Different device detected"},
    {ME_QUIT, "ESC was used to break out of delay"},
    {ME_UNSUPPORTED_PORTS, "Unsupported ports"},
    {ME_BAD_DEVICEINFO, "Bad device information"},
    {ME_CLSIDFROMPROGIDFAILS, "CLSIDFromProgID failed"},
    {ME_COCREATEINSTANCEFAILS, "CoCreateInstance failed"},
    {ME_DISPEVENTADVISEFAILS, "DispEventAdvise failed"},
    {ME_DISPEVENTUNADVISEFAILS, "DispEventUnadvise failed"},
    {ME_PARTIALSUCCESS, "Partial success"},
    {ME_FATAL, "Fatal error"},
    {ME_INVALID_XMLWRAPPOBJ, "Invalid XML"},
    {ME_INVALID_REG_ENTRIES, "Invalid registry entries"},
    {ME_BAD_DCB, "Bad Device Block"},
    {ME_INVALID_HANDLE, "Invalid Handle of Port"},
};

}  // namespace

std::string ErrorDescription(long long code) {
    auto it = std::find_if(std::begin(kTexts), std::end(kTexts), [code](const CodeText& t) { return t.code == code; });
    return it != std::end(kTexts) ? it->text : "Unknown status";
}

}  // namespace varnel::detail
