// Runs a fuzz target once on each input named on the command line, or on
// every file of a named directory, in name order: linked in place of
// libFuzzer's main, so the regular compiler's build replays the seed corpus
// and the saved crash inputs as a test. An input that trips the target aborts
// it, as under the fuzzer; the last input named before that is the culprit.
#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <system_error>
#include <vector>

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);
// Optional in a target, as with libFuzzer.
extern "C" __attribute__((weak)) int LLVMFuzzerInitialize(int* argc, char*** argv);

namespace {

namespace fs = std::filesystem;

// The files an argument names; false when it names nothing readable.
bool collect(const fs::path& arg, std::vector<fs::path>& inputs) {
    std::error_code ec;
    if (fs::is_regular_file(arg, ec)) {
        inputs.push_back(arg);
        return true;
    }
    if (!fs::is_directory(arg, ec)) return false;
    std::vector<fs::path> files;
    for (const fs::directory_entry& e : fs::directory_iterator(arg, ec))
        if (e.is_regular_file(ec)) files.push_back(e.path());
    if (ec) return false;
    std::sort(files.begin(), files.end());
    inputs.insert(inputs.end(), files.begin(), files.end());
    return true;
}

}  // namespace

int main(int argc, char** argv) {
    if (LLVMFuzzerInitialize) LLVMFuzzerInitialize(&argc, &argv);
    std::vector<fs::path> inputs;
    for (int i = 1; i < argc; ++i) {
        if (!collect(argv[i], inputs)) {
            std::fprintf(stderr, "%s: no such input file or directory\n", argv[i]);
            return 2;
        }
    }
    // A replay that runs nothing would pass without testing anything.
    if (inputs.empty()) {
        std::fprintf(stderr, "usage: %s input-file-or-directory...; no input found\n", argv[0]);
        return 2;
    }
    for (const fs::path& input : inputs) {
        std::ifstream in(input, std::ios::binary);
        const std::vector<char> bytes{std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
        if (!in.good() && !in.eof()) {
            std::fprintf(stderr, "%s: cannot be read\n", input.c_str());
            return 2;
        }
        std::fprintf(stderr, "running %s (%zu bytes)\n", input.c_str(), bytes.size());
        static const std::uint8_t none = 0;  // an empty input still gets a valid pointer, as libFuzzer gives
        LLVMFuzzerTestOneInput(bytes.empty() ? &none : reinterpret_cast<const std::uint8_t*>(bytes.data()),
                               bytes.size());
    }
    std::printf("%zu inputs ran\n", inputs.size());
    return 0;
}
