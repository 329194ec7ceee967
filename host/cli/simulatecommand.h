// `mcsim simulate PLAN.xml`: simulates a plan with the component's simulation (SECAlgorithm)
// and a formula model, and prints per sensitivity iteration the case counts and, per target,
// the mean with its confidence interval, the spread, percentiles, a text histogram, category
// shares and the sensitivity measures asked for, then the simulated correlations of the inputs
// beside the plan's. With --json the same results go to a JSON document, with --cases-out the
// simulated cases to a CSV file; both are written to a temporary name and renamed when whole,
// and neither is written when the run fails or is interrupted.
//
// The host's variables come from the plan and the model (PlanDictionary); the model file is
// the one the plan names (relative to the plan's folder) unless --model gives another.
#pragma once

#include <CLI/CLI.hpp>

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

namespace MCHost {

//! What the command line says about one simulation run.
struct SimulateOptions {
    std::string fPlanPath;      //!< the plan file
    std::string fModelPath;     //!< --model; "" for the plan's model file
    int fCases = 0;             //!< --cases; 0 for the plan's case limit
    std::int64_t fSeed = -1;    //!< --seed; negative for the default seed
    int fThreads = 0;           //!< worker threads, 0 one per processor
    double fCiLevel = 0.95;     //!< confidence level of the means' intervals
    double fTornadoDelta = 0.0; //!< tornado delta in standard deviations, 0 off
    bool fbVariance = false;    //!< compute the contribution to variance
    std::string fCasesOut;      //!< --cases-out: the case file, "" none
    std::string fJsonPath;      //!< --json: the results document, "" none
    std::vector<double> fvPercentiles{5.0, 25.0, 50.0, 75.0, 95.0}; //!< percentiles to report
    bool fbProgress = true; //!< progress bar when stderr is a terminal
};

//! Adds the `simulate` subcommand to `app`, storing into `options`; returns it.
CLI::App* AddSimulateCommand(CLI::App& app, SimulateOptions& options);

//! Runs the simulation. The report goes to `out`, messages to `err`. Returns the exit status
//! (cli/commandline.h): 0 done, 1 failed (the message names the file, line or field), 2 a
//! usage error found before the run, 130 interrupted (the results so far are printed, no file
//! is written).
int RunSimulate(const SimulateOptions& options, std::ostream& out, std::ostream& err);

} // namespace MCHost
