#include "cli/commandline.h"

#include "common/atomicfile.h"
#include "common/hosterror.h"
#include "mccommon/numtext.h"

#include <cmath>
#include <filesystem>

#include <sys/stat.h>

namespace MCHost {

const char* const kExitStatusHelp =
    "Exit status:\n"
    "  0    done\n"
    "  1    the work failed: bad data, plan or model\n"
    "  2    usage error: unknown option, bad value, unusable output file; nothing was done\n"
    "  130  interrupted by Ctrl-C (SIGINT); 143 by SIGTERM; 129 by SIGHUP; no output file is "
    "left";

namespace {

namespace fs = std::filesystem;

//! CLI11's message on one line: its line breaks become spaces, trailing blanks go.
std::string OneLine(std::string text) {
    for (char& c : text) {
        if (c == '\n' || c == '\r') {
            c = ' ';
        }
    }
    while (!text.empty() && text.back() == ' ') {
        text.pop_back();
    }
    return text;
}

//! Where the options of the command that failed to parse are listed.
std::string HelpHint(const CLI::App& app) {
    std::string command = "mcsim";
    for (const CLI::App* sub : app.get_subcommands()) {
        command += " " + sub->get_name();
    }
    return "see '" + command + " --help'";
}

//! What tells two files apart: device and inode when the file exists, else its full path.
struct FileIdentity {
    bool fbExists = false; //!< stat found the file (following links)
    dev_t fDevice = 0;     //!< its device
    ino_t fInode = 0;      //!< its inode
    std::string fPath;     //!< absolute, normalised, links resolved as far as they exist
};

FileIdentity Identify(const std::string& path) {
    FileIdentity id;
    struct stat st {};
    if (::stat(path.c_str(), &st) == 0) {
        id.fbExists = true;
        id.fDevice = st.st_dev;
        id.fInode = st.st_ino;
    }
    std::error_code ec;
    const fs::path full = fs::weakly_canonical(fs::absolute(path, ec), ec);
    id.fPath = (ec ? fs::path(path) : full).lexically_normal().string();
    return id;
}

bool SameFile(const FileIdentity& a, const FileIdentity& b) {
    if (a.fbExists && b.fbExists) {
        return a.fDevice == b.fDevice && a.fInode == b.fInode;
    }
    return a.fPath == b.fPath;
}

} // namespace

int ParseCommandLine(CLI::App& app, int argc, const char* const* argv, std::ostream& out,
                     std::ostream& err) {
    try {
        app.parse(argc, argv);
        return -1;
    } catch (const CLI::ParseError& e) {
        if (e.get_exit_code() == static_cast<int>(CLI::ExitCodes::Success)) {
            return app.exit(e, out, err) == 0 ? ExitStatus::kDone : ExitStatus::kUsage;
        }
        err << "mcsim: " << OneLine(e.what()) << "; " << HelpHint(app) << "\n";
        return ExitStatus::kUsage;
    }
}

CLI::Validator WholeNumber(std::int64_t min, std::int64_t max) {
    const std::string range =
        "a whole number from " + std::to_string(min) + " to " + std::to_string(max);
    return CLI::Validator(
        [min, max, range](std::string& text) {
            double x = 0.0;
            if (!MCCommon_800::ParseDouble(text, x) || !std::isfinite(x)) {
                return "expected " + range + ", not '" + text + "'";
            }
            if (x != std::floor(x)) {
                return text + " is not a whole number; expected " + range;
            }
            if (x < static_cast<double>(min) || x > static_cast<double>(max)) {
                return text + " is out of range; expected " + range;
            }
            // Exact: every whole number of a count's range is a double.
            text = std::to_string(static_cast<std::int64_t>(x));
            return std::string();
        },
        std::to_string(min) + ".." + std::to_string(max));
}

CLI::Validator PositiveUpTo(double max) {
    const std::string range = "a number above 0 and at most " + MCCommon_800::FormatDefault(max);
    return CLI::Validator(
        [max, range](std::string& text) {
            double x = 0.0;
            if (!MCCommon_800::ParseDouble(text, x) || !(x > 0.0 && x <= max)) {
                return "expected " + range + ", not '" + text + "'";
            }
            return std::string();
        },
        "(0, " + MCCommon_800::FormatDefault(max) + "]");
}

void CheckOutputFiles(const std::vector<NamedFile>& inputs, const std::vector<NamedFile>& outputs) {
    std::vector<std::pair<const NamedFile*, FileIdentity>> seen;
    for (const NamedFile& input : inputs) {
        if (!input.fPath.empty()) {
            seen.emplace_back(&input, Identify(input.fPath));
        }
    }
    const std::size_t nInputs = seen.size();
    for (const NamedFile& output : outputs) {
        if (output.fPath.empty()) {
            continue;
        }
        const std::string named = output.fOption + " " + output.fPath;
        const FileIdentity id = Identify(output.fPath);
        for (std::size_t i = 0; i < seen.size(); ++i) {
            if (SameFile(id, seen[i].second)) {
                throw UsageError(
                    named + ": " +
                    (i < nInputs
                         ? "this is the " + seen[i].first->fOption + "; choose another output file"
                         : "this file is written by " + seen[i].first->fOption +
                               " already; choose another file"));
            }
        }
        std::error_code ec;
        if (fs::is_directory(output.fPath, ec)) {
            throw UsageError(named + ": this is a folder; name a file");
        }
        // Creating (and dropping) the temporary file the output will be written through shows
        // now, not after the work, whether the folder takes it.
        AtomicFileWriter probe(output.fPath);
        if (!probe.IsOpen()) {
            throw UsageError(output.fOption + " " + probe.GetError());
        }
        probe.Abort();
        seen.emplace_back(&output, id);
    }
}

} // namespace MCHost
