// getReadings over a transport whose datalog answers come from the input:
// arbitrary record-datalog entries, arbitrary binary datalog bytes for the
// real record decoder, or arbitrary decoded records. Everything else is the
// simulated meter. The component must neither crash nor read outside what the
// transport gave it, and may fail only with a report or a ComponentError.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <span>

#include "contracts/transport.h"
#include "harness.h"
#include "readings.h"
#include "support/sim_transport.h"
#include "varnel/component_error.h"
#include "varnel/vantrix32.h"

namespace {

using varnel::fuzz::ReadingsHeader;

ReadingsHeader header;
std::span<const std::uint8_t> payload;
std::size_t nextRecord = 0;  // direct mode: where the next answered record starts

std::int16_t count(const std::uint8_t (&bytes)[2]) { return static_cast<std::int16_t>(bytes[0] | bytes[1] << 8); }

void fill(void* target, std::size_t capacity, std::span<const std::uint8_t> from) {
    std::memcpy(target, from.data(), std::min(capacity, from.size()));
}

std::int16_t upload(METER_REC* rec, METER_DATALOG* log) {
    if (!rec || !log) return ME_BAD_PARAMETER;
    log->recordCount = count(header.count);
    log->ValidRecordCount = count(header.second);
    fill(log->DataLog, sizeof log->DataLog, payload);
    rec->Percent_done = 100;
    return ME_SUCCESS;
}

std::int16_t binaryUpload(METER_REC* rec, METER_BIN_DATALOG* log, std::int32_t) {
    if (!rec || !log) return ME_BAD_PARAMETER;
    log->recordCount = count(header.count);
    log->corruptedCount = count(header.second);
    if (!(header.flags & 1)) fill(log->binBuf, sizeof log->binBuf, payload);
    nextRecord = 0;
    rec->Percent_done = 100;
    return ME_SUCCESS;
}

std::int16_t record(METER_BIN_DATALOG* log, std::int16_t index, RECORD_DATA* out) {
    if (!log || !out) return ME_BAD_PARAMETER;
    if (!(header.flags & 1)) return GetMeterDatalogRecordData(log, index, out);
    if (nextRecord >= payload.size()) return ME_CHKSUM_ERROR;
    std::memset(out, 0, sizeof *out);
    fill(out, sizeof *out, payload.subspan(nextRecord));
    nextRecord += sizeof *out;
    return ME_SUCCESS;
}

std::shared_ptr<varnel::detail::Transport> transport() {
    // The simulator, but for the datalogs, which come from the input.
    varnel::detail::TransportFunctions f = varnel::test::simFunctions();
    f.GetMeterDatalog = &binaryUpload;
    f.GetMeterDatalogRecordData = &record;
    f.vb_Upload_Meter_Datalog = &upload;
    return varnel::detail::makeTransport(f);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace varnel;
    if (size < sizeof header) return 0;
    std::memcpy(&header, data, sizeof header);
    payload = {data + sizeof header, size - sizeof header};
    fuzz::Discovered meter(transport(), 1 + header.type % 8);
    if (!meter.found) __builtin_trap();
    XMLWrapper datalog;
    try {
        test::makeCall(meter.wrapper, test::Call::readings, meter.rec, meter.device, meter.status, datalog);
        (void)datalog.XML();
    } catch (const ComponentError&) {}
    return 0;
}
