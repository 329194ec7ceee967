// Files for the host's tests: a fresh folder per test under the test temporary directory, and
// helpers to write and read whole files.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>
#include <string>

namespace hosttest {

//! A folder that exists for the lifetime of the object.
class TempDir {
public:
    TempDir() {
        const auto* info = ::testing::UnitTest::GetInstance()->current_test_info();
        std::string name = std::string(info->test_suite_name()) + "_" + info->name();
        for (char& c : name) {
            if (c == '/') {
                c = '_';
            }
        }
        fPath = std::filesystem::path(::testing::TempDir()) / ("mcsim_host_" + name);
        std::filesystem::remove_all(fPath);
        std::filesystem::create_directories(fPath);
    }
    ~TempDir() {
        std::error_code ec;
        std::filesystem::remove_all(fPath, ec);
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    //! The path of `name` inside the folder.
    std::string File(const std::string& name) const { return (fPath / name).string(); }
    //! Writes `content` byte for byte to `name` and returns its path.
    std::string Write(const std::string& name, const std::string& content) const {
        const std::string path = File(name);
        std::ofstream out(path, std::ios::binary);
        out << content;
        return path;
    }
    //! Number of entries in the folder.
    std::size_t Count() const {
        return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator(fPath),
                                                      std::filesystem::directory_iterator()));
    }
    const std::filesystem::path& Path() const { return fPath; }

private:
    std::filesystem::path fPath; //!< the folder
};

inline std::string ReadFile(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    std::ostringstream os;
    os << in.rdbuf();
    return os.str();
}

} // namespace hosttest
