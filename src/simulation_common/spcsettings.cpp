#include "simulation_common/spcsettings.h"

#include "component/mcspassert.h"
#include "mccommon/display.h"
#include "mccommon/mcmv.h"

#include <algorithm>

namespace MCMCSP_800 {

using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::MCVarList;

namespace {

template <typename Input>
const Input* FindByName(const std::vector<Input>& inputs, const std::string& name) {
    const auto it = std::find_if(inputs.begin(), inputs.end(), [&name](const Input& input) {
        return input.GetVarName() == name;
    });
    return it == inputs.end() ? nullptr : &*it;
}

//! A row of `size` zeros with 1.0 at `diagonal`: row `diagonal` of the identity.
std::vector<double> IdentityRow(std::size_t size, std::size_t diagonal) {
    std::vector<double> row(size, 0.0);
    if (diagonal < size) {
        row[diagonal] = 1.0;
    }
    return row;
}

bool IsCategoricalLevel(MeasureLevel level) {
    return level == kLevelCategorical || level == kLevelOrdinal;
}

} // namespace

// ---------------------------------------------------------------------------------------------
// Nested records

void SPCSettings::ModelFileTarget::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display ModelFileTarget object",
                       "End of display ModelFileTarget object");
    DisplayS("The target name:", fName);
    DisplayS("The target map name:", fMapName);
    DisplayS("The output format:", fOutputFormat);
    DisplayS("The target Comment:", fComment);
    DisplayB("The target whether or not exclude from output:", fbExcludeFromOutput);
    DisplayB("The target whether or not has target filter :", fbHasTargetFilter);
    DisplayD("The filter low value  :", fFilterLow);
    DisplayB("The filter include low value  :", fbIncludeLow);
    DisplayD("The filter high value  :", fFilterHigh);
    DisplayB("The filter include high value :", fbIncludeHigh);
}

void SPCSettings::ModelFileElem::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display ModelFileElem object",
                       "End of display ModelFileElem object");
    DisplayS("The model file path:", fFilePath);
    DisplayB("The custom Models:", fbCustomModel);
    for (std::size_t i = 0; i < fvTargets.size(); ++i) {
        DisplayI("Target collection index", static_cast<long long>(i));
        fvTargets[i].Display();
    }
}

void SPCSettings::StopCriteriaPointValue::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display StopCriteriaPointValue object",
                       "End of display StopCriteriaPointValue object");
    DisplayS("The parameter:", GetStatisticDisplayWord(fStatistic));
    DisplayS("The target name:", fTargetName);
    DisplayD("The threshold  :", fThreshold);
    DisplayD("The CiLevel  :", fCiLevel);
    DisplayS("The unit:", GetUnitTypeDisplayWord(fUnit));
}

void SPCSettings::StopCriteriaTails::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display StopCriteriaTails object",
                       "End of display StopCriteriaTails object");
    DisplayS("The target name:", fTargetName);
    DisplayD("The threshold  :", fThreshold);
    DisplayS("The side:", GetSideTypeDisplayWord(fSide));
    DisplayS("The type:", GetTailTypeDisplayWord(fType));
}

// ---------------------------------------------------------------------------------------------
// Model

void SPCSettings::SetModel(const std::string& path, bool custom) {
    if (fvModelFiles.empty()) {
        fvModelFiles.emplace_back();
    }
    fvModelFiles.front().fFilePath = path;
    fvModelFiles.front().fbCustomModel = custom;
}

void SPCSettings::AddModelTarget(const ModelFileTarget& target) {
    if (fvModelFiles.empty()) {
        fvModelFiles.emplace_back();
    }
    fvModelFiles.front().fvTargets.push_back(target);
}

void SPCSettings::SetModelTarget(std::size_t i, const ModelFileTarget& target) {
    if (fvModelFiles.empty()) {
        return;
    }
    std::vector<ModelFileTarget>& targets = fvModelFiles.front().fvTargets;
    if (targets.size() < i + 1) {
        targets.resize(i + 1);
    }
    targets[i] = target;
}

SPCSettings::ModelFileElem* SPCSettings::CreateModelFileInfo() {
    fvModelFiles.emplace_back();
    return &fvModelFiles.back();
}

std::string SPCSettings::GetModelFile() const {
    return fvModelFiles.empty() ? std::string() : fvModelFiles.front().fFilePath;
}

bool SPCSettings::IsCustomModel() const {
    return !fvModelFiles.empty() && fvModelFiles.front().fbCustomModel;
}

void SPCSettings::GetModelTargets(std::vector<ModelFileTarget>& targets) const {
    targets.clear();
    if (!fvModelFiles.empty()) {
        targets = fvModelFiles.front().fvTargets;
    }
}

std::vector<const SPCSettings::ModelFileTarget*> SPCSettings::GetContinuousModelTargets() const {
    std::vector<const ModelFileTarget*> targets;
    if (!fvModelFiles.empty()) {
        for (const ModelFileTarget& target : fvModelFiles.front().fvTargets) {
            if (!IsCategoricalLevel(target.fMeasurementLevel)) {
                targets.push_back(&target);
            }
        }
    }
    return targets;
}

std::vector<const SPCSettings::ModelFileTarget*> SPCSettings::GetCategoricalModelTargets() const {
    std::vector<const ModelFileTarget*> targets;
    if (!fvModelFiles.empty()) {
        for (const ModelFileTarget& target : fvModelFiles.front().fvTargets) {
            if (IsCategoricalLevel(target.fMeasurementLevel)) {
                targets.push_back(&target);
            }
        }
    }
    return targets;
}

// ---------------------------------------------------------------------------------------------
// Inputs

void SPCSettings::NoteIteration(std::size_t nValues, int position, DistInputType type) {
    if (nValues > 1) {
        fIterationIndex = position;
        fIterationType = type;
    }
}

void SPCSettings::AddSimulationInput(const SimInputSpecs& input) {
    if (CheckExist(input.GetVarName())) {
        return;
    }
    fvSimInputs.push_back(input);
    NoteIteration(input.GetDistElementSize(), static_cast<int>(fvSimInputs.size() - 1),
                  input.IsManual() ? kIterManualInput : kIterAutofitInput);
}

void SPCSettings::AddFixedInput(const FixedInputSpecs& input) {
    if (CheckExist(input.GetVarName())) {
        return;
    }
    fvFixedInputs.push_back(input);
    NoteIteration(input.GetInputValueSize(), static_cast<int>(fvFixedInputs.size() - 1),
                  kIterFixedInput);
}

void SPCSettings::AddFixedInput(const std::string& name, const std::vector<double>& values,
                                const std::string& format) {
    if (CheckExist(name)) {
        return;
    }
    FixedInputSpecs input;
    input.SetVarName(name);
    input.SetInputValue(values);
    input.SetOutputFormat(format);
    input.SetValueType(MCXML_800::IMCVariable::kNumericStorage);
    AddFixedInput(input);
}

void SPCSettings::AddFixedInput(const std::string& name, const std::vector<std::string>& values,
                                const std::string& format) {
    if (CheckExist(name)) {
        return;
    }
    FixedInputSpecs input;
    input.SetVarName(name);
    input.SetInputValue(values);
    input.SetOutputFormat(format);
    input.SetValueType(MCXML_800::IMCVariable::kStringStorage);
    AddFixedInput(input);
}

void SPCSettings::AddFixedInput(const std::string& name, double low, double high, int n,
                                const std::string& format) {
    if (CheckExist(name) || !(high > low) || n <= 1) {
        return;
    }
    FixedInputSpecs input;
    input.SetVarName(name);
    input.SetFixedInput(low, high, n);
    input.SetOutputFormat(format);
    input.SetValueType(MCXML_800::IMCVariable::kNumericStorage);
    AddFixedInput(input);
}

SimInputSpecs* SPCSettings::GetSimInput(const std::string& name) {
    return const_cast<SimInputSpecs*>(FindByName(fvSimInputs, name));
}

const SimInputSpecs* SPCSettings::GetSimInput(const std::string& name) const {
    return FindByName(fvSimInputs, name);
}

FixedInputSpecs* SPCSettings::GetFixedInput(const std::string& name) {
    return const_cast<FixedInputSpecs*>(FindByName(fvFixedInputs, name));
}

const FixedInputSpecs* SPCSettings::GetFixedInput(const std::string& name) const {
    return FindByName(fvFixedInputs, name);
}

bool SPCSettings::CheckExist(const std::string& name) const {
    return GetSimInput(name) != nullptr || GetFixedInput(name) != nullptr;
}

void SPCSettings::SetFixedInputAssociatedTargets(const std::string& name,
                                                 const std::vector<std::string>& targets) {
    if (FixedInputSpecs* input = GetFixedInput(name)) {
        input->SetAssociatTargetNames(targets);
    }
}

// ---------------------------------------------------------------------------------------------
// Correlations

std::size_t SPCSettings::CorrVarPosition(const std::string& name) {
    const auto it = std::find(fvCorrVars.begin(), fvCorrVars.end(), name);
    if (it != fvCorrVars.end()) {
        return static_cast<std::size_t>(it - fvCorrVars.begin());
    }
    fvCorrVars.push_back(name);
    return fvCorrVars.size() - 1;
}

// The column variable is registered before the row variable, so a first cell (x, y) makes the
// variables y, x. The cell is kept in the lower triangle (row >= column); rows created here
// are identity rows of the triangular shape.
void SPCSettings::SetCorrMatrixCell(const std::string& rowVar, const std::string& colVar,
                                    double value) {
    std::size_t c = CorrVarPosition(colVar);
    std::size_t r = CorrVarPosition(rowVar);
    if (c > r) {
        std::swap(r, c);
    }
    if (fvvCorrMatrix.size() < r + 1) {
        fvvCorrMatrix.resize(r + 1);
    }
    for (std::size_t k = 0; k <= r; ++k) {
        if (fvvCorrMatrix[k].empty()) {
            fvvCorrMatrix[k] = IdentityRow(k + 1, k);
        }
    }
    if (r == c) {
        return;
    }
    // A row appended by AddCorrMatrixRow may be shorter than the triangle; widen it rather
    // than write past its end.
    std::vector<double>& row = fvvCorrMatrix[r];
    if (row.size() < c + 1) {
        row.resize(c + 1, 0.0);
    }
    row[c] = value;
}

void SPCSettings::GetCorrMatrixCellCollection(std::vector<CorrMatrixCell>& cells) const {
    cells.clear();
    // Rows without a variable (possible only through AddCorrMatrixRow) have no name to list.
    const std::size_t nRows = std::min(fvvCorrMatrix.size(), fvCorrVars.size());
    for (std::size_t r = 0; r < nRows; ++r) {
        const std::vector<double>& row = fvvCorrMatrix[r];
        for (std::size_t c = 0; c <= r && c < row.size(); ++c) {
            cells.push_back(CorrMatrixCell{fvCorrVars[r], fvCorrVars[c], row[c]});
        }
    }
}

void SPCSettings::InitCorrMatrix() {
    fvCorrVars.clear();
    for (const SimInputSpecs& input : fvSimInputs) {
        const MeasureLevel level = SimInputSpecs::GetEffectMeasurementLevel(input);
        if (level == kLevelContinuous || level == kLevelOrdinal) {
            fvCorrVars.push_back(input.GetVarName());
        }
    }
    fvvCorrMatrix.clear();
    // An empty matrix leaves the identity over the variables just chosen; it cannot fail.
    static_cast<void>(SetDFCCorrMatrix(MCMath_800::MCSymMatrix()));
}

bool SPCSettings::SetDFCCorrMatrix(const MCMath_800::MCSymMatrix& m) {
    fvvCorrMatrix.clear();
    const std::size_t nVars = fvCorrVars.size();
    const int n = m.GetNRows();
    if (n < 0 || static_cast<std::size_t>(n) > nVars) {
        return false;
    }
    std::vector<double> row;
    for (int r = 0; r < n; ++r) {
        if (!m.GetRow(r, row)) {
            fvvCorrMatrix.clear();
            return false;
        }
        row.resize(nVars, 0.0);
        fvvCorrMatrix.push_back(row);
    }
    for (std::size_t r = static_cast<std::size_t>(n); r < nVars; ++r) {
        fvvCorrMatrix.push_back(IdentityRow(nVars, r));
    }
    return true;
}

// Row and column r of the results' matrix belong to covariate record r.
bool SPCSettings::GetCorrMatrixCellCollectionFrom(std::vector<CorrMatrixCell>& cells,
                                                  const DFCOutputStats* results) {
    cells.clear();
    if (results == nullptr) {
        return false;
    }
    const MCMath_800::MCSymMatrix& matrix = results->GetCorrMatrix();
    const std::vector<DFCOutputStats::DFCVarDistInfo>& records = results->GetCovarDistInfo();
    const int n = matrix.GetNRows();
    if (n <= 1) {
        return true;
    }
    // A row without a record would have no name to list.
    if (static_cast<std::size_t>(n) > records.size()) {
        return false;
    }
    std::vector<std::vector<double>> rows(static_cast<std::size_t>(n));
    for (int r = 0; r < n; ++r) {
        if (!matrix.GetRow(r, rows[static_cast<std::size_t>(r)])) {
            return false;
        }
    }
    for (std::size_t r = 0; r < rows.size(); ++r) {
        for (std::size_t c = 0; c <= r; ++c) {
            cells.push_back(
                CorrMatrixCell{records[r].fFittedVarName, records[c].fFittedVarName, rows[r][c]});
        }
    }
    return true;
}

// ---------------------------------------------------------------------------------------------
// Stop criteria

void SPCSettings::SetStopCriteriaMean(const std::string& target, double threshold, UnitType unit,
                                      double ciLevel) {
    StopCriteriaPointValue criterion;
    criterion.fStatistic = kStatisticMean;
    criterion.fTargetName = target;
    criterion.fThreshold = threshold;
    criterion.fUnit = unit;
    criterion.fCiLevel = ciLevel;
    fvStopPointValues.push_back(criterion);
}

void SPCSettings::SetStopCriteriaTails(const std::string& target, double threshold, SideType side,
                                       TailType type, int frequency) {
    StopCriteriaTails criterion;
    criterion.fTargetName = target;
    criterion.fThreshold = threshold;
    criterion.fSide = side;
    criterion.fType = type;
    criterion.fFrequency = frequency;
    fvStopTails.push_back(criterion);
}

bool SPCSettings::GetStopCriteriaMean(const std::string& target, double& threshold, UnitType& unit,
                                      double& ciLevel) const {
    const StopCriteriaPointValue* found = nullptr;
    if (fvStopPointValues.size() == 1 && fvStopPointValues.front().fStatistic == kStatisticMean) {
        found = &fvStopPointValues.front();
    } else {
        for (const StopCriteriaPointValue& criterion : fvStopPointValues) {
            if (criterion.fStatistic == kStatisticMean && criterion.fTargetName == target) {
                found = &criterion;
                break;
            }
        }
    }
    if (found == nullptr) {
        return false;
    }
    threshold = found->fThreshold;
    unit = found->fUnit;
    ciLevel = found->fCiLevel;
    return true;
}

bool SPCSettings::GetStopCriteriaTails(const std::string& target, double& threshold, SideType& side,
                                       TailType& type, int& frequency) const {
    const StopCriteriaTails* found = nullptr;
    if (fvStopTails.size() == 1) {
        found = &fvStopTails.front();
    } else {
        for (const StopCriteriaTails& criterion : fvStopTails) {
            if (criterion.fTargetName == target) {
                found = &criterion;
                break;
            }
        }
    }
    if (found == nullptr) {
        return false;
    }
    threshold = found->fThreshold;
    side = found->fSide;
    type = found->fType;
    frequency = found->fFrequency;
    return true;
}

// ---------------------------------------------------------------------------------------------
// Checks against the host's variables

bool SPCSettings::ValidateVarInfo(const MCVarList& vars) const {
    for (const SimInputSpecs& input : fvSimInputs) {
        if (vars.FindVariable(input.GetVarName()) < 0) {
            return false;
        }
    }
    for (const FixedInputSpecs& input : fvFixedInputs) {
        if (vars.FindVariable(input.GetVarName()) < 0) {
            return false;
        }
    }
    for (const std::string& name : fvCorrVars) {
        if (GetSimInput(name) == nullptr) {
            return false;
        }
    }
    for (const std::string& name : fvCrstabsFactors) {
        if (GetSimInput(name) == nullptr) {
            return false;
        }
    }
    return true;
}

void SPCSettings::CompleteVarInfo(const MCVarList& vars) {
    if (fvModelFiles.empty()) {
        return;
    }
    for (ModelFileTarget& target : fvModelFiles.front().fvTargets) {
        if (target.fMeasurementLevel != kLevelUnknown) {
            continue;
        }
        if (const MCXML_800::IMCVariable* variable = vars.GetVariable(target.fName)) {
            target.fMeasurementLevel = GetMCSPMeasureLevel(variable);
        }
    }
}

void SPCSettings::ResetCategEncoding() {
    fvvCrstabsEncod.clear();
    fbCategEncoded = false;
}

// Aligning changes the factors' category lists and dropping rows changes the table, so codes
// computed before no longer point at the right categories: they are forgotten, and the next
// EncodeCatValues computes them again.
void SPCSettings::AdjustCategoricals(const MCVarList& vars) {
    bool changed = false;
    for (SimInputSpecs& input : fvSimInputs) {
        if (!input.IsFinalCategoricalDist()) {
            continue;
        }
        const MCXML_800::IMCVariable* variable = vars.GetVariable(input.GetVarName());
        if (variable == nullptr) {
            continue;
        }
        std::vector<std::string> before;
        std::vector<std::string> after;
        input.GetFinalCategories(before);
        input.AdjustCategories(variable);
        input.GetFinalCategories(after);
        changed = changed || before != after;
    }

    // Rows name one category per factor; a row too short to name one for a factor is kept,
    // and EncodeCatValues gives it the code -1 there.
    bool removed = false;
    for (std::size_t k = 0; k < fvCrstabsFactors.size(); ++k) {
        const SimInputSpecs* input = GetSimInput(fvCrstabsFactors[k]);
        if (input == nullptr || input->GetUnmatchedCagegories().empty()) {
            continue;
        }
        const std::vector<std::string>& unmatched = input->GetUnmatchedCagegories();
        std::vector<std::vector<std::string>> keptRows;
        std::vector<double> keptProbs;
        for (std::size_t r = 0; r < fvvCrstabsMatrix.size(); ++r) {
            const std::vector<std::string>& row = fvvCrstabsMatrix[r];
            const bool drop = k < row.size() && std::find(unmatched.begin(), unmatched.end(),
                                                          row[k]) != unmatched.end();
            if (drop) {
                removed = true;
                continue;
            }
            keptRows.push_back(row);
            if (r < fvCrstabsProbs.size()) {
                keptProbs.push_back(fvCrstabsProbs[r]);
            }
        }
        // Probabilities without a row (a table whose lists differ in length) stay at the end.
        for (std::size_t r = fvvCrstabsMatrix.size(); r < fvCrstabsProbs.size(); ++r) {
            keptProbs.push_back(fvCrstabsProbs[r]);
        }
        fvvCrstabsMatrix = std::move(keptRows);
        fvCrstabsProbs = std::move(keptProbs);
    }
    if (removed) {
        changed = true;
        double sum = 0.0;
        for (const double p : fvCrstabsProbs) {
            sum += p;
        }
        if (!fvCrstabsProbs.empty() && sum > 0.0) {
            for (double& p : fvCrstabsProbs) {
                p /= sum;
            }
        }
    }
    if (changed) {
        ResetCategEncoding();
    }
}

void SPCSettings::EncodeCatValues() {
    if (fbCategEncoded) {
        return;
    }
    const std::size_t nFactors = fvCrstabsFactors.size();
    std::vector<std::vector<std::string>> categories(nFactors);
    for (std::size_t k = 0; k < nFactors; ++k) {
        const SimInputSpecs* input = GetSimInput(fvCrstabsFactors[k]);
        if (!MCSP_ASSERT(input != nullptr, "pSimInput != 0")) {
            continue;
        }
        const DistInfoElem* dist = input->GetFinalDistribution();
        if (!MCSP_ASSERT(dist != nullptr, "distElem != 0")) {
            continue;
        }
        std::string name;
        dist->GetParameterNameValue(0, name, categories[k]);
    }

    fvvCrstabsEncod.clear();
    fvvCrstabsEncod.reserve(fvvCrstabsMatrix.size());
    for (const std::vector<std::string>& row : fvvCrstabsMatrix) {
        std::vector<int> codes(nFactors, -1);
        for (std::size_t k = 0; k < nFactors && k < row.size(); ++k) {
            const std::vector<std::string>& cats = categories[k];
            const auto it = std::find(cats.begin(), cats.end(), row[k]);
            if (it != cats.end()) {
                codes[k] = static_cast<int>(it - cats.begin());
            }
        }
        fvvCrstabsEncod.push_back(std::move(codes));
    }
    fbCategEncoded = true;
}

// ---------------------------------------------------------------------------------------------
// Completion from fitting results

// The best distribution's parameters come in the order of its parameter names; a Categorical
// carries its categories as the names and their probabilities as the values, and an
// Empirical (the fallback when no candidate fits) the minimum, maximum, standard deviation and
// then the bin proportions.
void SPCSettings::SetDFCFieldDist(const DFCOutputStats::DFCVarDistInfo& record) {
    SimInputSpecs* input = GetSimInput(record.fFittedVarName);
    // A record without a best distribution (a field taking part in the correlations only, or
    // one nothing was fitted to) has nothing to give: a distribution of type 15 would make
    // the plan unreadable. A manual input keeps the distribution its user chose.
    if (input == nullptr || record.fDistBestType == kDistUnknown ||
        !input->IsRequireAutofitting()) {
        return;
    }
    const std::vector<double>& params = record.fDistBestParams;
    const std::vector<std::string>& names = record.fDistBestParamNames;

    if (record.fDistBestType == kDistEmpirical) {
        if (!MCSP_ASSERT(params.size() > 3, "outVarInfo.fDistBestParams.size() > 3")) {
            return;
        }
        // An Empirical distribution prepared without parameters is filled; otherwise the fitted
        // one is added beside what the input holds, never mixed into a distribution of another
        // type or into a filled one.
        DistInfoElem* dist = input->GetDistribution(0);
        if (dist == nullptr || dist->GetDistType() != kDistEmpirical ||
            dist->GetParameterSize() != 0) {
            const int added = input->AddDistribution(kDistEmpirical);
            dist = added < 0 ? nullptr : input->GetDistribution(static_cast<std::size_t>(added));
        }
        if (!MCSP_ASSERT(dist != nullptr, "distElem != 0")) {
            return;
        }
        static_cast<void>(dist->AddParameter("min", params[0]));
        static_cast<void>(dist->AddParameter("max", params[1]));
        static_cast<void>(dist->AddParameter("stddev", params[2]));
        static_cast<void>(
            dist->AddParameter("probs", std::vector<double>(params.begin() + 3, params.end())));
        return;
    }

    const int added = input->AddDistribution(record.fDistBestType);
    DistInfoElem* dist =
        added < 0 ? nullptr : input->GetDistribution(static_cast<std::size_t>(added));
    if (dist == nullptr) {
        return;
    }
    if (record.fDistBestType == kDistCategorical) {
        static_cast<void>(dist->AddParameter("cats", names));
        static_cast<void>(dist->AddParameter("probs", params));
        return;
    }
    for (std::size_t i = 0; i < names.size(); ++i) {
        static_cast<void>(
            dist->AddParameter(names[i], i < params.size() ? params[i] : MCMV::Missing()));
    }
}

// Row r of the fitted matrix belongs to covariate record r. Only records naming a simulated
// input can be correlation variables, so the matrix is cut down to those records before it is
// stored (keeping each correlation with its own pair of fields); the other continuous and
// ordinal inputs without a mapped name follow with identity rows.
void SPCSettings::SetDFCCorrelations(const DFCOutputStats& results) {
    fvvCorrMatrix.clear();
    std::vector<std::string> names;
    std::vector<int> records;
    const std::vector<DFCOutputStats::DFCVarDistInfo>& covariates = results.GetCovarDistInfo();
    for (std::size_t i = 0; i < covariates.size(); ++i) {
        const std::string& name = covariates[i].fFittedVarName;
        if (GetSimInput(name) != nullptr &&
            std::find(names.begin(), names.end(), name) == names.end()) {
            names.push_back(name);
            records.push_back(static_cast<int>(i));
        }
    }

    const MCMath_800::MCSymMatrix& fitted = results.GetCorrMatrix();
    const int nFitted = fitted.GetNRows();
    MCMath_800::MCSymMatrix matched(static_cast<int>(names.size()));
    for (std::size_t a = 0; a < records.size(); ++a) {
        for (std::size_t b = 0; b <= a; ++b) {
            const int ra = records[a];
            const int rb = records[b];
            const double value = ra < nFitted && rb < nFitted ? fitted.GetElem(ra, rb)
                                 : a == b                     ? 1.0
                                                              : 0.0;
            matched.SetElem(static_cast<int>(a), static_cast<int>(b), value);
        }
    }

    for (const SimInputSpecs& input : fvSimInputs) {
        const MeasureLevel level = SimInputSpecs::GetEffectMeasurementLevel(input);
        if (input.GetMapVarName().empty() &&
            (level == kLevelContinuous || level == kLevelOrdinal) &&
            std::find(names.begin(), names.end(), input.GetVarName()) == names.end()) {
            names.push_back(input.GetVarName());
        }
    }
    fvCorrVars = names;
    // The matched matrix never has more rows than there are variables: this cannot fail.
    static_cast<void>(SetDFCCorrMatrix(matched));
}

void SPCSettings::SetDFCOutput(const DFCOutputStats& results) {
    for (const DFCOutputStats::DFCVarDistInfo& record : results.GetCovarDistInfo()) {
        SetDFCFieldDist(record);
    }
    for (const DFCOutputStats::DFCVarDistInfo& record : results.GetFactorDistInfo()) {
        SetDFCFieldDist(record);
    }
    // Correlations the plan already holds (read from a file or set by the user) are kept.
    if (fvCorrVars.empty()) {
        SetDFCCorrelations(results);
    }
    // Crosstabs asked for with fewer than two factors give no table. A factor list without
    // rows would make the simulator draw its cases from an empty table, so the plan then
    // keeps the table it has.
    if (results.GetUseCrosstabs() && !results.GetCrstabsMatrix().empty()) {
        fvCrstabsFactors.clear();
        for (const DFCOutputStats::DFCVarDistInfo& record : results.GetFactorDistInfo()) {
            fvCrstabsFactors.push_back(record.fFittedVarName);
        }
        fvvCrstabsMatrix = results.GetCrstabsMatrix();
        fvCrstabsProbs = results.GetCrstabsProbs();
        ResetCategEncoding();
    }
}

// ---------------------------------------------------------------------------------------------
// Display

void SPCSettings::Display(std::ostream& os) const {
    using namespace MCDisplay_800;
    ScopedOutStream redirect(os);
    DisplayFrame frame("Start of display SPCSettings object", "End of display SPCSettings object");

    DisplayText("-------------Model----------------");
    for (const ModelFileElem& file : fvModelFiles) {
        file.Display();
    }

    DisplayText("-------------Simulate predictor----------------");
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        DisplayI("Simulation collection index", static_cast<long long>(i));
        fvSimInputs[i].Display();
    }

    DisplayText("-------------Fixed predictor----------------");
    for (std::size_t i = 0; i < fvFixedInputs.size(); ++i) {
        DisplayI("Fixed collection index", static_cast<long long>(i));
        fvFixedInputs[i].Display();
    }

    DisplayText("-------------Correlations----------------");
    DisplayB("The correlations locked:", fbCorrLocked);
    DisplaySV("The Correlations Variables:", fvCorrVars);
    DisplayDVV("The Correlations matrix:", fvvCorrMatrix);

    DisplayText("-------------AutoFit----------------");
    DisplayI("The number of cases in to use for distribution fitting:", fAutoFitNCases);
    DisplayI("The max iterations use for distribution fitting:", fAutoFitMaxIterations);
    DisplayI("The number of bins use for distribution fitting:", fBins);
    DisplayS("The Type of Fit Test for scale variables", GetGoodFitTypeDisplayWord(fAutoFitType));

    DisplayText("-------------Settings----------------");
    DisplayB("Use random seed:", fbUseRandomSeed);
    DisplayD("The random seed:", fSeed);
    DisplayI("The maximum number of cases used:", fMaxCases);

    DisplayText("-------------Stop Criteria----------------");
    for (std::size_t i = 0; i < fvStopPointValues.size(); ++i) {
        DisplayI("PointValue collection index", static_cast<long long>(i));
        fvStopPointValues[i].Display();
    }
    for (std::size_t i = 0; i < fvStopTails.size(); ++i) {
        DisplayI("Tails collection index", static_cast<long long>(i));
        fvStopTails[i].Display();
    }

    DisplayText("-------------Crosstabs----------------");
    DisplaySV("The Crosstabs Variables:", fvCrstabsFactors);
    DisplaySVV("The Crosstabs matrix:", fvvCrstabsMatrix);
    DisplayDV("The Crosstabs probabilities:", fvCrstabsProbs);
    DisplayB("Categorical values encoded:", fbCategEncoded);

    DisplayText("-------------System Settings----------------");
    DisplayI("The maximum number of threads:", fMaxThreadNum);
    DisplayI("The memory cache limit in KB:", fMemCacheKB);
    DisplayText(fpProgressListener ? "Progress Listener is defined"
                                   : "Progress Listener is undefined");
    DisplayText(fpCancel ? "Procedure Cancel is defined" : "Procedure Cancel is undefined");
    DisplayText(fpThreadFactory ? "Thread Factory is defined" : "Thread Factory is undefined");
    DisplayText(fpThreadIterFactory ? "Thread Iterator Factory is defined"
                                    : "Thread Iterator Factory is undefined");
}

} // namespace MCMCSP_800
