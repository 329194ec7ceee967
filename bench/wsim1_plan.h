// The W-SIM-1 workload of the simulation benchmarks: six correlated continuous inputs
// (Normal(100, 15), LogNormal(a = e, b = 0.5), Triangular(1, 10, 4), Uniform(0, 1),
// Gamma(shape 2, rate 0.5), Beta(2, 5)) and one categorical input "region" (north, south, west
// with 0.5, 0.3, 0.2).
#pragma once

#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secsettings.h"
#include "simulation_evaluation/secsimulator.h"

#include "mcthread/mcthread.h"

#include <cmath>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace wsim1 {

using namespace MCMCSP_800;
using namespace MCSPConst;

//! Settings, plan and variables of the W-SIM-1 input set; simulators borrow all three.
struct WSim1 {
    SECSettings settings;
    SPCSettings plan;
    MCXML_800::MCVarList vars;
    MCThread_800::MCStdThreadFactory factory;

    explicit WSim1(bool truncated = false, int threads = 1) {
        settings.SetThreadFactory(&factory);
        settings.SetMaxThreadNum(threads);
        Add("normal", kDistNormal, {{"mean", 100.0}, {"stddev", 15.0}});
        Add("lognormal", kDistLognormal, {{"a", std::exp(1.0)}, {"b", 0.5}});
        Add("triangular", kDistTriangular, {{"min", 1.0}, {"max", 10.0}, {"mode", 4.0}});
        Add("uniform", kDistUniform, {{"min", 0.0}, {"max", 1.0}});
        Add("gamma", kDistGamma, {{"shape", 2.0}, {"scale", 0.5}});
        Add("beta", kDistBeta, {{"shape1", 2.0}, {"shape2", 5.0}});
        SimInputSpecs region(true);
        region.SetVarName("region");
        region.SetVarLevel(kLevelCategorical);
        region.SetString(true);
        const int d = region.AddDistribution(kDistCategorical);
        DistInfoElem* dist = region.GetDistribution(static_cast<std::size_t>(d));
        dist->AddParameter("cats", std::vector<std::string>{"north", "south", "west"});
        dist->AddParameter("probs", std::vector<double>{0.5, 0.3, 0.2});
        vars.Add(std::make_unique<MCXML_800::MCCatVar>(
            "region",
            MCXML_800::MCCatNumEncoder(std::vector<std::string>{"north", "south", "west"})));
        plan.AddSimulationInput(region);

        const char* names[] = {"normal", "lognormal", "triangular", "uniform", "gamma", "beta"};
        const double corr[6][6] = {
            {1.0, 0.5, 0.3, 0.2, -0.2, 0.1}, {0.5, 1.0, 0.3, 0.1, 0.4, 0.2},
            {0.3, 0.3, 1.0, 0.0, 0.2, -0.1}, {0.2, 0.1, 0.0, 1.0, 0.3, 0.3},
            {-0.2, 0.4, 0.2, 0.3, 1.0, 0.0}, {0.1, 0.2, -0.1, 0.3, 0.0, 1.0}};
        for (int i = 0; i < 6; ++i) {
            for (int j = 0; j <= i; ++j) {
                plan.SetCorrMatrixCell(names[i], names[j], corr[i][j]);
            }
        }
        if (truncated) {
            plan.GetSimInput("normal")->SetMinimum(85.0);
            plan.GetSimInput("gamma")->SetMaximum(8.0);
            plan.GetSimInput("beta")->SetMaximum(0.5);
        }
    }

    void Add(const std::string& name, DistType type,
             const std::vector<std::pair<std::string, double>>& params) {
        SimInputSpecs input(true);
        input.SetVarName(name);
        input.SetVarLevel(kLevelContinuous);
        DistInfoElem* dist =
            input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(type)));
        for (const auto& [label, value] : params) {
            dist->AddParameter(label, value);
        }
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
        plan.AddSimulationInput(input);
    }

    //! A master with its correlation model and generation prepared.
    std::unique_ptr<SECSimulator> Master() const {
        auto sim =
            std::make_unique<SECSimulator>(&settings, &plan, &vars, 0, nullptr, -1.0, nullptr);
        if (!sim->PrepareGeneration().IsOK()) {
            return nullptr;
        }
        return sim;
    }
};


} // namespace wsim1
