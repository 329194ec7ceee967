#include "cli/democommand.h"

#include "cli/commandline.h"
#include "cli/fitcommand.h"
#include "cli/simulatecommand.h"
#include "common/hosterror.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <vector>

#ifndef MCSIM_DEFAULT_EXAMPLES_DIR
#define MCSIM_DEFAULT_EXAMPLES_DIR "examples"
#endif

namespace MCHost {

namespace {

namespace fs = std::filesystem;

//! A folder for the demo's files: the given one (created when needed and kept), or a fresh
//! temporary one that is removed with the object.
class DemoFolder {
public:
    explicit DemoFolder(const std::string& given) {
        if (!given.empty()) {
            std::error_code ec;
            fs::create_directories(given, ec);
            if (ec) {
                throw HostError(
                    LocatedMessage(given, 0, "cannot create the folder: " + ec.message()));
            }
            fPath = given;
            return;
        }
        std::string pattern = (fs::temp_directory_path() / "mcsim-demo-XXXXXX").string();
        std::vector<char> buffer(pattern.begin(), pattern.end());
        buffer.push_back('\0');
        if (::mkdtemp(buffer.data()) == nullptr) {
            throw HostError(LocatedMessage(pattern, 0,
                                           std::string("cannot create a temporary folder: ") +
                                               std::strerror(errno)));
        }
        fPath = buffer.data();
        fbTemporary = true;
    }
    ~DemoFolder() {
        if (fbTemporary) {
            std::error_code ec;
            fs::remove_all(fPath, ec);
        }
    }
    DemoFolder(const DemoFolder&) = delete;
    DemoFolder& operator=(const DemoFolder&) = delete;

    std::string File(const std::string& name) const { return (fs::path(fPath) / name).string(); }
    bool IsTemporary() const { return fbTemporary; }

private:
    std::string fPath;        //!< the folder
    bool fbTemporary = false; //!< removed at the end
};

std::string Require(const std::string& path) {
    if (!fs::is_regular_file(path)) {
        throw HostError(LocatedMessage(path, 0,
                                       "the example file is missing (use --examples "
                                       "to name the examples folder)"));
    }
    return path;
}

} // namespace

CLI::App* AddDemoCommand(CLI::App& app, DemoOptions& options) {
    CLI::App* demo = app.add_subcommand(
        "demo", "Run the bundled example: fit examples/data/sales.csv, then simulate the plan");
    demo->add_option("--dir", options.fDir,
                     "Keep the plan, the JSON results and the simulated cases in this folder "
                     "(default: a temporary folder, removed afterwards)");
    demo->add_option("--examples", options.fExamplesDir,
                     "The examples folder (default: " + std::string(MCSIM_DEFAULT_EXAMPLES_DIR) +
                         ")");
    demo->add_option("--cases", options.fCases, "Cases to simulate")
        ->transform(WholeNumber(1, 10000000))
        ->capture_default_str();
    demo->add_option("--threads", options.fThreads, "Worker threads (0: one per processor)")
        ->transform(WholeNumber(0, 1024))
        ->capture_default_str();
    return demo;
}

int RunDemo(const DemoOptions& options, std::ostream& out, std::ostream& err) {
    try {
        const fs::path examples(options.fExamplesDir.empty() ? MCSIM_DEFAULT_EXAMPLES_DIR
                                                             : options.fExamplesDir);
        const std::string data = Require((examples / "data" / "sales.csv").string());
        const std::string model = Require((examples / "models" / "profit.model").string());
        const DemoFolder folder(options.fDir);

        FitOptions fit;
        fit.fDataPath = data;
        fit.fbCrosstabs = true;
        fit.fThreads = options.fThreads;
        fit.fPlanPath = folder.File("sales_plan.xml");
        fit.fModelPath = model;
        out << "== step 1 of 2: fit distributions to the example data ==\n\n$ mcsim fit " << data
            << " --crosstabs --threads " << options.fThreads << " --model " << model << " -o "
            << fit.fPlanPath << "\n\n";
        out.flush();
        const int fitStatus = RunFit(fit, out, err);
        if (fitStatus != 0) {
            return fitStatus;
        }

        SimulateOptions sim;
        sim.fPlanPath = fit.fPlanPath;
        sim.fCases = options.fCases;
        sim.fThreads = options.fThreads;
        sim.fTornadoDelta = 1.0;
        std::string extra;
        if (!folder.IsTemporary()) {
            sim.fJsonPath = folder.File("results.json");
            sim.fCasesOut = folder.File("cases.csv");
            extra = " --json " + sim.fJsonPath + " --cases-out " + sim.fCasesOut;
        }
        out << "\n== step 2 of 2: simulate the plan with the model ==\n\n$ mcsim simulate "
            << sim.fPlanPath << " --cases " << sim.fCases << " --threads " << sim.fThreads
            << " --tornado-delta 1" << extra << "\n\n";
        out.flush();
        const int simStatus = RunSimulate(sim, out, err);
        if (simStatus == 0 && folder.IsTemporary()) {
            out << "\n(the plan was written to a temporary folder, now removed; keep the files "
                   "with --dir FOLDER)\n";
        }
        return simStatus;
    } catch (const HostError& e) {
        err << "mcsim: " << e.what() << "\n";
        return 1;
    } catch (const std::exception& e) {
        err << "mcsim: " << e.what() << "\n";
        return 1;
    }
}

} // namespace MCHost
