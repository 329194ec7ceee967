// Plans shared by the plan file tests: a rich plan with every kind of element the file holds,
// the small example plan shipped under examples/plans, and helpers to look into written text.
#pragma once

#include "mccommon/mcmv.h"
#include "mcxml/mcxml.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <vector>

namespace planfile_test {

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::IMCVariable;

inline SPCSettings::ModelFileTarget Target(const std::string& name, MeasureLevel level) {
    SPCSettings::ModelFileTarget target;
    target.fName = name;
    target.fMeasurementLevel = level;
    return target;
}

//! A simulated input with one distribution per parameter list in `sets`, each list holding
//! the values of `names` in order.
inline SimInputSpecs ParamInput(const std::string& name, bool manual, DistType type,
                                const std::vector<std::string>& names,
                                const std::vector<std::vector<double>>& sets) {
    SimInputSpecs input(manual);
    input.SetVarName(name);
    for (const std::vector<double>& values : sets) {
        DistInfoElem* dist =
            input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(type)));
        for (std::size_t i = 0; i < names.size(); ++i) {
            EXPECT_TRUE(dist->AddParameter(names[i], values[i])) << name << " " << names[i];
        }
    }
    return input;
}

//! A Categorical input with one distribution per probability list.
inline SimInputSpecs CategoricalInput(const std::string& name, const std::vector<std::string>& cats,
                                      const std::vector<std::vector<double>>& probSets) {
    SimInputSpecs input(true);
    input.SetVarName(name);
    input.SetVarLevel(kLevelCategorical);
    input.SetValueType(IMCVariable::kStringStorage);
    for (const std::vector<double>& probs : probSets) {
        DistInfoElem* dist = input.GetDistribution(
            static_cast<std::size_t>(input.AddDistribution(kDistCategorical)));
        EXPECT_TRUE(dist->AddParameter("cats", cats));
        EXPECT_TRUE(dist->AddParameter("probs", probs));
    }
    return input;
}

// Every kind of element of the plan file, with the points that do not survive a write and a
// read: a target and a field of level 0, a field of storage 0, a Negative binomial whose type
// is neither 1.0 nor 2.0, and run and autofit settings that the file does not carry.
inline SPCSettings RichPlan() {
    SPCSettings plan;

    SPCSettings::ModelFileTarget profit = Target("profit", kLevelContinuous);
    profit.fMapName = "profit_pred";
    profit.fOutputFormat = "F8.2";
    profit.fComment = "net profit <after tax> & fees";
    profit.fbHasTargetFilter = true;
    profit.fFilterLow = 0.0;
    profit.fbIncludeLow = false;
    profit.fFilterHigh = 1e6;
    SPCSettings::ModelFileTarget risk = Target("risk", kLevelCategorical);
    risk.fbExcludeFromOutput = true;
    SPCSettings::ModelFileTarget grade = Target("grade", kLevelOrdinal);
    grade.fbHasTargetFilter = true;
    grade.fFilterHigh = 4.5;
    grade.fbIncludeHigh = false;
    plan.SetModel("models/profit.xml", false);
    plan.AddModelTarget(profit);
    plan.AddModelTarget(risk);
    plan.AddModelTarget(Target("score", kLevelUnknown));
    plan.AddModelTarget(grade);
    SPCSettings::ModelFileElem custom;
    custom.fFilePath = "models/custom model.xml";
    custom.fbCustomModel = true;
    SPCSettings::ModelFileTarget alt = Target("alt", kLevelContinuous);
    alt.fbHasTargetFilter = true; // a filter without bounds
    custom.fvTargets.push_back(alt);
    plan.AddModelFileInfo(custom);

    SimInputSpecs price =
        ParamInput("price", true, kDistNormal, {"mean", "stddev"}, {{25.0, 2.5}, {30.0, 0.1}});
    price.SetVarLevel(kLevelContinuous);
    price.SetMapVarName("unit_price");
    price.SetMinimum(0.0);
    price.SetOutputFormat("F6.2");
    price.SetLocked(false);
    price.SetAssociatTargetNames({"profit", "risk"});
    price.SetValueLabels(std::vector<double>{0.0, 99.5}, {"free", "top price"});
    plan.AddSimulationInput(price);

    SimInputSpecs demand = ParamInput("demand", false, kDistTriangular, {"min", "max", "mode"},
                                      {{800.0, 1500.0, 1000.0}});
    demand.SetValueType(IMCVariable::kNoStorage);
    demand.SetMaximum(2000.0);
    demand.SetOutput(false);
    EXPECT_TRUE(demand.SetDefaultAutofit(kLevelContinuous));
    plan.AddSimulationInput(demand);

    SimInputSpecs region =
        CategoricalInput("region", {"north", "south", "west"}, {{0.4, 0.35, 0.25}});
    region.SetValueLabels(std::vector<std::string>{"north", "west"}, {"Northern", "Western"});
    plan.AddSimulationInput(region);
    plan.AddSimulationInput(CategoricalInput("segment", {"a", "b"}, {{0.2, 0.8}, {0.5, 0.5}}));

    SimInputSpecs bins(true);
    bins.SetVarName("bins");
    bins.SetVarLevel(kLevelContinuous);
    DistInfoElem* ranges =
        bins.GetDistribution(static_cast<std::size_t>(bins.AddDistribution(kDistUserRanges)));
    EXPECT_TRUE(ranges->AddParameter("min", std::vector<double>{0.0, 10.0}));
    EXPECT_TRUE(ranges->AddParameter("max", std::vector<double>{10.0, 20.0}));
    EXPECT_TRUE(ranges->AddParameter("probs", std::vector<double>{0.4, 0.6}));
    plan.AddSimulationInput(bins);

    SimInputSpecs hist(false);
    hist.SetVarName("hist");
    hist.SetVarLevel(kLevelContinuous);
    hist.SetRequireAutofitting(false);
    DistInfoElem* empirical =
        hist.GetDistribution(static_cast<std::size_t>(hist.AddDistribution(kDistEmpirical)));
    EXPECT_TRUE(empirical->AddParameter("min", 0.0));
    EXPECT_TRUE(empirical->AddParameter("max", 100.0));
    EXPECT_TRUE(empirical->AddParameter("stddev", MCMV::Missing()));
    EXPECT_TRUE(empirical->AddParameter("probs", std::vector<double>{0.1, 0.2, 0.7}));
    plan.AddSimulationInput(hist);

    SimInputSpecs claims = ParamInput("claims", true, kDistNegbinomial, {"thresh", "prob", "type"},
                                      {{3.0, 0.4, 3.0}, {5.0, 0.25, 3.0}});
    claims.SetVarLevel(kLevelOrdinal);
    plan.AddSimulationInput(claims);

    SimInputSpecs visits = ParamInput("visits", true, kDistPoisson, {"mean"}, {{4.0}});
    visits.SetVarLevel(kLevelOrdinal);
    visits.SetValueType(IMCVariable::kIntegerStorage);
    plan.AddSimulationInput(visits);

    plan.AddFixedInput("discount", std::vector<double>{0.1}, "F4.2");
    plan.AddFixedInput("channel", std::vector<std::string>{"web", "store & co"}, "");
    plan.SetFixedInputAssociatedTargets("channel", {"profit"});
    plan.GetFixedInput("channel")->SetLocked(true);
    plan.GetFixedInput("channel")->SetValueLabels(std::vector<std::string>{"web"}, {"Online"});

    plan.SetCorrMatrixCell("demand", "price", -0.35);
    plan.SetCorrMatrixCell("visits", "price", 0.2);
    plan.SetCorrMatrixCell("visits", "demand", MCMV::Missing());
    plan.SetCorrLocked(true);

    plan.SetCrstabsFactors({"region", "segment"});
    plan.SetCrstabsMatrix({{"north", "a"}, {"south", "b"}, {"west", "a"}});
    plan.SetCrstabsProbs({0.5, 0.3, 0.2});

    plan.SetStopCriteriaMean("profit", 1.0, kUnitPercent, 0.95);
    plan.SetStopCriteriaTails("profit", 500.0, kSideLeft, kTailPercentile, 100);
    plan.SetStopCriteriaTails("grade", 4.0, kSideRight, kTailValue, 25);
    plan.SetMaxCases(5000);

    // Not in the file.
    plan.SetSeed(42.0);
    plan.SetUseRandomSeed(false);
    plan.SetAutoFitNCases(1000);
    plan.SetAutoFitType(kKolmogorovSmirnov);
    plan.SetAutoFitMaxIterations(50);
    plan.SetBins(20);
    return plan;
}

// The example shipped as examples/plans/profit_plan.xml: one model file with two targets,
// three simulated inputs (Normal, Triangular, Categorical), one fixed input, one correlation
// and a stop criterion on the mean.
inline SPCSettings ExamplePlan() {
    SPCSettings plan;
    plan.SetModel("../models/order_profit.model", false);
    SPCSettings::ModelFileTarget profit = Target("profit", kLevelContinuous);
    profit.fOutputFormat = "F10.2";
    profit.fComment = "Profit per order";
    plan.AddModelTarget(profit);
    plan.AddModelTarget(Target("loss_risk", kLevelCategorical));

    SimInputSpecs price =
        ParamInput("unit_price", true, kDistNormal, {"mean", "stddev"}, {{25.0, 2.5}});
    price.SetVarLevel(kLevelContinuous);
    price.SetMinimum(0.0);
    price.SetAssociatTargetNames({"profit"});
    plan.AddSimulationInput(price);

    SimInputSpecs volume = ParamInput("volume", true, kDistTriangular, {"min", "max", "mode"},
                                      {{800.0, 1500.0, 1000.0}});
    volume.SetVarLevel(kLevelContinuous);
    plan.AddSimulationInput(volume);

    SimInputSpecs region =
        CategoricalInput("region", {"north", "south", "west"}, {{0.45, 0.35, 0.2}});
    region.SetValueLabels(std::vector<std::string>{"north", "south", "west"},
                          {"North", "South", "West"});
    plan.AddSimulationInput(region);

    plan.AddFixedInput("discount", std::vector<double>{0.05}, "F4.2");

    plan.SetCorrMatrixCell("volume", "unit_price", -0.4);
    plan.SetStopCriteriaMean("profit", 1.0, kUnitPercent, 0.95);
    plan.SetMaxCases(100000);
    return plan;
}

//! Path of the example plan in the source tree.
inline std::string ExamplePlanPath() {
    const std::string here = __FILE__;
    const std::string root = here.substr(0, here.rfind("/tests/"));
    return root + "/examples/plans/profit_plan.xml";
}

//! Writes `plan`, failing the test when the writer fails.
inline std::string Written(const SPCSettings& plan) {
    MCPlanXMLHandler handler;
    std::string text;
    EXPECT_TRUE(handler.WritePlanFile(text, &plan));
    return text;
}

} // namespace planfile_test
