// The shipped library as a client links it: the public API only, and the
// transport library that a default DllWrapper finds beside libvarnel (a whole
// session through a default component: python/tests).
#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include "varnel/dll_wrapper.h"

using namespace varnel;

namespace {

// Found from libvarnel's own place whatever the program's run path (sanitizer runtimes ignore it).
TEST(ShippedLibrary, TheDefaultTransportIsFoundBesideTheComponent) {
    const std::string path = DllWrapper::defaultTransportPath();
    ASSERT_TRUE(std::filesystem::path(path).is_absolute()) << path;
    EXPECT_TRUE(std::filesystem::equivalent(path, VARNEL_TEST_TRANSPORT_PATH)) << path;
}

}  // namespace
