// What `mcsim simulate` reports about a run: the component's results (one SECOutputStats per
// sensitivity iteration) turned into plain values that the text report (reporttext.cpp) and
// the JSON document (reportjson.h) both render, so the two always say the same thing.
//
// Percentiles are the target's order statistics, read from its quantile summary (exact up to
// 131,072 cases, within a rank error of 1e-4 past that), each with its distribution-free
// confidence interval. Results without a summary (the host-driven way) fall back to the
// histogram accumulator (1000 equal bins over the chart range plus outlier bins of the same
// width beyond it), exact to within one bin width.
#pragma once

#include "simulation_common/mcsphistogramdata.h"
#include "simulation_evaluation/secoutputstats.h"

#include <cstdint>
#include <ostream>
#include <string>
#include <vector>

namespace MCHost {

//! One non-empty bin of a histogram accumulator: [fLower, fUpper) with its count and the mean
//! of its values.
struct HistogramBin {
    double fLower = 0.0; //!< lower end
    double fUpper = 0.0; //!< upper end (equal to fLower for a histogram of one bin)
    double fCount = 0.0; //!< frequency count
    double fMean = 0.0;  //!< mean of the values in the bin
};

//! The non-empty bins of `histogram`, the outlier bins included, in value order. An outlier
//! bin of index b covers [minimum + b * width, minimum + (b + 1) * width), as a bin inside the
//! range does.
std::vector<HistogramBin> HistogramBins(const MCMCSP_800::MCHistogramData& histogram);

//! The `percent` percentile (0 to 100) of the values of `histogram`: the value below which
//! `percent` % of the count lies, interpolated linearly inside the bin that holds it (values
//! taken as spread evenly over the bin), so the error is at most one bin width. `minimum` and
//! `maximum`, the smallest and largest value seen (missing when unknown), narrow the outermost
//! bins. Missing for an empty histogram.
double HistogramPercentile(const MCMCSP_800::MCHistogramData& histogram, double percent,
                           double minimum, double maximum);

//! One row of a compact text histogram.
struct HistogramRow {
    double fLower = 0.0; //!< lower end
    double fUpper = 0.0; //!< upper end
    double fCount = 0.0; //!< values in [fLower, fUpper)
};

//! The bins regrouped into rows of a round width (1, 2, 2.5 or 5 times a power of ten, the
//! one nearest to a width of (maximum - minimum) / nRows, so there are between about
//! 0.7 nRows and 1.5 nRows rows) covering [minimum, maximum]; each bin goes to the row that
//! holds its mean.
std::vector<HistogramRow> GroupHistogram(const std::vector<HistogramBin>& bins, double minimum,
                                         double maximum, int nRows);

//! How a target relates to one simulated input of the correlated set.
struct ReportInputMeasures {
    std::string fInput;    //!< the input
    double fCorrelation;   //!< Pearson correlation of target and input
    double fDeltaNegative; //!< mean change of the target, input − δ (tornado)
    double fDeltaPositive; //!< mean change of the target, input + δ (tornado)
    double fVarianceShare; //!< contribution of the input to the target's variance
    //! First-order index Var(E[target | input]) / Var(target) from the run's cases; missing
    //! when not computed. Categorical inputs have this measure only.
    double fFirstOrder = MCCommon_800::MCMV::Missing();
    //! Accepted cases left out of the tornado (either side) and of the variance share: a
    //! shifted input outside its range, a variant the model could not score; −1 when the
    //! measure is off.
    std::int64_t fDeltaSkipped = -1;
    std::int64_t fVarianceSkipped = -1; //!< the same for the variance share
};

struct ReportPercentile {
    double fPercent; //!< 0 to 100
    double fValue;   //!< the percentile
    double fLower = MCCommon_800::MCMV::Missing(); //!< its CI's lower end; missing if none
    double fUpper = MCCommon_800::MCMV::Missing(); //!< its CI's upper end; missing if none
};

struct ReportContinuousTarget {
    std::string fName;                           //!< target
    double fMean;                                //!< mean
    double fStdDev;                              //!< standard deviation
    double fCiLower;                             //!< lower end of the mean's CI
    double fCiUpper;                             //!< upper end of the mean's CI
    double fMinimum;                             //!< smallest value
    double fMaximum;                             //!< largest value
    std::vector<ReportPercentile> fvPercentiles; //!< the requested percentiles
    //! How the percentiles were obtained: "exact" order statistics, a "summary" (rank error
    //! at most 1e-4) or the "histogram" (within a bin width).
    std::string fPercentileMethod;
    double fBinWidth;                            //!< the histogram's bin width
    std::vector<HistogramBin> fvBins;            //!< the histogram's non-empty bins
    std::vector<ReportInputMeasures> fvInputs;   //!< per covariate
};

struct ReportCategory {
    std::string fLabel;      //!< category label
    double fValue;           //!< category value as the results hold it
    double fCount;           //!< valid cases in the category
    double fShare;           //!< fCount over all counted cases
    double fMeanProbability; //!< mean predicted probability; missing without probabilities
};

struct ReportCategoricalTarget {
    std::string fName;                         //!< target
    std::vector<ReportCategory> fvCategories;  //!< in category order
    std::vector<ReportInputMeasures> fvInputs; //!< correlations per covariate
};

//! One pair of correlated inputs: the correlation the plan asks for, what the correlation model
//! could give, and the one simulated.
struct ReportCorrelation {
    std::string fFirst;  //!< input
    std::string fSecond; //!< input
    double fPlan;        //!< the plan's (missing when it sets none)
    double fSimulated;   //!< the simulated cases' (missing when not computed)
    double fNormal = MCCommon_800::MCMV::Missing(); //!< the normal-scale value used
    double fLow = MCCommon_800::MCMV::Missing();    //!< lowest attainable correlation
    double fHigh = MCCommon_800::MCMV::Missing();   //!< highest attainable correlation
    bool fbUnreachable = false;                     //!< the plan's lies outside [fLow, fHigh]
    //! |simulated − plan| over its standard error (1 − ρ²)/√(n − 1); missing when unknown.
    double fDeviation = MCCommon_800::MCMV::Missing();
};

//! One cell of the contingency table of the categorical inputs.
struct ReportCell {
    std::vector<std::string> fvCategories; //!< one category per factor
    double fPlan;                          //!< the plan's probability
    double fSimulated;                     //!< share of the valid simulated cases
};

//! The results of one sensitivity iteration.
struct ReportIteration {
    int fIndex = 0;              //!< iteration, from 0
    std::string fVaryingInput;   //!< what this iteration uses for the varying input; "" none
    std::int64_t fSimulated = 0; //!< cases drawn
    std::int64_t fFiltered = 0;  //!< draws rejected by bounds and target filters
    std::int64_t fValid = 0;     //!< cases scored and accumulated
    std::int64_t fInvalid = 0;   //!< cases that failed
    bool fbStopped = false;      //!< a stop criterion ended the run
    std::vector<ReportContinuousTarget> fvContinuous;   //!< continuous targets
    std::vector<ReportCategoricalTarget> fvCategorical; //!< categorical targets
    std::vector<ReportCorrelation> fvCorrelations;      //!< pairs of correlated inputs
    std::vector<std::string> fvFactors;                 //!< contingency factors
    std::vector<ReportCell> fvCells;                    //!< contingency cells
};

//! A status the run raised, with how often.
struct ReportWarning {
    long fCode = 0;        //!< status code
    bool fbWarning = true; //!< warning rather than error
    std::string fText;     //!< its sentence
    int fCount = 0;        //!< occurrences
};

//! Everything the command reports about one run.
struct SimulationReport {
    std::string fPlanPath;     //!< the plan file
    std::string fModelPath;    //!< the model file
    int fCases = 0;            //!< case limit per iteration
    std::uint32_t fSeed = 0;   //!< seed
    int fThreads = 1;          //!< worker threads the run used
    int fThreadsRequested = 1; //!< worker threads the settings allowed
    double fCiLevel = 0.95;    //!< confidence level
    //! Tornado delta in standard deviations; missing when the measure is off.
    double fTornadoDelta = MCCommon_800::MCMV::Missing();
    bool fbVariance = false;                   //!< contribution to variance computed
    bool fbHasStopCriterion = false;           //!< the plan has a stop criterion
    bool fbCancelled = false;                  //!< the run was interrupted
    std::vector<ReportIteration> fvIterations; //!< one per sensitivity iteration
    std::vector<ReportWarning> fvWarnings;     //!< statuses raised
    std::int64_t fModelErrors = 0;             //!< cases the model failed to score
    std::string fFirstModelError;              //!< the first of those messages
};

//! The report of one iteration's results; `percentiles` (0 to 100) of each continuous target
//! with their intervals at the run's confidence level.
ReportIteration BuildReportIteration(const MCMCSP_800::SECOutputStats& stats, int index,
                                     const std::vector<double>& percentiles);

//! The readable report: settings, counts, per target statistics, percentiles, a text
//! histogram, sensitivity measures, input correlations, contingency cells and warnings.
void WriteTextReport(std::ostream& out, const SimulationReport& report);

} // namespace MCHost
