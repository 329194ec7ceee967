#include "cli/simulatecommand.h"

#include "cli/commandline.h"
#include "cli/interrupt.h"
#include "cli/progress.h"
#include "cli/report.h"
#include "cli/reportjson.h"
#include "cli/statustext.h"
#include "common/atomicfile.h"
#include "common/hosterror.h"
#include "component/mcspassert.h"
#include "data/planchecks.h"
#include "data/plandictionary.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/numtext.h"
#include "mcthread/mcthread.h"
#include "mcxml/mcxmlreadwrite.h"
#include "mcxml/mcxmlutil.h"
#include "models/formulamodel.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secalgorithm.h"
#include "simulation_evaluation/secsettings.h"
#include "sinks/csvcasesink.h"

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMElement.hpp>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <condition_variable>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <map>
#include <mutex>
#include <sstream>
#include <thread>

namespace MCHost {

using MCCommon_800::MCStatus;
using MCMCSP_800::SECAlgorithm;
using MCMCSP_800::SECOutputStats;
using MCMCSP_800::SECSettings;
using MCMCSP_800::SPCSettings;

namespace {

namespace fs = std::filesystem;

//! The seed a run uses when none is given: the simulation settings' own default, so a plan
//! simulated twice gives the same results.
const std::uint32_t kDefaultSeed = SECSettings().GetSeed();

// ------------------------------------------------------------------------------------------
// Reading the plan and the model

//! The model file: --model, else the plan's model file relative to the plan's folder.
std::string ModelPath(const SimulateOptions& options, const SPCSettings& plan) {
    if (!options.fModelPath.empty()) {
        return options.fModelPath;
    }
    const std::string recorded = plan.GetModelFile();
    if (recorded.empty()) {
        throw HostError(LocatedMessage(options.fPlanPath, 0,
                                       "the plan names no model file; give one with --model"));
    }
    fs::path model(recorded);
    if (model.is_relative()) {
        model = fs::path(options.fPlanPath).parent_path() / model;
    }
    return model.lexically_normal().string();
}

// ------------------------------------------------------------------------------------------
// Running

//! Keeps the component's failed internal checks of this run, to report the first one.
struct AssertionLog {
    static std::atomic<int>& Count() {
        static std::atomic<int> count{0};
        return count;
    }
    static std::mutex& Mutex() {
        static std::mutex mutex;
        return mutex;
    }
    static std::string& First() {
        static std::string first;
        return first;
    }
    static void Record(const char* text, const char* file, int line) {
        if (Count().fetch_add(1) == 0) {
            std::lock_guard<std::mutex> guard(Mutex());
            First() = std::string(text) + " (" + file + ":" + std::to_string(line) + ")";
        }
    }
};

//! Installs AssertionLog for its lifetime.
class AssertionScope {
public:
    AssertionScope() : fPrevious(MCMCSP_800::SetAssertionHandler(&AssertionLog::Record)) {
        AssertionLog::Count().store(0);
    }
    ~AssertionScope() { MCMCSP_800::SetAssertionHandler(fPrevious); }
    AssertionScope(const AssertionScope&) = delete;
    AssertionScope& operator=(const AssertionScope&) = delete;

private:
    MCMCSP_800::AssertionHandler fPrevious; //!< restored at the end
};

//! Draws the progress bar from a thread of its own while the simulation runs: the
//! algorithm's case count can be read from any thread.
class ProgressThread {
public:
    ProgressThread(ProgressBar& bar, const SECAlgorithm& algorithm, std::uint64_t total) {
        if (!bar.IsActive()) {
            return;
        }
        fThread = std::thread([this, &bar, &algorithm, total] {
            std::unique_lock<std::mutex> lock(fMutex);
            while (!fbStop) {
                const auto done = static_cast<std::uint64_t>(
                    std::max<std::int64_t>(0, algorithm.GetSimulatedCaseCount()));
                bar.Show("simulating", done, total);
                fWake.wait_for(lock, std::chrono::milliseconds(100), [this] { return fbStop; });
            }
        });
    }
    ~ProgressThread() { Stop(); }
    ProgressThread(const ProgressThread&) = delete;
    ProgressThread& operator=(const ProgressThread&) = delete;

    //! Ends the drawing at once (not at the end of the current 0.1 s wait).
    void Stop() {
        {
            std::lock_guard<std::mutex> guard(fMutex);
            fbStop = true;
        }
        fWake.notify_all();
        if (fThread.joinable()) {
            fThread.join();
        }
    }

private:
    std::mutex fMutex;             //!< guards fbStop
    std::condition_variable fWake; //!< wakes the drawing thread to stop
    bool fbStop = false;           //!< the run is over
    std::thread fThread;           //!< draws the bar
};

//! Points the interrupt at the algorithm for its lifetime.
class CancelTarget {
public:
    CancelTarget(InterruptWatcher& watcher, SECAlgorithm& algorithm) : fWatcher(watcher) {
        fWatcher.SetTarget(&algorithm);
    }
    ~CancelTarget() { fWatcher.SetTarget(nullptr); }
    CancelTarget(const CancelTarget&) = delete;
    CancelTarget& operator=(const CancelTarget&) = delete;

private:
    InterruptWatcher& fWatcher; //!< the command's interrupt watcher
};

//! The case file's input columns: the simulated inputs in plan order, categorical ones with
//! their categories as labels.
std::vector<SinkColumn> InputColumns(const PlanDictionary& dict) {
    std::vector<SinkColumn> columns;
    for (const PlanInput& input : dict.GetSimulatedInputs()) {
        columns.push_back(SinkColumn{input.fName, input.fvCategories});
    }
    return columns;
}

std::vector<ReportWarning> CollectWarnings(const std::vector<MCStatus>& statuses) {
    std::map<std::pair<long, bool>, int> counts;
    for (const MCStatus& s : statuses) {
        if (!s.IsOK()) {
            ++counts[{s.GetErrorCode(), s.IsWarning()}];
        }
    }
    std::vector<ReportWarning> warnings;
    for (const auto& [key, count] : counts) {
        warnings.push_back(ReportWarning{key.first, key.second,
                                         StatusText(MCStatus(key.first, key.second)), count});
    }
    return warnings;
}

//! Fills the run settings from the options.
void FillSettings(const SimulateOptions& options, MCThread_800::IMCThreadFactory& threads,
                  SECSettings& settings) {
    settings.SetPlanFile(options.fPlanPath);
    settings.SetSeed(options.fSeed < 0 ? kDefaultSeed : static_cast<std::uint32_t>(options.fSeed));
    int nThreads = options.fThreads;
    if (nThreads < 1) {
        nThreads = static_cast<int>(std::max(1u, std::thread::hardware_concurrency()));
    }
    settings.SetMaxThreadNum(nThreads);
    settings.SetThreadFactory(&threads);
    settings.SetCiLevel(options.fCiLevel);
    if (options.fTornadoDelta > 0.0) {
        settings.SetTornadoDeltaStddev(options.fTornadoDelta);
    }
    settings.SetTornadoVariance(options.fbVariance);
    // Percentiles that hold in the tails and a first-order index of every input, from the
    // run's own cases.
    settings.SetQuantilesAndIndices(true);
}

//! Problems with the options that CLI11's checks do not see, and output files that would
//! replace an input or each other (`modelPath`: the model file, "" while it is not known).
void CheckOptions(const SimulateOptions& options, const std::string& modelPath) {
    for (double p : options.fvPercentiles) {
        if (!(p > 0.0 && p < 100.0)) {
            throw UsageError("--percentiles " + MCCommon_800::FormatDefault(p) +
                             ": a percentile lies strictly between 0 and 100 (such as 2.5 "
                             "or 97.5)");
        }
    }
    CheckOutputFiles({{"plan file", options.fPlanPath}, {"model file", modelPath}},
                     {{"--cases-out", options.fCasesOut}, {"--json", options.fJsonPath}});
}

//! The plan, completed against the variables built from it and the model, with its model.
struct PreparedPlan {
    SPCSettings fPlan;                              //!< what the algorithm copies
    std::string fModelPath;                         //!< the model file
    std::unique_ptr<PlanDictionary> fpDict;         //!< the variables of plan and model
    std::unique_ptr<FormulaScoreFactory> fpFactory; //!< scores the cases
    std::vector<std::string> fvWarnings;            //!< what the plan checks noted
};

//! Reads the plan and the model and checks them against each other; throws naming the file.
PreparedPlan PreparePlan(const SimulateOptions& options) {
    PreparedPlan prepared;
    prepared.fPlan = ReadPlanFile(options.fPlanPath, prepared.fvWarnings);
    SPCSettings& plan = prepared.fPlan;
    prepared.fModelPath = ModelPath(options, plan);
    FormulaModel model = FormulaModel::Load(prepared.fModelPath);
    prepared.fpDict =
        std::make_unique<PlanDictionary>(PlanDictionary::Build(plan, options.fPlanPath, model));
    prepared.fpFactory = std::make_unique<FormulaScoreFactory>(std::move(model));
    const MCXML_800::MCVarList& vars = prepared.fpDict->GetVarList();
    plan.CompleteVarInfo(vars);
    if (!plan.ValidateVarInfo(vars)) {
        throw HostError(
            LocatedMessage(options.fPlanPath, 0, "the plan does not match its own fields"));
    }
    plan.AdjustCategoricals(vars);
    plan.EncodeCatValues();
    if (options.fCases > 0) {
        plan.SetMaxCases(options.fCases);
    }
    if (plan.GetMaxCases() < 1) {
        throw HostError(LocatedMessage(options.fPlanPath, 0,
                                       "the plan simulates " + std::to_string(plan.GetMaxCases()) +
                                           " cases; give a number with --cases"));
    }
    return prepared;
}

SimulationReport MakeReport(const SimulateOptions& options, const PreparedPlan& prepared,
                            const SECSettings& settings,
                            const std::vector<SECOutputStats*>& results, SECAlgorithm& algorithm,
                            bool cancelled) {
    const SPCSettings& plan = prepared.fPlan;
    SimulationReport report;
    report.fPlanPath = options.fPlanPath;
    report.fModelPath = prepared.fModelPath;
    report.fCases = plan.GetMaxCases();
    report.fSeed = settings.GetSeed();
    // The threads the run really used: a stop criterion or categorical targets of a model
    // without a predicted field run on one, whatever was asked for.
    report.fThreadsRequested = settings.GetMaxThreadNum();
    report.fThreads = 0;
    for (const SECOutputStats* r : results) {
        report.fThreads = std::max(report.fThreads, r->GetThreadsUsed());
    }
    if (report.fThreads == 0) {
        report.fThreads = report.fThreadsRequested;
    }
    report.fCiLevel = settings.GetCiLevel();
    if (settings.UseTornadoStddev()) {
        report.fTornadoDelta = settings.GetTornadoDeltaStddev();
    }
    report.fbVariance = settings.TornadoVariance();
    report.fbHasStopCriterion =
        plan.GetStopCriteriaPointValueSize() + plan.GetStopCriteriaTailsSize() > 0;
    report.fbCancelled = cancelled;
    for (std::size_t i = 0; i < results.size(); ++i) {
        report.fvIterations.push_back(
            BuildReportIteration(*results[i], static_cast<int>(i), options.fvPercentiles));
    }
    report.fvWarnings = CollectWarnings(algorithm.GetWarningMessages().GetWarnings());
    report.fModelErrors = prepared.fpFactory->GetNErrors();
    report.fFirstModelError = prepared.fpFactory->GetFirstError();
    return report;
}

//! Puts the output files in place, both or neither: the JSON text waits in its temporary file
//! until the case file is in place, and the case file goes again if the JSON file fails.
//! False, with nothing written, when an interrupt came before the files were put in place.
bool CommitOutputs(const SimulateOptions& options, const SimulationReport& report,
                   AtomicFileWriter* json, CsvCaseSink* sink, InterruptWatcher& interrupt,
                   std::ostream& out) {
    if (json) {
        // Texts from the plan that are not valid UTF-8 get the replacement character.
        WriteJsonReport(json->GetStream(), report);
    }
    OutputCommitScope commits;
    if (interrupt.IsCancelled()) {
        return false;
    }
    interrupt.Finish();
    if (sink && !sink->Commit()) {
        throw HostError("--cases-out: " + sink->GetError());
    }
    if (json && !json->Commit()) {
        if (sink) {
            std::remove(options.fCasesOut.c_str());
        }
        throw HostError("--json: " + json->GetError());
    }
    if (sink) {
        out << "\n" << sink->GetNCases() << " cases written to " << options.fCasesOut << "\n";
    }
    if (json) {
        out << (sink ? "" : "\n") << "results written to " << options.fJsonPath << "\n";
    }
    return true;
}

} // namespace

CLI::App* AddSimulateCommand(CLI::App& app, SimulateOptions& options) {
    CLI::App* sim = app.add_subcommand(
        "simulate", "Simulate a plan with its model and print the targets' statistics");
    sim->add_option("plan", options.fPlanPath,
                    "Simulation plan file (XML), as `mcsim fit -o` "
                    "writes it")
        ->required();
    sim->add_option("--model", options.fModelPath,
                    "Formula model file (default: the plan's model file, relative to the "
                    "plan's folder)");
    sim->add_option("--cases", options.fCases,
                    "Cases to simulate per iteration (default: the plan's)")
        ->transform(WholeNumber(1, 2000000000));
    sim->add_option("--seed", options.fSeed,
                    "Seed of the random stream (default " + std::to_string(kDefaultSeed) + ")")
        ->transform(WholeNumber(0, 4294967295));
    sim->add_option("--threads", options.fThreads,
                    "Worker threads (0: one per processor); the results depend on the seed, "
                    "the cases and this number")
        ->transform(WholeNumber(0, 1024))
        ->capture_default_str();
    sim->add_option("--ci", options.fCiLevel,
                    "Confidence level of the intervals of the means, between 0 and 1")
        ->check(CLI::Validator(
            [](std::string& text) {
                double x = 0.0;
                if (!MCCommon_800::ParseDouble(text, x) || !(x > 0.0 && x < 1.0)) {
                    return std::string("expected a level between 0 and 1, such as 0.95");
                }
                return std::string();
            },
            "LEVEL"))
        ->capture_default_str();
    sim->add_option("--tornado-delta", options.fTornadoDelta,
                    "Tornado measure: the mean change of each target when an input moves by "
                    "this many of its standard deviations")
        ->check(PositiveUpTo(100.0));
    sim->add_flag("--variance", options.fbVariance,
                  "Contribution of each input to each target's variance");
    sim->add_option("--percentiles", options.fvPercentiles,
                    "Percentiles to report, comma-separated, each between 0 and 100")
        ->delimiter(',')
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll)
        ->capture_default_str();
    sim->add_option("--cases-out", options.fCasesOut, "Write the simulated cases to this CSV file");
    sim->add_option("--json", options.fJsonPath, "Write the results to this JSON file");
    return sim;
}

int RunSimulate(const SimulateOptions& options, std::ostream& out, std::ostream& err) {
    InterruptWatcher interrupt;
    ProgressBar progress(options.fbProgress);
    AssertionScope assertions;
    try {
        CheckOptions(options, options.fModelPath);
        PreparedPlan prepared = PreparePlan(options);
        for (const std::string& warning : prepared.fvWarnings) {
            err << "mcsim: warning: " << warning << "\n";
        }
        if (options.fModelPath.empty()) {
            CheckOptions(options, prepared.fModelPath);
        }
        if (interrupt.IsCancelled()) {
            err << "mcsim: interrupted while reading the plan; nothing was simulated or "
                   "written\n";
            return ExitStatus::kInterrupted;
        }
        const SPCSettings& plan = prepared.fPlan;
        FormulaScoreFactory& factory = *prepared.fpFactory;

        // Output files: fail now rather than after the run. The JSON document is written to
        // its temporary file at the end; the case sink opens its own when the cases begin.
        std::unique_ptr<AtomicFileWriter> json;
        if (!options.fJsonPath.empty()) {
            json = std::make_unique<AtomicFileWriter>(options.fJsonPath);
            if (!json->IsOpen()) {
                throw HostError("--json: " + json->GetError());
            }
        }
        std::unique_ptr<CsvCaseSink> sink;
        if (!options.fCasesOut.empty()) {
            sink = std::make_unique<CsvCaseSink>(options.fCasesOut, InputColumns(*prepared.fpDict));
            for (const FormulaTarget& t : factory.GetModel().GetTargets()) {
                if (t.fbCategorical) {
                    sink->SetTargetLabels(t.fName, t.fvLabels);
                }
            }
        }

        MCThread_800::MCStdThreadFactory threads;
        SECSettings settings;
        FillSettings(options, threads, settings);
        SECAlgorithm algorithm(settings, plan, prepared.fpDict->GetVarList());
        // The simulation reads no data; the iterator only has to report some.
        MCCommon_800::MCMemoryRecordIter noData;
        noData.Add(MCXML_800::Record(std::vector<double>{0.0}));
        MCStatus status = algorithm.BuildModel(noData, nullptr);
        if (status.IsError()) {
            throw HostError("the simulation settings were refused: " + StatusText(status) +
                            " (code " + std::to_string(status.GetErrorCode()) + ")");
        }
        algorithm.SetCancelPtr(&interrupt);
        {
            CancelTarget cancelTarget(interrupt, algorithm);
            ProgressThread bar(progress, algorithm,
                               static_cast<std::uint64_t>(plan.GetMaxCases()) *
                                   static_cast<std::uint64_t>(CountSensitivityIterations(plan)));
            status = algorithm.SimulateData(&factory, sink.get());
        }
        progress.Clear();
        const bool cancelled =
            status.GetErrorCode() == MCCommon_800::kCancelledCode || interrupt.IsCancelled();

        if (AssertionLog::Count().load() > 0) {
            std::lock_guard<std::mutex> guard(AssertionLog::Mutex());
            err << "mcsim: note: the simulation reported " << AssertionLog::Count().load()
                << " failed internal check(s); the first: " << AssertionLog::First() << "\n";
        }
        if (status.IsError() && !cancelled) {
            err << "mcsim: the simulation failed: " << StatusText(status) << " (code "
                << status.GetErrorCode() << ")\n";
            if (factory.GetNErrors() > 0) {
                err << "mcsim: the model failed on " << factory.GetNErrors()
                    << " cases; the first: " << factory.GetFirstError() << "\n";
            }
            return 1;
        }
        std::vector<SECOutputStats*> results;
        const MCStatus resultStatus = algorithm.GetOutputStats(results);
        if ((resultStatus.IsError() && !cancelled) || results.empty() ||
            std::any_of(results.begin(), results.end(),
                        [](const SECOutputStats* r) { return r == nullptr; })) {
            if (cancelled) {
                err << "mcsim: simulation interrupted before any results; nothing was "
                       "written\n";
                return ExitStatus::kInterrupted;
            }
            err << "mcsim: the simulation produced no results (code " << resultStatus.GetErrorCode()
                << ")\n";
            return 1;
        }

        const SimulationReport report =
            MakeReport(options, prepared, settings, results, algorithm, cancelled);
        WriteTextReport(out, report);
        if (cancelled) {
            std::int64_t done = 0;
            for (const ReportIteration& it : report.fvIterations) {
                done += it.fSimulated;
            }
            err << "mcsim: simulation interrupted after " << done
                << " cases; the results above are partial and no file was written\n";
            return ExitStatus::kInterrupted;
        }
        if (!CommitOutputs(options, report, json.get(), sink.get(), interrupt, out)) {
            err << "mcsim: interrupted while the results were reported; they are complete "
                   "above, but no file was written\n";
            return ExitStatus::kInterrupted;
        }
        return ExitStatus::kDone;
    } catch (...) {
        return ReportCommandFailure(progress, err);
    }
}

} // namespace MCHost
