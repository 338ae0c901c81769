// A shared library a test opens by path with the platform's own loader (the
// same copy the component loads), and what it exports, by name.
#pragma once

#include <string>

#include "platform/native.h"

namespace varnel::test {

struct LoadedLibrary {
    std::string error;  // why it did not open
    void* handle;

    explicit LoadedLibrary(const char* path) : handle(detail::native::openLibrary(path, error)) {}
    ~LoadedLibrary() { detail::native::closeLibrary(handle); }
    LoadedLibrary(const LoadedLibrary&) = delete;
    LoadedLibrary& operator=(const LoadedLibrary&) = delete;

    // An exported function as a T (its pointer type), or null.
    template <class T>
    T function(const char* name) const {
        std::string ignored;
        return reinterpret_cast<T>(detail::native::librarySymbol(handle, name, ignored));
    }
    // An exported variable.
    template <class T>
    T& variable(const char* name) const {
        return *function<T*>(name);
    }
};

}  // namespace varnel::test
