// The simulator's profile reader on any file: it refuses what it cannot read
// with a runtime_error, and a profile it accepts writes out and reads back equal.
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <stdexcept>
#include <string>

#include "simulator.h"

namespace {

std::string tempPath(const char* tag) {
    static const std::string dir = [] {
        char tmpl[] = "/tmp/varnel-fuzz-profile-XXXXXX";
        if (!mkdtemp(tmpl)) std::abort();
        return std::string(tmpl);
    }();
    return dir + "/" + tag + ".xml";
}

bool writeFile(const std::string& path, const std::uint8_t* data, std::size_t size) {
    std::FILE* f = std::fopen(path.c_str(), "wb");
    if (!f) return false;
    const bool ok = std::fwrite(data, 1, size, f) == size;
    return std::fclose(f) == 0 && ok;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace varnel::sim;
    const std::string input = tempPath("input"), again = tempPath("again");
    if (!writeFile(input, data, size)) std::abort();
    MeterProfile profile;
    try {
        profile = readProfileFile(input);
    } catch (const std::runtime_error&) {
        return 0;
    }
    writeProfileFile(profile, again);
    if (!(readProfileFile(again) == profile)) {
        std::fprintf(stderr, "an accepted profile does not read back equal after writing\n");
        std::abort();
    }
    return 0;
}
