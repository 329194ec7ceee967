#include "simulation_evaluation/secoutputstats.h"

#include "mccommon/display.h"
#include "simulation_common/mcspconst.h"

namespace MCMCSP_800 {

using MCCommon_800::MCStatus;
using MCMath_800::MCContStats;
using MCMath_800::MCProvMeans;
using MCMath_800::MCSymMatrix;

//! The state of SECOutputStats. A value: the results copy it whole.
class SECOutputStatsImpl {
public:
    SECOutputStatsImpl(const SPCSettings* plan, const SECSettings* settings,
                       const MCXML_800::MCVarList* variables)
        : fpPlan(plan), fpSettings(settings), fpVarList(variables) {}
    SECOutputStatsImpl(const SECOutputStatsImpl&) = default;
    SECOutputStatsImpl& operator=(const SECOutputStatsImpl&) = default;
    virtual ~SECOutputStatsImpl() = default;

    //! Lists the counts, names, model type and every target through the display stream.
    virtual void Display() const;

    const SPCSettings* fpPlan;                          //!< the plan, not owned
    const SECSettings* fpSettings;                      //!< the run settings, not owned
    const MCXML_800::MCVarList* fpVarList;              //!< the host's variables, not owned
    int fSimCaseCount = 0;                              //!< cases drawn, valid or not
    int fFilteredCaseCount = 0;                         //!< attempts rejected by bounds and filters
    int fValidCaseCount = 0;                            //!< cases scored and accumulated
    int fInvalidCaseCount = 0;                          //!< cases that failed
    const MCProvMeans* fpProvMeans = nullptr;           //!< inputs then targets, not owned
    bool fbStopCriteria = true;                         //!< a stop criterion ended the run
    int fThreadsUsed = 0;                               //!< worker threads of the run
    std::vector<SECContinuousTargetInfo> fvContTargets; //!< one per continuous target
    std::vector<SECCategoricalTargetInfo> fvCateTargets; //!< one per categorical target
    std::vector<std::string> fvCovariateNames;           //!< inputs of the correlated set
    std::vector<std::string> fvFactorNames;              //!< categorical inputs
    std::vector<std::string> fvPredictorNames;           //!< all simulated inputs
    std::string fSensIteraName;                          //!< the input varied over the iterations
    std::vector<MCContStats> fvCovarStats;               //!< one per covariate
    MCSymMatrix fSimulCorr;                              //!< correlations among the covariates
    std::vector<SECInputCorrelationPair> fvCorrPairs;    //!< the correlation model's pairs
    std::vector<double> fvCrstSimProbs; //!< share of valid cases per contingency cell
    SECOutputStats::PMMLModelType fModelType = MCXML_800::IMCScoreComputer::kOther; //!< model
    MCCommon_800::MCWarnings fWarnings;          //!< warnings of the results
    std::vector<MCStatus> fvStatComputeWarnings; //!< warnings of the statistics
    MCStatus fStatus;                            //!< status of the results
};

// ---- Display --------------------------------------------------------------------------------

void SECContinuousTargetInfo::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start display for continuous target variable: " + fName,
                       "End display for continuous target variable: " + fName);
    DisplayD("Target minimum value:", fMinimum);
    DisplayD("Target maximum value:", fMaximum);
    DisplayD("Target mean value:", fMean);
    DisplayD("Target standard deviation:", fStdDev);
    DisplayD("Lower for confidence interval:", fCiLower);
    DisplayD("Upper for confidence interval:", fCiUpper);
    fHistogram.Display();
    for (const MCScatterPlotData& plot : fvScatterPlots) {
        plot.Display();
    }
    DisplayDV("Pearson correlations:", fvPearsonCorrs);
    DisplayDV("Polyserial correlations:", fvPolyserialCorrs);
    DisplayDV("Polychoric correlations:", fvPolychoricCorrs);
    DisplayDV("Negative delta:", fvNegativeDelta);
    DisplayDV("Positive delta:", fvPositiveDelta);
    DisplayDV("Variance contribution:", fvVarianceContrib);
}

void SECCategoricalTargetInfo::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start display for categorical target variable: " + fName,
                       "End display for categorical target variable: " + fName);
    DisplayDV("Target category values:", fvCategoryValues);
    DisplayDV("Mean probability values:", fvMeanProbs);
    DisplayDV("Case counts for categories:", fvCatCounts);
    for (const MCHistogramData& histogram : fvProbHistograms) {
        histogram.Display();
    }
    for (const MCScatterPlotData& plot : fvScatterPlots) {
        plot.Display();
    }
    DisplayDV("Pearson correlations:", fvPearsonCorrs);
    DisplayDV("Polyserial correlations:", fvPolyserialCorrs);
    DisplayDV("Polychoric correlations:", fvPolychoricCorrs);
    DisplayDV("Case counts for clasters:", fvClusterCounts);
}

void SECOutputStatsImpl::Display() const {
    using namespace MCDisplay_800;
    DisplayI("Simulated case count:", fSimCaseCount);
    {
        DisplayFrame frame("Start of display output information for all continuous target",
                           "End of display output information for all continuous target");
        DisplayI("The count of simulated cases", fSimCaseCount);
        DisplayI("The number of filtered cases", fFilteredCaseCount);
        DisplayI("The count of valid cases", fValidCaseCount);
        DisplayI("The number of invalid cases", fInvalidCaseCount);
        DisplayB("Stopping Criteria", fbStopCriteria);
        DisplaySV("The covarate variable names", fvCovariateNames);
        DisplaySV("The factor variable names", fvFactorNames);
        DisplaySV("The predictor variable names", fvPredictorNames);
        DisplayS("The sensitivity iterations variable names", fSensIteraName);
        DisplayS("The model type", GetPMMLModelTypeDisplayWord(fModelType));
        for (const SECContinuousTargetInfo& target : fvContTargets) {
            target.Display();
        }
    }
    DisplayFrame frame("Start of display output information for all categorical target",
                       "End of display output information for all categorical target");
    for (const SECCategoricalTargetInfo& target : fvCateTargets) {
        target.Display();
    }
}

// ---- SECOutputStats -------------------------------------------------------------------------

SECOutputStats::SECOutputStats(const SECSettings& settings, const SPCSettings& plan,
                               const MCXML_800::MCVarList& variables)
    : fpImpl(std::make_unique<SECOutputStatsImpl>(&plan, &settings, &variables)) {}

SECOutputStats::SECOutputStats(const SECOutputStats& other)
    : fpImpl(std::make_unique<SECOutputStatsImpl>(*other.fpImpl)) {}

SECOutputStats& SECOutputStats::operator=(const SECOutputStats& other) {
    if (this != &other) {
        *fpImpl = *other.fpImpl;
    }
    return *this;
}

SECOutputStats::~SECOutputStats() = default;

const SECSettings* SECOutputStats::GetSECSettings() const {
    return fpImpl->fpSettings;
}
const SPCSettings* SECOutputStats::GetSPCSettings() const {
    return fpImpl->fpPlan;
}
const MCXML_800::MCVarList* SECOutputStats::GetMCVarList() const {
    return fpImpl->fpVarList;
}
const MCProvMeans* SECOutputStats::GetProvMeansPtr() const {
    return fpImpl->fpProvMeans;
}
void SECOutputStats::SetProvMeansPtr(const MCProvMeans* provMeans) {
    fpImpl->fpProvMeans = provMeans;
}

int SECOutputStats::GetSimCaseCount() const {
    return fpImpl->fSimCaseCount;
}
void SECOutputStats::SetSimCaseCount(int n) {
    fpImpl->fSimCaseCount = n;
}
int SECOutputStats::GetFilteredCaseCount() const {
    return fpImpl->fFilteredCaseCount;
}
void SECOutputStats::SetFilteredCaseCount(int n) {
    fpImpl->fFilteredCaseCount = n;
}
int SECOutputStats::GetValidCaseCount() const {
    return fpImpl->fValidCaseCount;
}
void SECOutputStats::SetValidCaseCount(int n) {
    fpImpl->fValidCaseCount = n;
}
int SECOutputStats::GetInvalidCaseCount() const {
    return fpImpl->fInvalidCaseCount;
}
void SECOutputStats::SetInvalidCaseCount(int n) {
    fpImpl->fInvalidCaseCount = n;
}
bool SECOutputStats::GetStopCriteria() const {
    return fpImpl->fbStopCriteria;
}
void SECOutputStats::SetStopCriteria(bool stopped) {
    fpImpl->fbStopCriteria = stopped;
}
int SECOutputStats::GetThreadsUsed() const {
    return fpImpl->fThreadsUsed;
}
void SECOutputStats::SetThreadsUsed(int n) {
    fpImpl->fThreadsUsed = n;
}

const std::vector<SECContinuousTargetInfo>& SECOutputStats::GetContTargetInfo() const {
    return fpImpl->fvContTargets;
}
std::vector<SECContinuousTargetInfo>& SECOutputStats::GetContTargetInfo() {
    return fpImpl->fvContTargets;
}
const std::vector<SECCategoricalTargetInfo>& SECOutputStats::GetCateTargetInfo() const {
    return fpImpl->fvCateTargets;
}
std::vector<SECCategoricalTargetInfo>& SECOutputStats::GetCateTargetInfo() {
    return fpImpl->fvCateTargets;
}

const std::vector<std::string>& SECOutputStats::GetCovariateNames() const {
    return fpImpl->fvCovariateNames;
}
void SECOutputStats::SetCovariateNames(const std::vector<std::string>& names) {
    fpImpl->fvCovariateNames = names;
}
const std::vector<std::string>& SECOutputStats::GetFactorNames() const {
    return fpImpl->fvFactorNames;
}
void SECOutputStats::SetFactorNames(const std::vector<std::string>& names) {
    fpImpl->fvFactorNames = names;
}
const std::vector<std::string>& SECOutputStats::GetPredictorNames() const {
    return fpImpl->fvPredictorNames;
}
void SECOutputStats::SetPredictorNames(const std::vector<std::string>& names) {
    fpImpl->fvPredictorNames = names;
}
const std::string& SECOutputStats::GetSensIteraName() const {
    return fpImpl->fSensIteraName;
}
void SECOutputStats::SetSensIteraName(const std::string& name) {
    fpImpl->fSensIteraName = name;
}
const std::vector<MCContStats>& SECOutputStats::GetCovarStats() const {
    return fpImpl->fvCovarStats;
}
std::vector<MCContStats>& SECOutputStats::GetCovarStats() {
    return fpImpl->fvCovarStats;
}
const MCSymMatrix& SECOutputStats::GetSimulCorr() const {
    return fpImpl->fSimulCorr;
}
MCSymMatrix& SECOutputStats::GetSimulCorr() {
    return fpImpl->fSimulCorr;
}
const std::vector<SECInputCorrelationPair>& SECOutputStats::GetInputCorrelationPairs() const {
    return fpImpl->fvCorrPairs;
}
std::vector<SECInputCorrelationPair>& SECOutputStats::GetInputCorrelationPairs() {
    return fpImpl->fvCorrPairs;
}
const std::vector<double>& SECOutputStats::GetCrstSimProbs() const {
    return fpImpl->fvCrstSimProbs;
}
std::vector<double>& SECOutputStats::GetCrstSimProbs() {
    return fpImpl->fvCrstSimProbs;
}

SECOutputStats::PMMLModelType SECOutputStats::GetModelType() const {
    return fpImpl->fModelType;
}
void SECOutputStats::SetModelType(PMMLModelType type) {
    fpImpl->fModelType = type;
}
const std::vector<MCStatus>& SECOutputStats::GetStatComputeWarnings() const {
    return fpImpl->fvStatComputeWarnings;
}
MCStatus SECOutputStats::GetStatus() const {
    return fpImpl->fStatus;
}

void SECOutputStats::Display(std::ostream& os) const {
    using namespace MCDisplay_800;
    ScopedOutStream redirect(os);
    DisplayText("SECOutputStats display start");
    fpImpl->Display();
    DisplayText("SECOutputStats display end");
}

} // namespace MCMCSP_800
