#include "output.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace varnel::cli {

namespace {

[[noreturn]] void fail(const std::string& path, const std::string& what, int error) {
    throw OutputError("cannot write " + path + ": " + what + ": " + std::strerror(error));
}

// Writes all of `text` to `fd`, retrying short and interrupted writes.
void writeAll(int fd, const std::string& text, const std::string& path) {
    const char* p = text.data();
    std::size_t left = text.size();
    while (left > 0) {
        const ssize_t n = ::write(fd, p, left);
        if (n < 0) {
            if (errno == EINTR) continue;
            fail(path, "write", errno);
        }
        p += n;
        left -= static_cast<std::size_t>(n);
    }
}

std::string directoryOf(const std::string& path) {
    const auto slash = path.find_last_of('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

// A name beside `path` that no other writer uses.
std::string temporaryName(const std::string& path) {
    static std::atomic<unsigned> counter{0};
    const auto slash = path.find_last_of('/');
    const std::string dir = slash == std::string::npos ? "" : path.substr(0, slash + 1);
    const std::string base = slash == std::string::npos ? path : path.substr(slash + 1);
    return dir + "." + base + ".varnel-" + std::to_string(::getpid()) + "-" + std::to_string(counter++) + ".tmp";
}

void writeStandardOutput(const std::string& text) {
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size() || std::fflush(stdout) != 0)
        fail("standard output", "write", errno);
}

void writeDirectly(const std::string& path, const std::string& text) {
    const int fd = ::open(path.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC);
    if (fd < 0) fail(path, "open", errno);
    try {
        writeAll(fd, text, path);
    } catch (...) {
        ::close(fd);
        throw;
    }
    if (::close(fd) != 0) fail(path, "close", errno);
}

void writeReplacing(const std::string& path, const std::string& text) {
    const std::string temp = temporaryName(path);
    // 0666 lets the user's umask decide, as for any file a command creates.
    int fd = ::open(temp.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (fd < 0) fail(path, "create " + temp, errno);
    try {
        writeAll(fd, text, path);
        if (::fsync(fd) != 0) fail(path, "flush to disk", errno);
        const int closed = ::close(fd);
        fd = -1;
        if (closed != 0) fail(path, "close", errno);
    } catch (...) {
        if (fd >= 0) ::close(fd);
        ::unlink(temp.c_str());
        throw;
    }
    if (::rename(temp.c_str(), path.c_str()) != 0) {
        const int error = errno;
        ::unlink(temp.c_str());
        fail(path, "rename " + temp, error);
    }
    // The rename itself must reach the disk too.
    const int dir = ::open(directoryOf(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (dir < 0) fail(path, "open its directory", errno);
    const int synced = ::fsync(dir);
    const int error = errno;
    ::close(dir);
    if (synced != 0 && error != EINVAL) fail(path, "flush its directory", error);
}

}  // namespace

bool isStandardOutput(const std::string& path) { return path.empty() || path == "-"; }

bool isReplaceableFile(const std::string& path) {
    struct stat st {};
    if (::stat(path.c_str(), &st) != 0) return errno == ENOENT;
    return S_ISREG(st.st_mode);
}

std::string unwritableReason(const std::string& path) {
    if (isStandardOutput(path)) return {};
    struct stat st {};
    const bool exists = ::stat(path.c_str(), &st) == 0;
    if (exists && S_ISDIR(st.st_mode)) return "it is a directory";
    if (exists && !S_ISREG(st.st_mode)) return ::access(path.c_str(), W_OK) == 0 ? "" : std::strerror(errno);
    if (exists && ::access(path.c_str(), W_OK) != 0) return std::strerror(errno);
    const std::string dir = directoryOf(path);
    if (::access(dir.c_str(), W_OK | X_OK) != 0) return "directory " + dir + ": " + std::strerror(errno);
    return {};
}

void writeOutput(const std::string& path, const std::string& text) {
    if (isStandardOutput(path)) return writeStandardOutput(text);
    if (!isReplaceableFile(path)) return writeDirectly(path, text);
    // A symbolic link stays a link: its target is what gets replaced.
    char* target = ::realpath(path.c_str(), nullptr);
    if (!target) return writeReplacing(path, text);
    const std::string resolved = target;
    std::free(target);
    writeReplacing(resolved, text);
}

}  // namespace varnel::cli
