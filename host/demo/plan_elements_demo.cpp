// Builds a few elements of a simulation plan the way a host would, and prints each one with its
// label and its diagnostic display.
#include "component/mcspcomponent.h"
#include "simulation_common/simulatespecs.h"

#include <iostream>
#include <string>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

void Heading(const std::string& title) {
    std::cout << "\n=== " << title << " ===\n";
}

void ShowLabels(const SimInputSpecs& input) {
    for (const DistInfoElem& dist : input.GetAllDistribution()) {
        std::cout << "label: " << dist.GetDistName() << " " << dist.GetLabel() << "\n";
    }
}

SimInputSpecs ManualNormal() {
    SimInputSpecs input(true);
    input.SetVarName("income");
    input.SetVarLevel(kLevelContinuous);
    input.SetMinimum(0.0);
    input.SetMaximum(250000.0);
    DistInfoElem* normal = input.GetDistribution(input.AddDistribution(kDistNormal));
    normal->AddParameter("mean", 52000.0);
    normal->AddParameter("stddev", 12500.0);
    return input;
}

SimInputSpecs AutofitContinuous() {
    SimInputSpecs input(false);
    input.SetVarName("waiting_time");
    input.SetVarLevel(kLevelContinuous);
    input.SetDefaultAutofit();
    return input;
}

SimInputSpecs CategoricalRegion() {
    SimInputSpecs input(true);
    input.SetVarName("region");
    input.SetVarLevel(kLevelCategorical);
    input.SetString(true);
    input.SetValueLabels(std::vector<std::string>{"N", "S", "W"}, {"North", "South", "West"});
    DistInfoElem* cat = input.GetDistribution(input.AddDistribution("Categorical"));
    cat->AddParameter("cats", std::vector<std::string>{"N", "S", "W"});
    cat->AddParameter("probs", std::vector<double>{0.5, 0.3, 0.2});
    return input;
}

DistInfoElem NegativeBinomial() {
    DistInfoElem negbin;
    negbin.SetDistType(kDistNegbinomial);
    negbin.AddParameter("thresh", 3.0);
    negbin.AddParameter("prob", 0.4);
    negbin.AddParameter("type", 1.0);
    return negbin;
}

} // namespace

int main() {
    std::cout << GetComponentVersionText() << "\n";

    Heading("Manual Normal input with bounds");
    const SimInputSpecs income = ManualNormal();
    ShowLabels(income);
    income.Display();

    Heading("Autofit continuous input");
    const SimInputSpecs waiting = AutofitContinuous();
    std::cout << "candidates:";
    for (const std::string& name : waiting.GetAutofitNames()) {
        std::cout << " " << name;
    }
    std::cout << "\neffective level: "
              << GetMeasureLevelDisplayWord(SimInputSpecs::GetEffectMeasurementLevel(waiting))
              << "\n";
    waiting.Display();

    Heading("Categorical input with value labels");
    const SimInputSpecs region = CategoricalRegion();
    ShowLabels(region);
    std::cout << "value label of S: " << region.GetValueLabel(std::string("S")) << "\n";
    region.Display();

    Heading("Negative binomial element");
    const DistInfoElem negbin = NegativeBinomial();
    std::cout << "label: " << negbin.GetLabel() << "\n";
    negbin.Display();

    Heading("Fixed input stepping from 0 to 10 in 3 values");
    FixedInputSpecs dose;
    dose.SetVarName("dose");
    dose.SetValueType(MCXML_800::IMCVariable::kNumericStorage);
    dose.SetFixedInput(0, 10, 3);
    dose.Display();
    return 0;
}
