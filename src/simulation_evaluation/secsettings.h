// SECSettings: the run settings of one simulation of a plan, filled by the host before it
// constructs SECAlgorithm.
//
// A few settings steer the run itself: the seed of the uniform stream, the thread limit and the
// thread factory, the cancel query and the progress listeners (SECAlgorithm, SECSimulator), the
// confidence level of the target means and the use of the model's category probabilities
// (target statistics), scatter plots, and the tornado measures (sensitivity). All the others
// are presentation choices of the host's output layer (charts, reference lines, percentiles);
// the component only carries them through to the results (SECOutputStats::GetSECSettings).
//
// SECSettings is a value: copy construction and assignment copy every member, the host's
// listener, cancel and factory pointers included (shallow: a copy uses the same host objects,
// which the settings never own), and the collected warnings. SECAlgorithm takes a copy at
// construction, and every SECSimulator reads that copy.
//
// Four settings are bit sets of single-bit flags (CDF order, continuous PDF view, categorical
// grouping, box-plot overlay grouping): each Has query is true when the stored set and the asked
// value have a bit in common.
#pragma once

#include "mccommon/hostinterfaces.h"
#include "mccommon/mcstatus.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspconst.h"

#include <cstdint>
#include <limits>
#include <ostream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

class SECSettings {
public:
    //! Seed of the uniform stream when the host sets none.
    static constexpr std::uint32_t kDefaultSeed = 629111597u;

    //! Every setting at its default.
    SECSettings() = default;

    // ---- Plan and random stream ----------------------------------------------------------

    const std::string& GetPlanFile() const { return fPlanFile; }
    void SetPlanFile(const std::string& path) { fPlanFile = path; }
    bool Reproducible() const { return fbReproducible; }
    void SetReproducible(bool reproducible) { fbReproducible = reproducible; }
    std::uint32_t GetSeed() const { return fSeed; }
    void SetSeed(std::uint32_t seed) { fSeed = seed; }
    //! Number of sensitivity iterations; below 1 means "not defined".
    int GetNSensIters() const { return fNSensIters; }
    void SetNSensIters(int n) { fNSensIters = n; }
    //! Use the model's target category probabilities when the model supplies them.
    bool GetUseTargCatProbs() const { return fbUseTargCatProbs; }
    void SetUseTargCatProbs(bool use) { fbUseTargCatProbs = use; }

    // ---- Distribution charts of continuous targets ---------------------------------------

    MCSPConst::DistDisplay GetDistributionDisplay() const { return fDistributionDisplay; }
    void SetDistributionDisplay(MCSPConst::DistDisplay display) { fDistributionDisplay = display; }
    //! Bit set of DistOrder flags.
    MCSPConst::DistOrder GetCDFOrder() const { return fCDFOrder; }
    void SetCDFOrder(MCSPConst::DistOrder order) { fCDFOrder = order; }
    //! Stores `order` unchanged as a bit set.
    void SetCDFOrder(int order) { fCDFOrder = static_cast<MCSPConst::DistOrder>(order); }
    bool ContinuousMean() const { return fbContinuousMean; }
    void SetContinuousMean(bool on) { fbContinuousMean = on; }
    bool ContinuousMedian() const { return fbContinuousMedian; }
    void SetContinuousMedian(bool on) { fbContinuousMedian = on; }
    //! Percentiles at which reference lines are drawn.
    const std::vector<double>& GetContinuousPCT() const { return fvContinuousPCT; }
    //! Replaces the percentile list with the one value `p`.
    void SetContinuousPCT(double p) { fvContinuousPCT.assign(1, p); }
    //! Replaces the percentile list with `p1` followed by `p2`.
    void SetContinuousPCT(double p1, double p2) { fvContinuousPCT = {p1, p2}; }
    int GetContinuousSigmas() const { return fContinuousSigmas; }
    void SetContinuousSigmas(int n) { fContinuousSigmas = n; }
    //! Positions on the horizontal axis that the user chose.
    const std::vector<double>& GetContinuousCustom() const { return fvContinuousCustom; }
    void SetContinuousCustom(const std::vector<double>& positions) {
        fvContinuousCustom = positions;
    }
    //! Bit set of DistView flags.
    MCSPConst::DistView GetContinuousPDFView() const { return fContinuousPDFView; }
    void SetContinuousPDFView(MCSPConst::DistView view) { fContinuousPDFView = view; }
    //! Stores `view` unchanged as a bit set.
    void SetContinuousPDFView(int view) {
        fContinuousPDFView = static_cast<MCSPConst::DistView>(view);
    }
    bool ContinuousOverlay() const { return fbContinuousOverlay; }
    void SetContinuousOverlay(bool on) { fbContinuousOverlay = on; }

    // ---- Charts of categorical targets ---------------------------------------------------

    bool CategoricalPredValue() const { return fbCategoricalPredValue; }
    void SetCategoricalPredValue(bool on) { fbCategoricalPredValue = on; }
    bool CategoricalPredProbability() const { return fbCategoricalPredProbability; }
    void SetCategoricalProbability(bool on) { fbCategoricalPredProbability = on; }
    //! Bit set of DistGroup flags.
    MCSPConst::DistGroup CategoricalGroup() const { return fCategoricalGroup; }
    void SetCategoricalGroup(MCSPConst::DistGroup group) { fCategoricalGroup = group; }
    //! Stores `group` unchanged as a bit set.
    void SetCategoricalGroup(int group) {
        fCategoricalGroup = static_cast<MCSPConst::DistGroup>(group);
    }

    // ---- Scatter plots and box plots -----------------------------------------------------

    //! Scatter plots of targets against the inputs marked for output; the simulation fills
    //! them only when this is on.
    bool ScatterplotDisplay() const { return fbScatterplotDisplay; }
    void SetScatterplotDisplay(bool on) { fbScatterplotDisplay = on; }
    int GetScatterplotRowsize() const { return fScatterplotRowsize; }
    void SetScatterplotRowsize(int n) { fScatterplotRowsize = n; }
    bool BoxplotDisplay() const { return fbBoxplotDisplay; }
    void SetBoxplotDisplay(bool on) { fbBoxplotDisplay = on; }
    bool BoxplotOverlayTargets() const { return fbBoxplotOverlayTargets; }
    void SetBoxplotOverlayTargets(bool on) { fbBoxplotOverlayTargets = on; }
    //! Bit set of BoxplotGroup flags.
    MCSPConst::BoxplotGroup GetBoxplotOverlayGroup() const { return fBoxplotOverlayGroup; }
    void SetBoxplotOverlayGroup(MCSPConst::BoxplotGroup group) { fBoxplotOverlayGroup = group; }
    //! Stores `group` unchanged as a bit set.
    void SetBoxplotOverlayGroup(int group) {
        fBoxplotOverlayGroup = static_cast<MCSPConst::BoxplotGroup>(group);
    }

    // ---- Tornado (sensitivity) measures ---------------------------------------------------

    bool TornadoDisplay() const { return fbTornadoDisplay; }
    void SetTornadoDisplay(bool on) { fbTornadoDisplay = on; }
    bool TornadoCorrelation() const { return fbTornadoCorrelation; }
    void SetTornadoCorrelation(bool on) { fbTornadoCorrelation = on; }
    //! True once SetTornadoDeltaStddev was called: the simulation then computes the change of
    //! each continuous target when an input moves by that many of its standard deviations.
    bool UseTornadoStddev() const { return fbUseTornadoStddev; }
    double GetTornadoDeltaStddev() const { return fTornadoDeltaStddev; }
    //! Stores `delta` and sets UseTornadoStddev (nothing clears it but a fresh SECSettings).
    void SetTornadoDeltaStddev(double delta) {
        fTornadoDeltaStddev = delta;
        fbUseTornadoStddev = true;
    }
    //! True once SetTornadoDeltaMean was called.
    bool UseTornadoDeltaMean() const { return fbUseTornadoDeltaMean; }
    double GetTornadoDeltaMean() const { return fTornadoDeltaMean; }
    //! Stores `delta` and sets UseTornadoDeltaMean (nothing clears it but a fresh SECSettings).
    void SetTornadoDeltaMean(double delta) {
        fTornadoDeltaMean = delta;
        fbUseTornadoDeltaMean = true;
    }
    //! Compute each input's contribution to the variance of each continuous target.
    bool TornadoVariance() const { return fbTornadoVariance; }
    void SetTornadoVariance(bool on) { fbTornadoVariance = on; }
    //! Added results of every continuous target, off by default: a quantile summary whose
    //! percentiles hold in the tails (SECContinuousTargetInfo::fQuantiles) and the first-order
    //! sensitivity index of every simulated input from the run's own cases
    //! (SECContinuousTargetInfo::fvFirstOrder).
    bool QuantilesAndIndices() const { return fbQuantilesAndIndices; }
    void SetQuantilesAndIndices(bool on) { fbQuantilesAndIndices = on; }
    bool TornadoAllCharts() const { return fbTornadoAllCharts; }
    void SetTornadoAllCharts(bool on) { fbTornadoAllCharts = on; }
    MCSPConst::OrdinalCorrelations GetOrdCorrelation() const { return fOrdCorrelation; }
    void SetOrdCorrelation(MCSPConst::OrdinalCorrelations type) { fOrdCorrelation = type; }

    // ---- Tables -------------------------------------------------------------------------

    bool DescriptiveDisplay() const { return fbDescriptiveDisplay; }
    void SetDescriptiveDisplay(bool on) { fbDescriptiveDisplay = on; }
    //! Confidence level of the confidence intervals of the target means.
    double GetCiLevel() const { return fCiLevel; }
    void SetCiLevel(double level) { fCiLevel = level; }
    bool PercentileDisplay() const { return fbPercentileDisplay; }
    void SetPercentileDisplay(bool on) { fbPercentileDisplay = on; }
    //! Number of equal-sized groups for percentiles.
    int GetNTILES() const { return fNTILES; }
    void SetNTILES(int n) { fNTILES = n; }
    //! Explicit percentiles.
    const std::vector<int>& GetPTILES() const { return fvPTILES; }
    void SetPTILES(const std::vector<int>& ptiles) { fvPTILES = ptiles; }
    bool PrintAssociations() const { return fbPrintAssociations; }
    void SetPrintAssociations(bool on) { fbPrintAssociations = on; }

    // ---- Reference lines ------------------------------------------------------------------
    // The default flags and the positions are independent: setting one never touches the
    // other.

    bool DefaultLowerRefLine() const { return fbDefaultLowerRefLine; }
    void SetDefaultLowerRefLine(bool on) { fbDefaultLowerRefLine = on; }
    bool DefaultUpperRefline() const { return fbDefaultUpperRefline; }
    void SetDefaultUpperRefline(bool on) { fbDefaultUpperRefline = on; }
    double GetLowerRefLine() const { return fLowerRefLine; }
    void SetLowerRefLine(double position) { fLowerRefLine = position; }
    double GetUpperRefLine() const { return fUpperRefLine; }
    void SetUpperRefLine(double position) { fUpperRefLine = position; }

    // ---- Chart style ------------------------------------------------------------------------

    const std::string& GetVizStyleSheetName() const { return fVizStyleSheetName; }
    void SetVizStyleSheetName(const std::string& name) { fVizStyleSheetName = name; }
    const std::string& GetVizStyleSheetLocation() const { return fVizStyleSheetLocation; }
    void SetVizStyleSheetLocation(const std::string& location) {
        fVizStyleSheetLocation = location;
    }

    // ---- Host objects (borrowed, never owned) and system limits ------------------------

    //! Overall progress.
    MCCommon_800::ProgressListener* GetProgressListener() const { return fpProgressListener; }
    void SetProgressListener(MCCommon_800::ProgressListener* p) { fpProgressListener = p; }
    //! Progress over sensitivity iterations.
    MCCommon_800::ProgressListener* GetIterProgressListener() const {
        return fpIterProgressListener;
    }
    void SetIterProgressListener(MCCommon_800::ProgressListener* p) { fpIterProgressListener = p; }
    //! Progress over simulated cases.
    MCCommon_800::ProgressListener* GetRecProgressListener() const { return fpRecProgressListener; }
    void SetRecProgressListener(MCCommon_800::ProgressListener* p) { fpRecProgressListener = p; }
    MCCommon_800::MCQueryCancel* GetCancelPointer() const { return fpCancel; }
    void SetCancelPointer(MCCommon_800::MCQueryCancel* p) { fpCancel = p; }
    //! Largest number of worker threads; at least 1.
    int GetMaxThreadNum() const { return fMaxThreadNum; }
    //! A limit below 1 is stored as 1: the run splits its cases over this many workers, and
    //! a limit of 0 or less would leave no worker to divide them among.
    void SetMaxThreadNum(int n) { fMaxThreadNum = n < 1 ? 1 : n; }
    //! Memory cache limit in KB.
    int GetMemCacheKB() const { return fMemCacheKB; }
    void SetMemCacheKB(int kb) { fMemCacheKB = kb; }
    MCThread_800::IMCThreadFactory* GetThreadFactory() const { return fpThreadFactory; }
    void SetThreadFactory(MCThread_800::IMCThreadFactory* p) { fpThreadFactory = p; }
    MCThread_800::MCThreadIterFactory* GetThreadIterFactory() const { return fpThreadIterFactory; }
    void SetThreadIterFactory(MCThread_800::MCThreadIterFactory* p) { fpThreadIterFactory = p; }

    //! Warnings gathered while the settings were filled; SECAlgorithm::BuildModel passes each
    //! on to the algorithm's warnings.
    const MCCommon_800::MCWarnings& GetWarningMessages() const { return fWarnings; }
    MCCommon_800::MCWarnings& GetWarningMessages() { return fWarnings; }

    // ---- Flag-set queries ---------------------------------------------------------------

    //! True when the stored set and `order` have a bit in common.
    bool HasCDFOrder(int order) const { return (fCDFOrder & order) != 0; }
    bool HasContinuousPDFView(int view) const { return (fContinuousPDFView & view) != 0; }
    bool HasCategoricalGroup(int group) const { return (fCategoricalGroup & group) != 0; }
    bool HasBoxplotOverlayGroup(int group) const { return (fBoxplotOverlayGroup & group) != 0; }

    //! Success: no combination of values is rejected at this level.
    MCCommon_800::MCStatus IsValidSettings() const { return MCCommon_800::MCStatus(); }

    //! Diagnostic listing of every setting, one labelled line each, to `os`.
    void Display(std::ostream& os) const;

private:
    std::string fPlanFile;              //!< path of the simulation plan file
    bool fbReproducible = true;         //!< results of this run are to be reproducible
    std::uint32_t fSeed = kDefaultSeed; //!< seed of the uniform random stream
    int fNSensIters = 0;                //!< sensitivity iterations; < 1 not defined
    bool fbUseTargCatProbs = true;      //!< use the model's target category probabilities

    MCSPConst::DistDisplay fDistributionDisplay = MCSPConst::kDisplayPDF; //!< charts to draw
    MCSPConst::DistOrder fCDFOrder = MCSPConst::kOrderAscending;          //!< CDF order bits
    bool fbContinuousMean = false;                                        //!< line at the mean
    bool fbContinuousMedian = false;                                      //!< line at the median
    std::vector<double> fvContinuousPCT;    //!< percentiles with reference lines
    int fContinuousSigmas = 0;              //!< standard deviations marked
    std::vector<double> fvContinuousCustom; //!< user positions on the horizontal axis
    MCSPConst::DistView fContinuousPDFView = MCSPConst::kViewCurve; //!< PDF view bits
    bool fbContinuousOverlay = false; //!< all scale targets on one chart

    bool fbCategoricalPredValue = true;        //!< bar chart of the predicted value
    bool fbCategoricalPredProbability = false; //!< histograms of the category probabilities
    MCSPConst::DistGroup fCategoricalGroup = MCSPConst::kGroupCats; //!< grouping bits

    bool fbScatterplotDisplay = false;    //!< scatter plots of targets against inputs
    int fScatterplotRowsize = 0;          //!< scatter plots per display row
    bool fbBoxplotDisplay = false;        //!< box plots
    bool fbBoxplotOverlayTargets = false; //!< box plots of all targets on one chart
    MCSPConst::BoxplotGroup fBoxplotOverlayGroup = MCSPConst::kBoxplotTargets; //!< grouping bits

    bool fbTornadoDisplay = false;      //!< tornado charts
    bool fbTornadoCorrelation = true;   //!< tornado chart of correlations
    bool fbUseTornadoStddev = false;    //!< a delta in standard deviations is set
    double fTornadoDeltaStddev = 0.0;   //!< that delta
    bool fbUseTornadoDeltaMean = false; //!< a delta of the mean is set
    double fTornadoDeltaMean = 0.0;     //!< that delta
    bool fbTornadoVariance = false;     //!< compute contribution to variance
    bool fbQuantilesAndIndices = false; //!< quantile summaries and first-order indices
    bool fbTornadoAllCharts = false;    //!< show all tornado charts
    MCSPConst::OrdinalCorrelations fOrdCorrelation = MCSPConst::kCorrPearson; //!< ordinal measure

    bool fbDescriptiveDisplay = true; //!< descriptive statistics table
    double fCiLevel = 0.95;           //!< confidence level of the target means
    bool fbPercentileDisplay = false; //!< percentile table
    int fNTILES = 0;                  //!< equal-sized groups for percentiles
    std::vector<int> fvPTILES;        //!< explicit percentiles
    bool fbPrintAssociations = false; //!< print associations between inputs

    bool fbDefaultLowerRefLine = true; //!< lower reference line at its default position
    bool fbDefaultUpperRefline = true; //!< upper reference line at its default position
    double fLowerRefLine = std::numeric_limits<double>::lowest(); //!< lower line position
    double fUpperRefLine = std::numeric_limits<double>::max();    //!< upper line position

    std::string fVizStyleSheetName;     //!< chart style sheet name
    std::string fVizStyleSheetLocation; //!< chart style sheet location

    MCCommon_800::ProgressListener* fpProgressListener = nullptr;     //!< host's, not owned
    MCCommon_800::ProgressListener* fpIterProgressListener = nullptr; //!< host's, not owned
    MCCommon_800::ProgressListener* fpRecProgressListener = nullptr;  //!< host's, not owned
    MCCommon_800::MCQueryCancel* fpCancel = nullptr;                  //!< host's, not owned
    int fMaxThreadNum = 1;                                            //!< worker thread limit
    int fMemCacheKB = 1024;                                           //!< memory cache in KB
    MCThread_800::IMCThreadFactory* fpThreadFactory = nullptr;        //!< host's, not owned
    MCThread_800::MCThreadIterFactory* fpThreadIterFactory = nullptr; //!< host's, not owned

    MCCommon_800::MCWarnings fWarnings; //!< warnings gathered while filling the settings
};

} // namespace MCMCSP_800
