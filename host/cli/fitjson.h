// The results of `mcsim fit --json` as one JSON document (schema in README.md, "mcsim fit"):
// the run, then per fitted field every candidate (parameters, standard errors and their
// correlations, statistics, p-values or their table bounds, log-likelihood and information
// criteria, why it was dropped, Q-Q and P-P points, bootstrap intervals), the plan's choice
// and why, then the correlations and the warnings. A missing value is null.
#pragma once

#include "cli/fitoptions.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "mccommon/mcmv.h"
#include "mccommon/mcstatus.h"

#include <nlohmann/json.hpp>

#include <cstdint>
#include <string>
#include <vector>

namespace MCHost {

//! Version of the document's layout; raised when a key changes meaning or goes away.
inline constexpr int kFitResultsFormatVersion = 1;

//! Percentile intervals of a parametric bootstrap of one candidate.
struct FitBootstrap {
    std::string fField;                             //!< the field
    MCSPConst::DistType fType;                      //!< the candidate
    int fReplicates = 0;                            //!< refits that gave an estimate
    double fLevel = 0.95;                           //!< interval level
    std::vector<double> fvLower;                    //!< per parameter, lower percentile
    std::vector<double> fvUpper;                    //!< per parameter, upper percentile
    double fPValue = MCCommon_800::MCMV::Missing(); //!< bootstrap p-value of the statistic
};

//! What the document says about the run besides the component's results.
struct FitJsonRun {
    std::string fDataPath;                 //!< the CSV file
    std::int64_t fRowsRead = 0;            //!< rows read
    std::int64_t fRowsUsed = 0;            //!< rows with a value in every fitted field
    double fTotalWeight = 0.0;             //!< W (the rows used without a weight field)
    std::string fWeightField;              //!< "" none
    std::string fTest;                     //!< ad, ks or both
    FitRule fChoose = FitRule::kComponent; //!< --choose
    FitRule fRank = FitRule::kComponent;   //!< --rank
    double fEmpiricalBelow = MCCommon_800::MCMV::Missing(); //!< --empirical-below, missing off
    std::vector<FitDecision> fvDecisions;                   //!< one per covariate
    std::vector<FitBootstrap> fvBootstraps;                 //!< --bootstrap results
    std::int64_t fSeed = -1;                                //!< --seed with --bootstrap
    int fBootstrapReplicates = 0;                           //!< --bootstrap N, 0 off
};

//! The document of `results` (the choices of `run` already applied) with the run's `warnings`.
nlohmann::ordered_json FitResultsToJson(const FitJsonRun& run,
                                        const MCMCSP_800::DFCOutputStats& results,
                                        const std::vector<MCCommon_800::MCStatus>& warnings);

//! The parameter names as reports show them: the plan calls the Gamma's second parameter and
//! the Exponential's parameter "scale", but both are rates (mean k/β and 1/θ).
std::vector<std::string> ReportParamNames(MCSPConst::DistType type, std::vector<std::string> names);

} // namespace MCHost
