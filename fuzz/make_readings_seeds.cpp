// Writes seed inputs for the readings target (see readings.h) into the
// directory given: each simulated meter's own datalog, as its transport answers it.
#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "readings.h"
#include "simulator.h"

int main(int argc, char** argv) {
    using namespace varnel;
    if (argc != 2) {
        std::fprintf(stderr, "usage: make_readings_seeds DIR\n");
        return 2;
    }
    auto write = [&](const std::string& name, const fuzz::ReadingsHeader& h, const void* bytes, std::size_t n) {
        std::vector<unsigned char> out(sizeof h + n);
        std::memcpy(out.data(), &h, sizeof h);
        std::memcpy(out.data() + sizeof h, bytes, n);
        std::FILE* f = std::fopen((std::string(argv[1]) + "/" + name).c_str(), "wb");
        if (!f || std::fwrite(out.data(), 1, out.size(), f) != out.size() || std::fclose(f) != 0) return false;
        return true;
    };
    auto le = [](int v, std::uint8_t(&b)[2]) {
        b[0] = static_cast<std::uint8_t>(v);
        b[1] = static_cast<std::uint8_t>(v >> 8);
    };
    for (int type = 1; type <= 8; ++type) {
        const sim::MeterProfile p = sim::defaultProfile(type);
        fuzz::ReadingsHeader h{};
        h.type = static_cast<std::uint8_t>(type - 1);
        if (p.usesBinaryDatalog()) {
            // A short log keeps each run quick: the first records, decoded by the real reader...
            std::vector<RECORD_DATA> records(p.binaryDatalog.begin(), p.binaryDatalog.begin() + 24);
            static METER_BIN_DATALOG log{};
            sim::encodeBinaryDatalog(records, log);
            le(log.recordCount, h.count);
            if (!write("type7-binary", h, log.binBuf, sim::encodedSize(records))) return 1;
            // ...and the same records answered as they are.
            h.flags = 1;
            if (!write("type7-records", h, records.data(), records.size() * sizeof(RECORD_DATA))) return 1;
        } else {
            const std::size_t n = std::min<std::size_t>(p.datalog.size(), 24);
            le(static_cast<int>(n), h.count);
            le(static_cast<int>(n), h.second);
            if (!write("type" + std::to_string(type) + "-log", h, p.datalog.data(), n * sizeof(data_rec))) return 1;
        }
    }
    return 0;
}
