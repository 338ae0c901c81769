// Where a command's document goes: standard output or a file that is either complete or untouched.
#pragma once

#include <stdexcept>
#include <string>

namespace varnel::cli {

// A write that did not reach its destination; what() says where and why.
class OutputError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

// True for "" and "-", which mean standard output.
bool isStandardOutput(const std::string& path);

// True when `path` can be replaced atomically: it does not exist yet or is a regular file.
bool isReplaceableFile(const std::string& path);

// Why `path` could not be written as writeOutput writes it (its directory must take the
// temporary file too); "" when it can. Touches nothing.
std::string unwritableReason(const std::string& path);

// Writes `text` to standard output (path "" or "-") or to `path`. A regular
// file is written to a temporary file in the same directory, flushed to disk
// and renamed over `path`, so a failure leaves the old file as it was; any
// other file (a pipe, a device) is written directly. Throws OutputError.
void writeOutput(const std::string& path, const std::string& text);

}  // namespace varnel::cli
