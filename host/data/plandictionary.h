// The host's variable list for simulating a plan: where `mcsim fit` describes a CSV file, a
// simulation has no data file, so the variables come from the plan itself and from the model
// that scores it.
//
//   - a simulated input drawn from a Categorical distribution: MCCatVar with the categories of
//     that distribution, in order (texts for a text field, numbers otherwise);
//   - any other simulated input: MCScaleVar (the value is the drawn number);
//   - a fixed input: MCScaleVar, with text storage when its values are texts;
//   - a target of the model: MCScaleVar, or MCCatVar with its labels for a `category` target.
//
// Build also checks that the plan can be simulated with the model, so that every problem is
// reported before the run with the file and field it concerns: each simulated field has a
// distribution, each correlation variable and contingency factor is a simulated field, every
// name the model uses is an input of the plan, a text input the model reads has a `levels`
// line listing its categories, the plan's targets are the model's, and each stop criterion
// names a continuous target.
#pragma once

#include "mccommon/variables.h"
#include "models/formulamodel.h"
#include "simulation_common/spcsettings.h"

#include <string>
#include <vector>

namespace MCHost {

//! One simulated input as a simulated case carries it.
struct PlanInput {
    std::string fName;                     //!< field name
    bool fbCategorical = false;            //!< the case holds a category index 0..k-1
    std::vector<std::string> fvCategories; //!< category texts by index (categorical only)
};

class PlanDictionary {
public:
    //! Builds the variables of `plan` (read from `planPath`) and `model`. Throws HostError
    //! naming the plan file and field, or the model file and line, when the two cannot be
    //! simulated together.
    static PlanDictionary Build(const MCMCSP_800::SPCSettings& plan, const std::string& planPath,
                                const FormulaModel& model);

    //! Inputs, then targets, as the component sees them.
    const MCXML_800::MCVarList& GetVarList() const { return fVarList; }
    //! The simulated inputs in plan order: the order of the values of a simulated case.
    const std::vector<PlanInput>& GetSimulatedInputs() const { return fvInputs; }
    //! Names of the fixed inputs in plan order.
    const std::vector<std::string>& GetFixedInputs() const { return fvFixed; }

private:
    PlanDictionary() = default;

    MCXML_800::MCVarList fVarList;    //!< inputs and targets
    std::vector<PlanInput> fvInputs;  //!< simulated inputs
    std::vector<std::string> fvFixed; //!< fixed inputs
};

//! Number of sensitivity iterations the plan asks for: the number of distributions of the
//! simulated input, or of values of the fixed input, that varies over the iterations; 1 when
//! none does.
int CountSensitivityIterations(const MCMCSP_800::SPCSettings& plan);

//! A one-line description of what iteration `iteration` uses for the plan's varying input
//! ("discount = 0.1", "price: Normal mean=10 stddev=2"); "" when none varies.
std::string DescribeSensitivityIteration(const MCMCSP_800::SPCSettings& plan, int iteration);

} // namespace MCHost
