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

// True when `path` can be replaced atomically: it (or the file its symbolic link
// leads to) does not exist yet or is a regular file.
bool isReplaceableFile(const std::string& path);

// Why `path` could not be written as writeOutput writes it (its directory must take the
// temporary file too); "" when it can. Touches nothing. A symbolic link is resolved
// here once, and writeOutput writes where this looked; a link to a missing file, a
// FIFO and a socket are refused.
std::string unwritableReason(const std::string& path);

// Writes `text` to standard output (path "" or "-") or to `path`. A regular
// file is written to a temporary file in the same directory, flushed to disk
// and renamed over `path`, so a failure leaves the old file as it was; the new
// file keeps the replaced one's mode and owner (where the owner can be kept),
// or takes the umask's mode when it is new. A device is written directly. A
// write that has to wait (a pipe) ends when a signal comes. Throws OutputError.
void writeOutput(const std::string& path, const std::string& text);

}  // namespace varnel::cli
