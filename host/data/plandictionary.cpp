#include "data/plandictionary.h"

#include "common/hosterror.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <unordered_map>
#include <unordered_set>

namespace MCHost {

using MCMCSP_800::DistInfoElem;
using MCMCSP_800::FixedInputSpecs;
using MCMCSP_800::SimInputSpecs;
using MCMCSP_800::SPCSettings;
using MCXML_800::IMCVariable;

namespace {

bool Contains(const std::vector<std::string>& list, const std::string& name) {
    return std::find(list.begin(), list.end(), name) != list.end();
}

//! The categories of a Categorical distribution: its first parameter's values.
std::vector<std::string> CategoriesOf(const DistInfoElem& dist) {
    std::vector<std::string> cats;
    std::string name;
    dist.GetParameterNameValue(0, name, cats);
    return cats;
}

//! The variable of a categorical simulated input: numbers when the field holds numbers and
//! every category reads as one, texts otherwise.
std::unique_ptr<IMCVariable> CategoricalVariable(const SimInputSpecs& input,
                                                 const std::vector<std::string>& cats) {
    std::vector<double> numbers;
    bool numeric = !input.IsString();
    for (const std::string& text : cats) {
        double x = 0.0;
        numeric = numeric && MCCommon_800::ParseDouble(text, x);
        numbers.push_back(x);
    }
    MCXML_800::MCCatNumEncoder encoder =
        numeric ? MCXML_800::MCCatNumEncoder(numbers) : MCXML_800::MCCatNumEncoder(cats);
    return std::make_unique<MCXML_800::MCCatVar>(input.GetVarName(), std::move(encoder), false,
                                                 IMCVariable::kNominalKind);
}

//! Checks one simulated input and returns its case description; throws naming the field.
PlanInput DescribeInput(const SimInputSpecs& input, const std::string& planPath) {
    const std::string& name = input.GetVarName();
    if (input.GetDistElementSize() == 0) {
        throw HostError(LocatedMessage(
            planPath, 0,
            "simulated field '" + name + "' has no distribution" +
                (input.IsAutofit() ? " (it was to be fitted, and no fit was stored)" : "")));
    }
    PlanInput described;
    described.fName = name;
    const DistInfoElem* first = input.GetDistribution(0);
    if (first->GetDistType() != MCSPConst::kDistCategorical) {
        return described;
    }
    described.fbCategorical = true;
    described.fvCategories = CategoriesOf(*first);
    // The sensitivity iterations of a categorical field share its categories: every
    // iteration's case must read with the same labels.
    for (const DistInfoElem& dist : input.GetAllDistribution()) {
        if (dist.GetDistType() != MCSPConst::kDistCategorical ||
            CategoriesOf(dist) != described.fvCategories) {
            throw HostError(LocatedMessage(planPath, 0,
                                           "simulated field '" + name +
                                               "' has Categorical and other distributions, or "
                                               "Categorical ones with different categories"));
        }
    }
    if (described.fvCategories.empty()) {
        throw HostError(LocatedMessage(planPath, 0,
                                       "simulated field '" + name +
                                           "' has a Categorical distribution without "
                                           "categories"));
    }
    return described;
}

//! Text inputs the model reads must be listed on a `levels` line with every text they hold.
void CheckTextInputs(const FormulaModel& model, const std::vector<PlanInput>& inputs,
                     const SPCSettings& plan, const std::string& planPath) {
    const std::vector<std::string> names = model.GetInputNames();
    const std::unordered_set<std::string> used(names.begin(), names.end());
    auto levelsOf = [&](const std::string& name) -> const FormulaInputLevels* {
        for (const FormulaInputLevels& l : model.GetInputLevels()) {
            if (l.fName == name) {
                return &l;
            }
        }
        return nullptr;
    };
    auto check = [&](const std::string& name, const std::vector<std::string>& texts) {
        if (used.count(name) == 0) {
            return;
        }
        const FormulaInputLevels* levels = levelsOf(name);
        if (!levels) {
            long line = 0;
            for (const FormulaTarget& t : model.GetTargets()) {
                if (line == 0 && Contains(t.fvNames, name)) {
                    line = t.fLine;
                }
            }
            throw HostError(LocatedMessage(model.GetFileName(), line,
                                           "the model uses '" + name + "', which holds text in " +
                                               planPath + "; list its texts with 'levels " + name +
                                               " \"...\"'"));
        }
        const std::unordered_set<std::string> listed(levels->fvLabels.begin(),
                                                     levels->fvLabels.end());
        for (const std::string& text : texts) {
            if (listed.count(text) == 0) {
                throw HostError(LocatedMessage(model.GetFileName(), levels->fLine,
                                               "'levels " + name + "' does not list \"" + text +
                                                   "\", a category of '" + name + "' in " +
                                                   planPath));
            }
        }
    };
    for (std::size_t i = 0; i < inputs.size(); ++i) {
        if (inputs[i].fbCategorical && plan.GetSimulationInput()[i].IsString()) {
            check(inputs[i].fName, inputs[i].fvCategories);
        }
    }
    for (const FixedInputSpecs& fixed : plan.GetFixedInput()) {
        if (fixed.IsString()) {
            std::vector<std::string> texts;
            fixed.GetInputValue(texts);
            check(fixed.GetVarName(), texts);
        }
    }
}

//! The plan's targets must be the model's, at the same level.
void CheckTargets(const FormulaModel& model, const SPCSettings& plan, const std::string& planPath) {
    std::vector<SPCSettings::ModelFileTarget> planTargets;
    plan.GetModelTargets(planTargets);
    for (const SPCSettings::ModelFileTarget& target : planTargets) {
        const auto& targets = model.GetTargets();
        const auto it = std::find_if(targets.begin(), targets.end(), [&](const FormulaTarget& t) {
            return t.fName == target.fName;
        });
        if (it == targets.end()) {
            throw HostError(LocatedMessage(planPath, 0,
                                           "the plan names the target '" + target.fName +
                                               "', which " + model.GetFileName() +
                                               " does not define"));
        }
        const bool planCategorical = target.fMeasurementLevel == MCSPConst::kLevelCategorical ||
                                     target.fMeasurementLevel == MCSPConst::kLevelOrdinal;
        if (target.fMeasurementLevel != MCSPConst::kLevelUnknown &&
            planCategorical != it->fbCategorical) {
            throw HostError(LocatedMessage(
                planPath, 0,
                "target '" + target.fName + "' is " +
                    (planCategorical ? "categorical" : "continuous") + " in the plan and " +
                    (it->fbCategorical ? "categorical" : "continuous") + " in " +
                    model.GetFileName() + ":" + std::to_string(it->fLine)));
        }
    }
}

//! A stop criterion must name a continuous target of the model: the simulation checks the
//! criteria of continuous targets only, and would run on to the case limit otherwise.
void CheckStopCriteria(const FormulaModel& model, const SPCSettings& plan,
                       const std::string& planPath) {
    std::vector<std::string> names;
    for (const auto& c : plan.GetStopCriteriaPointValue()) {
        names.push_back(c.fTargetName);
    }
    for (const auto& c : plan.GetStopCriteriaTails()) {
        names.push_back(c.fTargetName);
    }
    const auto& targets = model.GetTargets();
    for (const std::string& name : names) {
        const auto it = std::find_if(targets.begin(), targets.end(),
                                     [&](const FormulaTarget& t) { return t.fName == name; });
        if (it == targets.end() || it->fbCategorical) {
            throw HostError(LocatedMessage(planPath, 0,
                                           "a stop criterion names '" + name +
                                               "', which is not a continuous target of " +
                                               model.GetFileName()));
        }
    }
}

//! Correlation variables and contingency factors must be simulated fields.
void CheckCorrelationsAndTable(const SPCSettings& plan, const std::vector<PlanInput>& inputs,
                               const std::string& planPath) {
    std::unordered_map<std::string, const PlanInput*> byName;
    for (const PlanInput& in : inputs) {
        byName.emplace(in.fName, &in);
    }
    for (const std::string& name : plan.GetCorrVarList()) {
        if (byName.count(name) == 0) {
            throw HostError(LocatedMessage(planPath, 0,
                                           "the correlation matrix names '" + name +
                                               "', which is not a simulated field"));
        }
    }
    for (const std::string& name : plan.GetCrstabsFactors()) {
        const auto it = byName.find(name);
        if (it == byName.end() || !it->second->fbCategorical) {
            throw HostError(LocatedMessage(planPath, 0,
                                           "the contingency table names '" + name +
                                               "', which is not a categorical simulated field"));
        }
    }
}

} // namespace

PlanDictionary PlanDictionary::Build(const SPCSettings& plan, const std::string& planPath,
                                     const FormulaModel& model) {
    PlanDictionary dict;
    if (plan.GetSimulationInput().empty()) {
        throw HostError(LocatedMessage(planPath, 0, "the plan has no simulated fields"));
    }
    std::vector<std::string> inputNames;
    for (const SimInputSpecs& input : plan.GetSimulationInput()) {
        PlanInput described = DescribeInput(input, planPath);
        if (described.fbCategorical) {
            dict.fVarList.Add(CategoricalVariable(input, described.fvCategories));
        } else {
            dict.fVarList.Add(std::make_unique<MCXML_800::MCScaleVar>(input.GetVarName()));
        }
        inputNames.push_back(described.fName);
        dict.fvInputs.push_back(std::move(described));
    }
    for (const FixedInputSpecs& fixed : plan.GetFixedInput()) {
        if (fixed.GetInputValueSize() == 0) {
            throw HostError(LocatedMessage(
                planPath, 0, "fixed field '" + fixed.GetVarName() + "' has no value"));
        }
        dict.fVarList.Add(std::make_unique<MCXML_800::MCScaleVar>(
            fixed.GetVarName(), IMCVariable::kScaleKind,
            fixed.IsString() ? IMCVariable::kStringStorage : IMCVariable::kNumericStorage));
        inputNames.push_back(fixed.GetVarName());
        dict.fvFixed.push_back(fixed.GetVarName());
    }
    CheckCorrelationsAndTable(plan, dict.fvInputs, planPath);

    const std::string problem = model.CheckInputs(inputNames);
    if (!problem.empty()) {
        // An unknown name is most often a field the plan does not have: say which it has.
        const bool unknown = problem.find("unknown name") != std::string::npos;
        throw HostError(unknown ? problem + "; the inputs of " + planPath +
                                      " are its simulated and fixed fields"
                                : problem);
    }
    CheckTextInputs(model, dict.fvInputs, plan, planPath);
    CheckTargets(model, plan, planPath);
    CheckStopCriteria(model, plan, planPath);

    for (const FormulaTarget& t : model.GetTargets()) {
        if (t.fbCategorical) {
            dict.fVarList.Add(std::make_unique<MCXML_800::MCCatVar>(
                t.fName, MCXML_800::MCCatNumEncoder(t.fvLabels), false, IMCVariable::kNominalKind));
        } else {
            dict.fVarList.Add(std::make_unique<MCXML_800::MCScaleVar>(t.fName));
        }
    }
    return dict;
}

int CountSensitivityIterations(const SPCSettings& plan) {
    const int index = plan.GetIterationIndex();
    if (index < 0) {
        return 1;
    }
    const auto i = static_cast<std::size_t>(index);
    std::size_t count = 1;
    switch (plan.GetIterationType()) {
    case SPCSettings::kIterAutofitInput:
    case SPCSettings::kIterManualInput:
        if (i < plan.GetSimulationInput().size()) {
            count = plan.GetSimulationInput()[i].GetDistElementSize();
        }
        break;
    case SPCSettings::kIterFixedInput:
        if (i < plan.GetFixedInput().size()) {
            count = plan.GetFixedInput()[i].GetInputValueSize();
        }
        break;
    default:
        break;
    }
    return static_cast<int>(std::max<std::size_t>(count, 1));
}

std::string DescribeSensitivityIteration(const SPCSettings& plan, int iteration) {
    const int index = plan.GetIterationIndex();
    if (index < 0 || iteration < 0) {
        return std::string();
    }
    const auto i = static_cast<std::size_t>(index);
    const auto k = static_cast<std::size_t>(iteration);
    if (plan.GetIterationType() == SPCSettings::kIterFixedInput) {
        if (i >= plan.GetFixedInput().size()) {
            return std::string();
        }
        const FixedInputSpecs& fixed = plan.GetFixedInput()[i];
        return k < fixed.GetInputValueSize()
                   ? fixed.GetVarName() + " = " + fixed.GetInputValueAt(k).GetAsString()
                   : std::string();
    }
    if (i >= plan.GetSimulationInput().size()) {
        return std::string();
    }
    const SimInputSpecs& input = plan.GetSimulationInput()[i];
    const DistInfoElem* dist = input.GetDistribution(k);
    if (!dist) {
        return std::string();
    }
    return input.GetVarName() + ": " + dist->GetDistName() + " " + dist->GetLabel();
}

} // namespace MCHost
