// The simulation plan held in memory: the predictive model files and their targets, the
// simulated and fixed inputs, the correlations between simulated inputs, the contingency table
// of categorical inputs, the stop criteria, the settings of automatic distribution fitting, the
// run settings and the system settings that the host hands over.
//
// The plan file reader (MCPlanXMLHandler::ParsePlanFile) fills a plan, the writer
// (MCPlanXMLHandler::WritePlanFile) writes one out, fitting results complete it, and the
// simulation algorithm takes a copy. SPCSettings and its nested records are values: copies
// are deep, except for the host's pointers, which are borrowed and copied as pointers.
#pragma once

#include "distribution_fitting/dfcoutputstats.h"
#include "mccommon/hostinterfaces.h"
#include "mccommon/mcstatus.h"
#include "mccommon/variables.h"
#include "mcmath/mcsymmatrix.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcspconst.h"
#include "simulation_common/simulatespecs.h"

#include <cstddef>
#include <cstdint>
#include <limits>
#include <ostream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

class SPCSettings {
public:
    //! Which list the iteration index of a sensitivity run points into.
    enum DistInputType : std::int32_t {
        kIterAutofitInput = 0, //!< a simulated autofit input with several distributions
        kIterManualInput = 1,  //!< a simulated manual input with several distributions
        kIterFixedInput = 2,   //!< a fixed input with several values
        kIterNone = 3          //!< no iteration
    };

    //! One target of a predictive model.
    struct ModelFileTarget {
        std::string fName;                //!< target field name
        std::string fMapName;             //!< field the target is mapped to
        std::string fOutputFormat;        //!< display format
        bool fbExcludeFromOutput = false; //!< simulated but left out of the output
        std::string fComment;             //!< free comment
        bool fbHasTargetFilter = false;   //!< the filter below applies
        double fFilterLow = std::numeric_limits<double>::lowest(); //!< lower filter bound
        double fFilterHigh = std::numeric_limits<double>::max();   //!< upper filter bound
        bool fbIncludeLow = true;                                  //!< the lower bound is inclusive
        bool fbIncludeHigh = true;                                 //!< the upper bound is inclusive
        MCSPConst::MeasureLevel fMeasurementLevel = MCSPConst::kLevelUnknown; //!< target level

        //! Diagnostic print to the display stream.
        void Display() const;
    };

    //! One predictive model file with its targets.
    struct ModelFileElem {
        std::string fFilePath;                  //!< path of the model file
        bool fbCustomModel = false;             //!< a custom (user-built) model
        std::vector<ModelFileTarget> fvTargets; //!< the model's targets, in order

        //! Diagnostic print to the display stream.
        void Display() const;
    };

    //! One cell of the correlation matrix, named by its row and column variables.
    struct CorrMatrixCell {
        std::string fRowVar; //!< row variable
        std::string fColVar; //!< column variable
        double fValue = 0.0; //!< correlation (may be missing)
    };

    //! Stop when the confidence interval of a target's mean is narrow enough.
    struct StopCriteriaPointValue {
        std::int32_t fStatistic = MCSPConst::kStatisticMean; //!< statistic; 0 (mean) only
        std::string fTargetName;                             //!< target
        double fThreshold = 0.0;                             //!< half-width allowed
        MCSPConst::UnitType fUnit = MCSPConst::kUnitValue;   //!< unit of the threshold
        double fCiLevel = 0.95;                              //!< confidence level in (0, 1)

        //! Diagnostic print to the display stream.
        void Display() const;
    };

    //! Stop when enough simulated values of a target fall in a tail.
    struct StopCriteriaTails {
        std::string fTargetName;                           //!< target
        double fThreshold = 0.0;                           //!< tail boundary
        MCSPConst::SideType fSide = MCSPConst::kSideRight; //!< which tail
        MCSPConst::TailType fType = MCSPConst::kTailValue; //!< value or percentile
        std::int32_t fFrequency = 0;                       //!< cases required in the tail

        //! Diagnostic print to the display stream.
        void Display() const;
    };

    //! An empty plan with the default settings.
    SPCSettings() = default;

    // ---- Model ---------------------------------------------------------------------------

    //! Sets the path and custom flag of the first model file, creating it when there is none.
    void SetModel(const std::string& path, bool custom);
    //! Appends `target` to the first model file, creating it when there is none.
    void AddModelTarget(const ModelFileTarget& target);
    //! Assigns target `i` of the first model file, growing its list with default targets as
    //! needed; does nothing without a model file.
    void SetModelTarget(std::size_t i, const ModelFileTarget& target);
    //! Appends a model file.
    void AddModelFileInfo(const ModelFileElem& file) { fvModelFiles.push_back(file); }
    //! Appends a default model file and returns it (valid until the list changes).
    ModelFileElem* CreateModelFileInfo();
    const std::vector<ModelFileElem>& GetModelFileInfo() const { return fvModelFiles; }
    std::vector<ModelFileElem>& GetModelFileInfo() { return fvModelFiles; }
    //! The first model file's path, or "".
    std::string GetModelFile() const;
    //! The first model file's custom flag, or false.
    bool IsCustomModel() const;
    //! Replaces `targets` by the first model file's targets (empty without a model file).
    void GetModelTargets(std::vector<ModelFileTarget>& targets) const;
    //! The first model file's targets whose level is neither categorical nor ordinal.
    std::vector<const ModelFileTarget*> GetContinuousModelTargets() const;
    //! The first model file's targets whose level is categorical or ordinal.
    std::vector<const ModelFileTarget*> GetCategoricalModelTargets() const;

    // ---- Inputs --------------------------------------------------------------------------
    // An input whose name is already a simulated or fixed input is ignored. An input with
    // several distributions or values becomes the iteration input (the last such one wins).

    void AddSimulationInput(const SimInputSpecs& input);
    void AddFixedInput(const FixedInputSpecs& input);
    //! A numeric fixed input with `values`.
    void AddFixedInput(const std::string& name, const std::vector<double>& values,
                       const std::string& format);
    //! A text fixed input with `values`.
    void AddFixedInput(const std::string& name, const std::vector<std::string>& values,
                       const std::string& format);
    //! A numeric fixed input stepping through `n` evenly spaced values from `low` to `high`;
    //! nothing is added unless `high` > `low` and `n` > 1.
    void AddFixedInput(const std::string& name, double low, double high, int n,
                       const std::string& format);

    const std::vector<SimInputSpecs>& GetSimulationInput() const { return fvSimInputs; }
    std::vector<SimInputSpecs>& GetSimulationInput() { return fvSimInputs; }
    const std::vector<FixedInputSpecs>& GetFixedInput() const { return fvFixedInputs; }
    std::vector<FixedInputSpecs>& GetFixedInput() { return fvFixedInputs; }
    //! The first simulated input named `name`, or null.
    SimInputSpecs* GetSimInput(const std::string& name);
    const SimInputSpecs* GetSimInput(const std::string& name) const;
    //! The first fixed input named `name`, or null.
    FixedInputSpecs* GetFixedInput(const std::string& name);
    const FixedInputSpecs* GetFixedInput(const std::string& name) const;
    //! True when a simulated or fixed input is named `name`.
    bool CheckExist(const std::string& name) const;
    //! Sets the associated targets of the fixed input `name`, when there is one.
    void SetFixedInputAssociatedTargets(const std::string& name,
                                        const std::vector<std::string>& targets);
    //! Position of the iteration input in its list; -1 when there is none.
    int GetIterationIndex() const { return fIterationIndex; }
    DistInputType GetIterationType() const { return fIterationType; }

    // ---- Correlations --------------------------------------------------------------------
    // Row and column r of the matrix belong to correlation variable r. Built cell by cell the
    // matrix is lower-triangular (row r holds r + 1 entries, 1.0 on the diagonal); filled
    // from a symmetric matrix every row holds one entry per variable.

    void SetCorrLocked(bool locked) { fbCorrLocked = locked; }
    bool GetCorrLocked() const { return fbCorrLocked; }
    void SetCorrVarList(const std::vector<std::string>& names) { fvCorrVars = names; }
    const std::vector<std::string>& GetCorrVarList() const { return fvCorrVars; }
    const std::vector<std::vector<double>>& GetCorrMatrix() const { return fvvCorrMatrix; }
    //! Appends `row` unchanged.
    void AddCorrMatrixRow(const std::vector<double>& row) { fvvCorrMatrix.push_back(row); }
    //! Stores the correlation of two variables, registering either when it is new.
    void SetCorrMatrixCell(const std::string& rowVar, const std::string& colVar, double value);
    //! Replaces `cells` by the lower triangle of the matrix, diagonal included, row by row.
    void GetCorrMatrixCellCollection(std::vector<CorrMatrixCell>& cells) const;
    //! Replaces `cells` by the lower triangle, diagonal included, of the fitting results'
    //! correlation matrix, named by the covariate records. True with no cells for a matrix of
    //! at most one row; false with no cells when `results` is null, a row cannot be read or
    //! the matrix has more rows than there are covariate records.
    static bool GetCorrMatrixCellCollectionFrom(std::vector<CorrMatrixCell>& cells,
                                                const DFCOutputStats* results);
    //! Makes the continuous and ordinal simulated inputs the correlation variables, with the
    //! identity as their matrix.
    void InitCorrMatrix();
    //! Fills the matrix from `m` over the current correlation variables; variables beyond the
    //! size of `m` get identity rows. False, with an empty matrix, when `m` has more rows than
    //! there are variables or a row cannot be read.
    bool SetDFCCorrMatrix(const MCMath_800::MCSymMatrix& m);

    // ---- Contingency table ---------------------------------------------------------------
    // Rows hold one category text per factor and have one probability each.

    void SetCrstabsFactors(const std::vector<std::string>& factors) { fvCrstabsFactors = factors; }
    const std::vector<std::string>& GetCrstabsFactors() const { return fvCrstabsFactors; }
    void SetCrstabsMatrix(const std::vector<std::vector<std::string>>& rows) {
        fvvCrstabsMatrix = rows;
    }
    const std::vector<std::vector<std::string>>& GetCrstabsMatrix() const {
        return fvvCrstabsMatrix;
    }
    std::vector<std::vector<std::string>>& GetCrstabsMatrix() { return fvvCrstabsMatrix; }
    void SetCrstabsProbs(const std::vector<double>& probs) { fvCrstabsProbs = probs; }
    const std::vector<double>& GetCrstabsProbs() const { return fvCrstabsProbs; }
    std::vector<double>& GetCrstabsProbs() { return fvCrstabsProbs; }
    //! The table rows as category codes, one per factor (-1 for an unknown category).
    const std::vector<std::vector<int>>& GetCrstabsEncod() const { return fvvCrstabsEncod; }
    std::vector<std::vector<int>>& GetCrstabsEncod() { return fvvCrstabsEncod; }
    //! True once the category texts have been encoded.
    bool AreCategEncoded() const { return fbCategEncoded; }

    // ---- Stop criteria -------------------------------------------------------------------

    //! Appends a criterion on the mean of `target`.
    void SetStopCriteriaMean(const std::string& target, double threshold, MCSPConst::UnitType unit,
                             double ciLevel);
    //! Appends a criterion on a tail of `target`.
    void SetStopCriteriaTails(const std::string& target, double threshold, MCSPConst::SideType side,
                              MCSPConst::TailType type, int frequency);
    //! The criterion on the mean: the only one when there is exactly one, whatever its
    //! target; otherwise the first for `target`. False when none.
    bool GetStopCriteriaMean(const std::string& target, double& threshold,
                             MCSPConst::UnitType& unit, double& ciLevel) const;
    //! The tail criterion: the only one when there is exactly one, whatever its target;
    //! otherwise the first for `target`. False when none.
    bool GetStopCriteriaTails(const std::string& target, double& threshold,
                              MCSPConst::SideType& side, MCSPConst::TailType& type,
                              int& frequency) const;
    const std::vector<StopCriteriaPointValue>& GetStopCriteriaPointValue() const {
        return fvStopPointValues;
    }
    const std::vector<StopCriteriaTails>& GetStopCriteriaTails() const { return fvStopTails; }
    std::size_t GetStopCriteriaPointValueSize() const { return fvStopPointValues.size(); }
    std::size_t GetStopCriteriaTailsSize() const { return fvStopTails.size(); }

    // ---- Autofit, run and system settings ------------------------------------------------

    int GetAutoFitNCases() const { return fAutoFitNCases; }
    void SetAutoFitNCases(int n) { fAutoFitNCases = n; }
    MCSPConst::GoodFitType GetAutoFitType() const { return fAutoFitType; }
    void SetAutoFitType(MCSPConst::GoodFitType type) { fAutoFitType = type; }
    int GetAutoFitMaxIterations() const { return fAutoFitMaxIterations; }
    void SetAutoFitMaxIterations(int n) { fAutoFitMaxIterations = n; }
    int GetBins() const { return fBins; }
    void SetBins(int n) { fBins = n; }
    double GetSeed() const { return fSeed; }
    void SetSeed(double seed) { fSeed = seed; }
    bool UseRandomSeed() const { return fbUseRandomSeed; }
    void SetUseRandomSeed(bool use) { fbUseRandomSeed = use; }
    int GetMaxCases() const { return fMaxCases; }
    void SetMaxCases(int n) { fMaxCases = n; }
    MCCommon_800::ProgressListener* GetProgressListener() const { return fpProgressListener; }
    void SetProgressListener(MCCommon_800::ProgressListener* p) { fpProgressListener = p; }
    MCCommon_800::MCQueryCancel* GetCancelPointer() const { return fpCancel; }
    void SetCancelPointer(MCCommon_800::MCQueryCancel* p) { fpCancel = p; }
    int GetMaxThreadNum() const { return fMaxThreadNum; }
    void SetMaxThreadNum(int n) { fMaxThreadNum = n; }
    int GetMemCacheKB() const { return fMemCacheKB; }
    void SetMemCacheKB(int kb) { fMemCacheKB = kb; }
    MCThread_800::IMCThreadFactory* GetThreadFactory() const { return fpThreadFactory; }
    void SetThreadFactory(MCThread_800::IMCThreadFactory* p) { fpThreadFactory = p; }
    MCThread_800::MCThreadIterFactory* GetThreadIterFactory() const { return fpThreadIterFactory; }
    void SetThreadIterFactory(MCThread_800::MCThreadIterFactory* p) { fpThreadIterFactory = p; }
    MCCommon_800::MCWarnings& GetWarningMessages() { return fWarnings; }
    const MCCommon_800::MCWarnings& GetWarningMessages() const { return fWarnings; }

    // ---- Checks against the host's variables ----------------------------------------------

    //! True when every simulated and fixed input is a variable of `vars`, and every
    //! correlation variable and contingency factor is a simulated input of the plan.
    bool ValidateVarInfo(const MCXML_800::MCVarList& vars) const;
    //! Gives each target of the first model file whose level is still unknown the level of
    //! the variable of that name in `vars`.
    void CompleteVarInfo(const MCXML_800::MCVarList& vars);
    //! Aligns every Categorical input that `vars` knows with the host's categories
    //! (SimInputSpecs::AdjustCategories), then drops the contingency-table rows that name a
    //! category the data lacks and rescales the remaining probabilities to sum to 1.
    void AdjustCategoricals(const MCXML_800::MCVarList& vars);
    //! Turns the contingency table's category texts into positions in the factors' category
    //! lists (-1 for a text that is not there). Done once; later calls do nothing until the
    //! table or the categories change.
    void EncodeCatValues();

    // ---- Completion from fitting results -------------------------------------------------

    //! Gives every autofit input its best fitted distribution (covariate records, then factor
    //! records); when the plan has no correlation variables yet, takes the fitted correlations
    //! of the covariates (identity for the other continuous and ordinal inputs); and, when
    //! the results hold a contingency table, takes it with the factor records as its factors.
    void SetDFCOutput(const DFCOutputStats& results);
    //! Adds the best distribution of `record` to the autofit input of the same name. Records
    //! without a best distribution, inputs that are not in the plan and manual inputs are
    //! left alone.
    void SetDFCFieldDist(const DFCOutputStats::DFCVarDistInfo& record);

    //! No check is made: always success.
    MCCommon_800::MCStatus IsValidSettings() const { return MCCommon_800::MCStatus(); }

    //! Diagnostic print to `os`.
    void Display(std::ostream& os) const;

private:
    //! Makes the input just appended at `position` the iteration input when `nValues` > 1.
    void NoteIteration(std::size_t nValues, int position, DistInputType type);
    //! Position of `name` among the correlation variables, appending it when absent.
    std::size_t CorrVarPosition(const std::string& name);
    //! Takes the covariates' fitted correlations over a fresh list of correlation variables.
    void SetDFCCorrelations(const DFCOutputStats& results);
    //! Forgets the category codes of the contingency table, which no longer match its texts
    //! or the factors' categories.
    void ResetCategEncoding();

    std::vector<ModelFileElem> fvModelFiles;    //!< model files
    std::vector<SimInputSpecs> fvSimInputs;     //!< simulated inputs
    std::vector<FixedInputSpecs> fvFixedInputs; //!< fixed inputs

    std::vector<std::string> fvCorrVars;            //!< correlation variables
    std::vector<std::vector<double>> fvvCorrMatrix; //!< correlation rows
    bool fbCorrLocked = false;                      //!< correlations locked against edits

    int fAutoFitNCases = 0;                                            //!< cases used for fitting
    MCSPConst::GoodFitType fAutoFitType = MCSPConst::kAndersonDarling; //!< fit test
    int fAutoFitMaxIterations = 100;                                   //!< optimiser iterations
    int fBins = 100;                                                   //!< histogram bins

    bool fbUseRandomSeed = true; //!< draw a random seed instead of fSeed
    double fSeed = 0.0;          //!< seed of the random streams
    int fMaxCases = 100000;      //!< maximum number of simulated cases

    std::vector<StopCriteriaPointValue> fvStopPointValues; //!< criteria on means
    std::vector<StopCriteriaTails> fvStopTails;            //!< criteria on tails

    std::vector<std::string> fvCrstabsFactors;              //!< contingency factors
    std::vector<std::vector<std::string>> fvvCrstabsMatrix; //!< category text per factor
    std::vector<std::vector<int>> fvvCrstabsEncod;          //!< category code per factor
    std::vector<double> fvCrstabsProbs;                     //!< probability of each row
    bool fbCategEncoded = false;                            //!< codes are up to date

    MCCommon_800::ProgressListener* fpProgressListener = nullptr;     //!< host's, not owned
    MCCommon_800::MCQueryCancel* fpCancel = nullptr;                  //!< host's, not owned
    int fMaxThreadNum = 0;                                            //!< thread limit
    int fMemCacheKB = 0;                                              //!< memory cache limit
    MCThread_800::IMCThreadFactory* fpThreadFactory = nullptr;        //!< host's, not owned
    MCThread_800::MCThreadIterFactory* fpThreadIterFactory = nullptr; //!< host's, not owned

    MCCommon_800::MCWarnings fWarnings; //!< warnings about the plan

    int fIterationIndex = -1;                 //!< iteration input's position, -1 for none
    DistInputType fIterationType = kIterNone; //!< list the iteration index points into
};

} // namespace MCMCSP_800
