// A directory of its own for one test, removed afterwards.
#pragma once

#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <fstream>
#include <string>

namespace varnel::test {

struct TempDir {
    std::filesystem::path path =
        std::filesystem::temp_directory_path() /
        ("varnel_" + std::string(::testing::UnitTest::GetInstance()->current_test_info()->name()) + "_" +
         std::to_string(::getpid()));
    TempDir() { std::filesystem::create_directories(path); }
    ~TempDir() { std::filesystem::remove_all(path); }
    // The path of a file in it, written with the content when there is one.
    std::string file(const std::string& name, const std::string& content = {}) const {
        std::string p = (path / name).string();
        if (!content.empty()) std::ofstream(p, std::ios::binary) << content;
        return p;
    }
};

}  // namespace varnel::test
