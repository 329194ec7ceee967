// The inputs of a simulation plan: the distributions of simulated fields with their named
// parameters, the simulated fields themselves (manual or to be fitted) and the fixed fields.
//
// SPCSettings holds these in its plan; the plan file writer and reader turn them into XML and
// back; the simulator reads distribution parameters by position. All classes here are values:
// copies are deep and independent.
#pragma once

#include "mccommon/mcstatus.h"
#include "mccommon/variables.h"
#include "simulation_common/mcspconst.h"

#include <array>
#include <cstdint>
#include <limits>
#include <string>
#include <variant>
#include <vector>

namespace MCMCSP_800 {

//! One value of a distribution parameter or of a fixed input: a double, an integer or a text.
//! A value type; copies are independent.
class MCDataValue {
public:
    //! What the value holds.
    enum MCDataType : std::int32_t { kNumeric = 0, kInteger = 1, kString = 2 };

    //! The numeric value 0.
    MCDataValue() = default;
    explicit MCDataValue(double value) : fValue(value) {}
    explicit MCDataValue(int value) : fValue(value) {}
    explicit MCDataValue(std::string value) : fValue(std::move(value)) {}
    explicit MCDataValue(const char* value) : fValue(std::string(value ? value : "")) {}

    MCDataType GetType() const { return static_cast<MCDataType>(fValue.index()); }
    //! The double; an integer is widened. A text is a caller error: missing is returned.
    double GetNumeric() const;
    //! The integer. Another kind is a caller error: 0 is returned.
    int GetInteger() const;
    //! The text. Another kind is a caller error: an empty text is returned.
    const std::string& GetString() const;

    //! The value read as a double whatever its kind: a text is parsed as a number (missing when
    //! it is not one).
    double GetAsNumeric() const;
    //! The value read as a text whatever its kind: a double in the default stream form ("10",
    //! "0.25"), an integer in decimal.
    std::string GetAsString() const;

private:
    std::variant<double, int, std::string> fValue; //!< the payload; its index is the type
};

//! One distribution with its parameters: the distribution of a simulated field, or one of its
//! candidates. Parameters are named (the names of GetDistributionParameterNames) and hold one
//! value ("mean") or a list ("cats", "probs", the interval bounds of "UserRanges").
class DistInfoElem {
public:
    //! Type 15 (none), an empty name, no parameters.
    DistInfoElem() = default;

    //! Stores `t` and its distribution name.
    void SetDistType(MCSPConst::DistType t);
    //! Stores `name` as given and the type it names (either naming form; 15 when unknown).
    void SetDistName(const std::string& name);
    MCSPConst::DistType GetDistType() const { return fDistType; }
    const std::string& GetDistName() const { return fDistName; }

    // Adding a parameter: the name and values are checked first (see the .cpp); on failure
    // nothing changes and false is returned.

    bool AddParameter(const std::string& name, double value);
    bool AddParameter(const std::string& name, const std::string& value);
    bool AddParameter(const std::string& name, const std::vector<double>& values);
    bool AddParameter(const std::string& name, const std::vector<std::string>& values);

    //! Number of parameters.
    std::size_t GetParameterSize() const { return fvParamNames.size(); }
    //! Number of values divided by number of parameters (integer division); 0 without
    //! parameters.
    std::size_t GetParamValueSize() const;
    //! Number of values of parameter `i`; 0 out of range.
    std::size_t GetParamValueSize(std::size_t i) const;

    //! Name and first value of parameter `i`; out of range leaves both untouched. A parameter
    //! without values gives missing (numbers) or an empty text.
    void GetParameterNameValue(std::size_t i, std::string& name, double& value) const;
    void GetParameterNameValue(std::size_t i, std::string& name, std::string& value) const;
    //! Clears `values`; when `i` is in range sets `name` and appends all values of parameter `i`.
    void GetParameterNameValue(std::size_t i, std::string& name, std::vector<double>& values) const;
    void GetParameterNameValue(std::size_t i, std::string& name,
                               std::vector<std::string>& values) const;
    void GetParameterNameValue(std::size_t i, std::string& name,
                               std::vector<MCDataValue>& values) const;
    //! Replaces `names` by all parameter names and `values` by each parameter's first value.
    void GetParameterNameValues(std::vector<std::string>& names, std::vector<double>& values) const;
    void GetParameterNameValues(std::vector<std::string>& names,
                                std::vector<MCDataValue>& values) const;

    //! A one-line summary of the parameters, such as "mean=10 stddev=2" or "a=0.25 b=0.75".
    std::string GetLabel() const;

    //! Diagnostic print to the display stream.
    void Display() const;

private:
    //! Position of the first value of parameter `i` in the flattened value list.
    std::size_t GetParameterPos(std::size_t i) const;
    //! True when `name` is a parameter of this element's distribution type.
    bool CHKParam(const std::string& name) const;
    //! The check of the scalar numeric form.
    bool CHKParam(const std::string& name, double value) const;
    //! The check of the list numeric form.
    bool CHKParam(const std::string& name, const std::vector<double>& values) const;
    //! First value of parameter `i`, or missing when it has none.
    MCDataValue GetFirstValue(std::size_t i) const;

    MCSPConst::DistType fDistType = MCSPConst::kDistUnknown; //!< distribution type
    std::string fDistName;                                   //!< distribution name as set
    std::vector<std::string> fvParamNames;                   //!< parameter names in the order added
    std::vector<MCDataValue> fvParamValues;   //!< all values, parameter after parameter
    std::vector<std::uint64_t> fvValueCounts; //!< number of values of each parameter
};

//! Value labels of a field: a list of labelled numbers and a list of labelled texts sharing
//! one list of labels. Both kinds of input field carry them.
class MCValueLabels {
public:
    //! Replaces the labelled numbers and the labels when `values` is not empty and both lists
    //! have the same length; otherwise does nothing.
    void SetValueLabels(const std::vector<double>& values, const std::vector<std::string>& labels);
    //! The same for labelled texts.
    void SetValueLabels(const std::vector<std::string>& values,
                        const std::vector<std::string>& labels);
    //! Copies out the labelled numbers and the labels.
    void GetValueLabels(std::vector<double>& values, std::vector<std::string>& labels) const;
    //! Copies out the labelled texts and the labels.
    void GetValueLabels(std::vector<std::string>& values, std::vector<std::string>& labels) const;
    //! The label of the first labelled number equal to `value`; "" when none.
    std::string GetValueLabel(double value) const;
    //! The label of the first labelled text equal to `value`; "" when none.
    std::string GetValueLabel(const std::string& value) const;

private:
    std::vector<std::string> fvValueLabels;    //!< labels
    std::vector<std::string> fvStrLabelValues; //!< labelled texts
    std::vector<double> fvNumLabelValues;      //!< labelled numbers
};

//! A simulated input field: its distribution, fixed by the user (manual) or to be chosen by
//! fitting the field's data (autofit) among candidate types, with bounds on the drawn values,
//! its associated targets and its display information.
class SimInputSpecs : public MCValueLabels {
public:
    //! A field with no distribution, no candidates and no bounds; manual when `manual`.
    explicit SimInputSpecs(bool manual);

    void SetVarName(const std::string& name) { fVarName = name; }
    const std::string& GetVarName() const { return fVarName; }
    void SetMapVarName(const std::string& name) { fMapVarName = name; }
    const std::string& GetMapVarName() const { return fMapVarName; }
    void SetVarLevel(MCSPConst::MeasureLevel level) { fMeasurementLevel = level; }
    MCSPConst::MeasureLevel GetMeasurementLevel() const { return fMeasurementLevel; }
    void SetAssociatTargetNames(const std::vector<std::string>& names) {
        fvAssociatTargetNames = names;
    }
    const std::vector<std::string>& GetAssociatTargetNames() const { return fvAssociatTargetNames; }
    void SetValueType(MCXML_800::IMCVariable::VariableStorage storage) { fValueType = storage; }
    MCXML_800::IMCVariable::VariableStorage GetValueType() const { return fValueType; }
    //! Text storage when `isString`, else numeric storage.
    void SetString(bool isString);
    bool IsString() const { return fValueType == MCXML_800::IMCVariable::kStringStorage; }
    void SetOutput(bool output) { fbOutput = output; }
    bool GetOutput() const { return fbOutput; }
    void SetOutputFormat(const std::string& format) { fOutputFormat = format; }
    const std::string& GetOutputFormat() const { return fOutputFormat; }
    bool IsManual() const { return fbManual; }
    bool IsAutofit() const { return !fbManual; }
    void SetRequireAutofitting(bool require) { fbRequireAutofitting = require; }
    bool IsRequireAutofitting() const { return fbRequireAutofitting; }
    //! Marks the field as autofit (requiring fitting) or manual.
    void SetAutofitted(bool autofit);
    void SetLocked(bool locked) { fbLocked = locked; }
    bool IsLocked() const { return fbLocked; }
    void SetMinimum(double minimum) { fMinimum = minimum; }
    double GetMinimum() const { return fMinimum; }
    bool HasMinimum() const { return fMinimum != kNoMinimum; }
    void SetMaximum(double maximum) { fMaximum = maximum; }
    double GetMaximum() const { return fMaximum; }
    bool HasMaximum() const { return fMaximum != kNoMaximum; }
    //! Plan categories that the host's variable lacks (filled when categories are aligned).
    const std::vector<std::string>& GetUnmatchedCagegories() const { return fvUnmatchedCategories; }
    //! True when no plan category matched the host's variable.
    bool IsAllCategoriesInvalid() const { return fbAllCategoriesInvalid; }
    MCCommon_800::MCWarnings& GetWarningMessages() { return fWarnings; }
    const MCCommon_800::MCWarnings& GetWarningMessages() const { return fWarnings; }

    // Distributions.

    //! Appends a distribution of type `t` (0 to 15) and returns its index; -1 for any other
    //! value, changing nothing.
    int AddDistribution(MCSPConst::DistType t);
    //! AddDistribution of the type that `name` names.
    int AddDistribution(const std::string& name);
    std::size_t GetDistElementSize() const { return fvDistributions.size(); }
    //! Distribution `i`; null out of range.
    DistInfoElem* GetDistribution(std::size_t i);
    const DistInfoElem* GetDistribution(std::size_t i) const;
    const std::vector<DistInfoElem>& GetAllDistribution() const { return fvDistributions; }
    //! The distribution when there is exactly one; else null.
    const DistInfoElem* GetFinalDistribution() const;
    //! The type of the first distribution; 15 when there is none.
    MCSPConst::DistType GetFinalDistType() const;
    bool IsFinalCategoricalDist() const {
        return GetFinalDistType() == MCSPConst::kDistCategorical;
    }
    //! When the first distribution is a Categorical, replaces `cats` by its categories;
    //! otherwise leaves `cats` untouched.
    void GetFinalCategories(std::vector<std::string>& cats) const;
    //! Aligns the Categorical distributions with the categories of the host's variable `var`:
    //! afterwards they list the host's categories in the host's order, a host category the
    //! plan lacked has probability 0, and a plan category the data lacks is dropped and listed
    //! in GetUnmatchedCagegories (the rest rescaled to sum to 1). Does nothing unless the first
    //! distribution is a Categorical and `var` is a categorical variable of the same storage
    //! kind (text or number).
    void AdjustCategories(const MCXML_800::IMCVariable* var);

    // Autofit candidates: one flag per distribution type.

    //! Raises the default candidates of `level`; false (nothing raised) for an unknown level.
    bool SetDefaultAutofit(MCSPConst::MeasureLevel level);
    //! SetDefaultAutofit with the field's own level.
    bool SetDefaultAutofit() { return SetDefaultAutofit(fMeasurementLevel); }
    //! Raises the flag of `t` when `t` is valid for its own category; else false.
    bool AddAutofitDist(MCSPConst::DistType t);
    bool AddAutofitDist(const std::string& name);
    //! The flag of `t` for the fitted types 0 to 11; false for any other value.
    bool HasAutofitTypeDist(MCSPConst::DistType t) const;
    bool HasAutofitTypeDist(const std::string& name) const;
    //! The raised types among 0 to 11, ascending.
    std::vector<MCSPConst::DistType> GetAutofitTypes() const;
    //! The distribution names of GetAutofitTypes, in the same order.
    std::vector<std::string> GetAutofitNames() const;
    //! When the types share one category (CheckValidDist), raises them all and sets `level`
    //! to that category; otherwise raises nothing and sets `level` to 0. Returns the check.
    bool SetAutofitDist(const std::vector<MCSPConst::DistType>& types,
                        MCSPConst::MeasureLevel& level);
    bool SetAutofitDist(const std::vector<std::string>& names, MCSPConst::MeasureLevel& level);

    // Vocabulary.

    //! 1 continuous, 2 categorical, 3 ordinal/discrete, 0 none (Empirical, unknown).
    static MCSPConst::MeasureLevel GetDistTypeCategory(MCSPConst::DistType t);
    //! True when `t` may model a field of `level`.
    static bool CheckValidDist(MCSPConst::DistType t, MCSPConst::MeasureLevel level);
    //! True when the list is empty, or when its entries all have the first one's category and
    //! that category is not 0.
    static bool CheckValidDist(const std::vector<MCSPConst::DistType>& types);
    //! The level by which the rest of the system treats `input`.
    static MCSPConst::MeasureLevel GetEffectMeasurementLevel(const SimInputSpecs& input);

    //! No check is made: always success.
    MCCommon_800::MCStatus IsValidSettings() const { return MCCommon_800::MCStatus(); }

    //! Diagnostic print to the display stream.
    void Display() const;

    //! The bounds that mean "not set".
    static constexpr double kNoMinimum = std::numeric_limits<double>::lowest();
    static constexpr double kNoMaximum = std::numeric_limits<double>::max();

private:
    std::string fVarName;    //!< field name
    std::string fMapVarName; //!< name of the field it maps to
    MCSPConst::MeasureLevel fMeasurementLevel = MCSPConst::kLevelUnknown; //!< level
    std::vector<std::string> fvAssociatTargetNames;                       //!< associated targets
    MCXML_800::IMCVariable::VariableStorage fValueType =
        MCXML_800::IMCVariable::kNumericStorage;              //!< value storage
    bool fbOutput = true;                                     //!< include in the output
    std::string fOutputFormat;                                //!< display format
    bool fbManual;                                            //!< distribution given by the user
    bool fbRequireAutofitting;                                //!< distribution still to be fitted
    std::array<bool, MCSPConst::kNDistTypes> fbAutofitDist{}; //!< candidate flag by type
    std::vector<DistInfoElem> fvDistributions;                //!< distributions
    bool fbLocked = true;                                     //!< locked against edits
    double fMinimum = kNoMinimum;                             //!< lower bound of drawn values
    double fMaximum = kNoMaximum;                             //!< upper bound of drawn values
    std::vector<std::string> fvUnmatchedCategories;           //!< plan categories the data lacks
    bool fbAllCategoriesInvalid = false;                      //!< no plan category is in the data
    MCCommon_800::MCWarnings fWarnings;                       //!< warnings about the field
};

//! A fixed input field: one given value, or a list of values that the simulation steps
//! through, with its associated targets and display information.
class FixedInputSpecs : public MCValueLabels {
public:
    //! No values, unlocked; the builder of the field sets its value storage.
    FixedInputSpecs() = default;

    void SetVarName(const std::string& name) { fVarName = name; }
    const std::string& GetVarName() const { return fVarName; }
    void SetAssociatTargetNames(const std::vector<std::string>& names) {
        fvAssociatTargetNames = names;
    }
    const std::vector<std::string>& GetAssociatTargetNames() const { return fvAssociatTargetNames; }
    void SetOutputFormat(const std::string& format) { fOutputFormat = format; }
    const std::string& GetOutputFormat() const { return fOutputFormat; }
    void SetValueType(MCXML_800::IMCVariable::VariableStorage storage) { fValueType = storage; }
    MCXML_800::IMCVariable::VariableStorage GetValueType() const { return fValueType; }
    void SetLocked(bool locked) { fbLocked = locked; }
    bool IsLocked() const { return fbLocked; }

    //! Appends one numeric value.
    void AddInputValue(double value) { fvInputValues.emplace_back(value); }
    //! Appends one text value.
    void AddInputValue(const std::string& value) { fvInputValues.emplace_back(value); }
    //! Replaces all values.
    void SetInputValue(const std::vector<double>& values);
    void SetInputValue(const std::vector<std::string>& values);
    //! Appends `n` evenly spaced values from `low` to `high` (both included) when both are
    //! finite, `high` > `low` and `n` >= 2; otherwise does nothing.
    void SetFixedInput(double low, double high, int n);

    std::size_t GetInputValueSize() const { return fvInputValues.size(); }
    //! Value `i` (i < GetInputValueSize()).
    const MCDataValue& GetInputValueAt(std::size_t i) const { return fvInputValues[i]; }
    //! Appends every value read as a double.
    void GetInputValue(std::vector<double>& values) const;
    //! Appends every value read as a text.
    void GetInputValue(std::vector<std::string>& values) const;
    //! True when there is a value and the first is numeric.
    bool IsNumeric() const;
    //! True when there is a value and the first is a text.
    bool IsString() const;

    //! Diagnostic print to the display stream.
    void Display() const;

private:
    std::string fVarName;                           //!< field name
    std::vector<std::string> fvAssociatTargetNames; //!< associated targets
    std::string fOutputFormat;                      //!< display format
    MCXML_800::IMCVariable::VariableStorage fValueType =
        MCXML_800::IMCVariable::kNoStorage; //!< value storage, set by the builder
    std::vector<MCDataValue> fvInputValues; //!< the values
    bool fbLocked = false;                  //!< locked against edits
};

} // namespace MCMCSP_800
