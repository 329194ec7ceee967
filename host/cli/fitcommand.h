// `mcsim fit DATA.csv`: fits distributions to the fields of a CSV file with the component's
// distribution fitting (DFCAlgorithm) and prints, per field, the candidates with their
// parameters and whatever goodness-of-fit statistics and best fit the results hold, then the
// correlations, the contingency table and the warnings. With -o it writes the simulation plan
// (every fitted field an autofit input completed with its best distribution, the fitted
// correlations and contingency table, the model file and its targets); with --fit-stats the
// fitting statistics document; with --json every candidate's results (cli/fitjson.h).
// --families/--exclude narrow the candidates, --choose/--empirical-below decide what the plan
// takes and --rank the report's order (cli/fitoptions.h); --bootstrap refits every candidate
// to samples drawn from it (cli/fitbootstrap.h). Files are written to a temporary name and
// renamed when whole.
#pragma once

#include <CLI/CLI.hpp>

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

namespace MCHost {

//! What the command line says about one fitting run.
struct FitOptions {
    std::string fDataPath;              //!< the CSV file
    std::vector<std::string> fvFields;  //!< fields to fit; empty: all but the weight
    std::vector<std::string> fvFactors; //!< fields fitted as categorical factors
    std::string fWeight;                //!< frequency weight field, "" none
    std::vector<std::string> fvLevels;  //!< NAME=LEVEL overrides
    std::string fTest = "ad";           //!< ad, ks or both
    bool fbCrosstabs = false;           //!< joint table of the categorical fields
    bool fbDetails = false;             //!< every field's candidates even for wide data
    int fCases = 0;                     //!< rows to use, 0 all
    int fBins = 100;                    //!< histogram bins
    int fThreads = 0;                   //!< worker threads, 0 one per processor
    std::string fDelimiter;             //!< field separator ("tab" for a tab), "" to find it
    bool fbDecimalComma = false;        //!< numbers are written with a decimal comma
    int fMaxOrdinalValues = 20;         //!< ordinal inference threshold
    //! Megabytes of the data kept in memory after the first reading for the fitting's passes
    //! (0: the file is read again for every pass).
    std::uint64_t fCacheMegabytes = 256;
    bool fbProgress = true;              //!< progress bar when stderr is a terminal
    std::string fPlanPath;               //!< -o: the plan file to write, "" none
    std::string fFitStatsPath;           //!< --fit-stats: the statistics document, "" none
    std::string fModelPath;              //!< --model: the formula model to record
    std::vector<std::string> fvTargets;  //!< --targets: the model targets to record
    std::vector<std::string> fvFixed;    //!< --fixed NAME=VALUE: fixed inputs of the plan
    std::string fJsonPath;               //!< --json: the results document, "" none
    std::vector<std::string> fvFamilies; //!< --families [FIELD=]Family,...: candidates kept
    std::vector<std::string> fvExclude;  //!< --exclude [FIELD=]Family,...: candidates left out
    std::string fChoose;                 //!< --choose ad|ks|aic|bic, "" the component's rule
    std::string fRank;                   //!< --rank ad|ks|aic|bic, "" the component's order
    double fEmpiricalBelow = -1.0;       //!< --empirical-below P, negative off
    int fBootstrap = 0;                  //!< --bootstrap N refits per candidate, 0 off
    std::int64_t fSeed = -1;             //!< --seed of the bootstrap; negative the default
};

//! Adds the `fit` subcommand to `app`, storing into `options`; returns it.
CLI::App* AddFitCommand(CLI::App& app, FitOptions& options);

//! Runs the fit. Results go to `out`, messages to `err`. Returns the exit status
//! (cli/commandline.h): 0 done, 1 failed (the message names the file, line or field), 2 a
//! usage error found before any work, 130 cancelled.
int RunFit(const FitOptions& options, std::ostream& out, std::ostream& err);

} // namespace MCHost
