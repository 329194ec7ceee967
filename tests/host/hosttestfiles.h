// Files for the host's tests: a fresh folder per test under the test temporary directory, and
// helpers to write and read whole files.
#pragma once

#include <gtest/gtest.h>

#include <sys/wait.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <sstream>
#include <string>
#include <vector>

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

//! Every file of `dir` (its captured standard error, stderr.txt, aside) with its content: equal
//! snapshots before and after a run mean the inputs are untouched and nothing was left behind.
inline std::map<std::string, std::string> Snapshot(const TempDir& dir) {
    std::map<std::string, std::string> files;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(dir.Path())) {
        const std::string name = entry.path().lexically_relative(dir.Path()).string();
        if (name != "stderr.txt") {
            files[name] = entry.is_regular_file() ? ReadFile(entry.path().string()) : "<dir>";
        }
    }
    return files;
}

//! What one run of the mcsim command did.
struct CommandRun {
    int status = -1; //!< exit status; -1 when the command did not exit normally (a crash)
    std::string out; //!< standard output
    std::string err; //!< standard error
};

//! `s` quoted for the shell.
inline std::string ShellQuote(const std::string& s) {
    std::string q = "'";
    for (char c : s) {
        q += (c == '\'') ? std::string("'\\''") : std::string(1, c);
    }
    return q + "'";
}

#ifdef MCSIM_EXE
//! Runs the mcsim command with `args`, standard input empty, standard error through the file
//! `errPath`.
inline CommandRun RunMcsim(const std::vector<std::string>& args, const std::string& errPath) {
    std::string command = ShellQuote(MCSIM_EXE);
    for (const std::string& a : args) {
        command += " " + ShellQuote(a);
    }
    command += " 2>" + ShellQuote(errPath) + " </dev/null";
    CommandRun run;
    FILE* pipe = ::popen(command.c_str(), "r");
    if (!pipe) {
        return run;
    }
    char buffer[4096];
    std::size_t n = 0;
    while ((n = std::fread(buffer, 1, sizeof buffer, pipe)) > 0) {
        run.out.append(buffer, n);
    }
    const int raw = ::pclose(pipe);
    run.status = WIFEXITED(raw) ? WEXITSTATUS(raw) : -1;
    run.err = ReadFile(errPath);
    return run;
}
#endif

} // namespace hosttest
