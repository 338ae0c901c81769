#include "output.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>

#include "interrupt.h"

namespace varnel::cli {

namespace {

[[noreturn]] void fail(const std::string& path, const std::string& what, int error) {
    throw OutputError("cannot write " + path + ": " + what + ": " + std::strerror(error));
}

// Writes all of `text` to `fd`, retrying short and interrupted writes. A pipe or
// device that takes nothing is waited on with poll, which a signal always ends
// (read() and write() would be restarted), so Ctrl-C is answered there too.
void writeAll(int fd, const std::string& text, const std::string& path, bool regular) {
    const char* p = text.data();
    std::size_t left = text.size();
    while (left > 0) {
        if (!regular) {
            pollfd ready{fd, POLLOUT, 0};
            const int n = ::poll(&ready, 1, 250);
            if (interruption() != 0) throw OutputError("cannot write " + path + ": interrupted");
            if (n == 0 || (n < 0 && errno == EINTR)) continue;
        }
        // A pipe that polls writable takes PIPE_BUF bytes without blocking.
        const ssize_t n = ::write(fd, p, regular ? left : std::min<std::size_t>(left, PIPE_BUF));
        if (n < 0) {
            if (errno == EINTR || errno == EAGAIN) continue;
            fail(path, "write", errno);
        }
        p += n;
        left -= static_cast<std::size_t>(n);
    }
}

bool isRegular(int fd) {
    struct stat st {};
    return ::fstat(fd, &st) == 0 && S_ISREG(st.st_mode);
}

// Why a file that exists and is not a directory cannot take the output directly: -o writes
// regular files and devices; a FIFO or a socket could leave the command waiting for a reader.
std::string notWritableKind(const struct stat& st) {
    if (S_ISFIFO(st.st_mode)) return "it is a FIFO; -o writes regular files (use -o - and a pipe instead)";
    if (S_ISSOCK(st.st_mode)) return "it is a socket; -o writes regular files";
    return {};
}

// The place -o writes, resolved once per path so the early check and the write
// see the same file: the path itself, or the existing file a symbolic link leads to.
struct Target {
    std::string path;
    std::string refusal;  // why it cannot be written at all
};

const Target& targetOf(const std::string& path) {
    static std::map<std::string, Target> resolved;
    if (auto it = resolved.find(path); it != resolved.end()) return it->second;
    Target t{path, {}};
    struct stat st {};
    if (::lstat(path.c_str(), &st) == 0 && S_ISLNK(st.st_mode)) {
        if (char* real = ::realpath(path.c_str(), nullptr)) {
            t.path = real;
            std::free(real);
        } else {
            // A dangling link is refused: following it would create a file elsewhere, replacing it would drop the link.
            t.refusal = errno == ENOENT ? "it is a symbolic link to a missing file" : std::strerror(errno);
        }
    }
    return resolved.emplace(path, std::move(t)).first->second;
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
    if (std::fflush(stdout) != 0) fail("standard output", "write", errno);
    writeAll(STDOUT_FILENO, text, "standard output", isRegular(STDOUT_FILENO));
}

void writeDirectly(const std::string& path, const std::string& text) {
    // Never blocks in open: a FIFO put there since the check fails here instead of waiting.
    const int fd = ::open(path.c_str(), O_WRONLY | O_TRUNC | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0) fail(path, "open", errno);
    try {
        struct stat st {};
        if (::fstat(fd, &st) != 0) fail(path, "examine", errno);
        if (const std::string why = notWritableKind(st); !why.empty()) throw OutputError("cannot write " + path + ": " + why);
        writeAll(fd, text, path, S_ISREG(st.st_mode));
    } catch (...) {
        ::close(fd);
        throw;
    }
    if (::close(fd) != 0) fail(path, "close", errno);
}

// The mode and owner the new file takes: those of the file it replaces (health data
// kept 0600 stays 0600), else what the user's umask gives a new file.
void takeOverAccess(int fd, const std::string& path) {
    struct stat old {};
    if (::stat(path.c_str(), &old) != 0) {
        const mode_t mask = ::umask(0);
        ::umask(mask);
        if (::fchmod(fd, 0666 & ~mask) != 0) fail(path, "set the mode of the new file", errno);
        return;
    }
    mode_t mode = old.st_mode & 07777;
    // Another owner or group cannot always be kept; then the group may not gain what it had.
    if (::fchown(fd, old.st_uid, old.st_gid) != 0 && ::fchown(fd, static_cast<uid_t>(-1), old.st_gid) != 0)
        mode &= ~mode_t(S_IRWXG | S_ISGID);
    if (::fchmod(fd, mode) != 0) fail(path, "keep the mode of the file it replaces", errno);
}

void writeReplacing(const std::string& path, const std::string& text) {
    const std::string temp = temporaryName(path);
    // Only the owner reads the temporary file; it takes its final mode once complete.
    int fd = ::open(temp.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
    if (fd < 0) fail(path, "create " + temp, errno);
    try {
        writeAll(fd, text, path, true);
        takeOverAccess(fd, path);
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
    const Target& t = targetOf(path);
    if (!t.refusal.empty()) return false;
    struct stat st {};
    if (::stat(t.path.c_str(), &st) != 0) return errno == ENOENT;
    return S_ISREG(st.st_mode);
}

std::string unwritableReason(const std::string& path) {
    if (isStandardOutput(path)) return {};
    const Target& t = targetOf(path);
    if (!t.refusal.empty()) return t.refusal;
    const std::string& where = t.path;
    struct stat st {};
    const bool exists = ::stat(where.c_str(), &st) == 0;
    if (exists && S_ISDIR(st.st_mode)) return "it is a directory";
    if (exists) {
        if (const std::string why = notWritableKind(st); !why.empty()) return why;
        if (::access(where.c_str(), W_OK) != 0) return std::strerror(errno);
        if (!S_ISREG(st.st_mode)) return {};
    }
    const std::string dir = directoryOf(where);
    if (::access(dir.c_str(), W_OK | X_OK) != 0) return "directory " + dir + ": " + std::strerror(errno);
    return {};
}

void writeOutput(const std::string& path, const std::string& text) {
    if (isStandardOutput(path)) return writeStandardOutput(text);
    const Target& t = targetOf(path);
    if (!t.refusal.empty()) throw OutputError("cannot write " + path + ": " + t.refusal);
    // A symbolic link stays a link: its target is what gets written.
    if (!isReplaceableFile(path)) return writeDirectly(t.path, text);
    writeReplacing(t.path, text);
}

}  // namespace varnel::cli
