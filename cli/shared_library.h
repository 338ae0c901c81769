// A shared library the command opens for its own controls, closed with the object.
#pragma once

#include <dlfcn.h>

#include <string>

namespace varnel::cli {

class SharedLibrary {
public:
    // Opens `path`; on failure the object holds no library and why() says why.
    explicit SharedLibrary(const std::string& path) : handle_(::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL)) {
        if (!handle_) {
            const char* why = ::dlerror();
            why_ = why ? why : "unknown reason";
        }
    }
    ~SharedLibrary() {
        if (handle_) ::dlclose(handle_);
    }
    SharedLibrary(const SharedLibrary&) = delete;
    SharedLibrary& operator=(const SharedLibrary&) = delete;

    explicit operator bool() const { return handle_ != nullptr; }
    const std::string& why() const { return why_; }
    // The address of `name`, or null when the library lacks it.
    void* find(const char* name) const { return handle_ ? ::dlsym(handle_, name) : nullptr; }

private:
    void* handle_;
    std::string why_;
};

}  // namespace varnel::cli
