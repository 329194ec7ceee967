// The command line's contract with the person or script that runs mcsim: what each exit status
// means, the checks of option values that CLI11's own validators phrase poorly (a range of
// DBL_MAX printed in 309 digits, "1e6" refused as a count), and the checks of the output files
// that run before any work, so a mistyped path costs nothing and never replaces an input.
#pragma once

#include <CLI/CLI.hpp>

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

namespace MCHost {

//! The exit statuses of the command, as README and --help list them.
namespace ExitStatus {
inline constexpr int kDone = 0;          //!< the work was done
inline constexpr int kFailed = 1;        //!< bad data, plan or model, or a failed run
inline constexpr int kUsage = 2;         //!< the command line is wrong; nothing was done
inline constexpr int kHangup = 129;      //!< ended by SIGHUP (128 + 1)
inline constexpr int kInterrupted = 130; //!< ended by SIGINT, Ctrl-C (128 + 2)
inline constexpr int kTerminated = 143;  //!< ended by SIGTERM (128 + 15)
} // namespace ExitStatus

//! The exit statuses in a few lines, for the footer of --help.
extern const char* const kExitStatusHelp;

//! Parses the command line into `app`'s options. Returns -1 when the command should run, or
//! the exit status to end with: 0 after --help or --version (printed on `out`), kUsage after a
//! one-line message on `err`.
int ParseCommandLine(CLI::App& app, int argc, const char* const* argv, std::ostream& out,
                     std::ostream& err);

//! A count given on the command line: a whole number from `min` to `max`, which may be written
//! with an exponent ("1e6"); the text is rewritten in plain digits for the option's integer.
CLI::Validator WholeNumber(std::int64_t min, std::int64_t max);
//! A finite number above 0 and at most `max`.
CLI::Validator PositiveUpTo(double max);

//! A file named on the command line and the option that named it ("-o", "--json", "data").
struct NamedFile {
    std::string fOption; //!< how the command line named it
    std::string fPath;   //!< the path as given
};

//! Refuses, with a UsageError naming the option and the path, an output that is the same file
//! as an input or as another output (by device and inode where the file exists, by the
//! normalised path otherwise), that is a folder, or that cannot be created in its folder.
//! Empty paths are skipped.
void CheckOutputFiles(const std::vector<NamedFile>& inputs, const std::vector<NamedFile>& outputs);

} // namespace MCHost
