// Plan builders shared by the generation and NORTA tests: a plan with its settings and
// variable list, inputs added by distribution type and parameters.
#pragma once

#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secsettings.h"
#include "simulation_evaluation/secsimulator.h"

#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace simgen {

using MCMCSP_800::DistInfoElem;
using MCMCSP_800::SimInputSpecs;

//! A distribution with scalar parameters, added in the order given.
inline DistInfoElem MakeDist(MCSPConst::DistType type,
                             const std::vector<std::pair<std::string, double>>& params) {
    DistInfoElem dist;
    dist.SetDistType(type);
    for (const auto& [name, value] : params) {
        dist.AddParameter(name, value);
    }
    return dist;
}

//! A Categorical distribution over `cats` with `probs`.
inline DistInfoElem MakeCategorical(const std::vector<std::string>& cats,
                                    const std::vector<double>& probs) {
    DistInfoElem dist;
    dist.SetDistType(MCSPConst::kDistCategorical);
    dist.AddParameter("cats", cats);
    dist.AddParameter("probs", probs);
    return dist;
}

//! Settings, plan and variables of one test simulation; the simulators borrow all three.
struct TestPlan {
    MCMCSP_800::SECSettings settings;
    MCMCSP_800::SPCSettings plan;
    MCXML_800::MCVarList vars;

    //! Adds a simulated input with the given distributions (several make it the sensitivity
    //! input) and a host variable of the same name.
    SimInputSpecs& AddInput(const std::string& name, const std::vector<DistInfoElem>& dists,
                            MCSPConst::MeasureLevel level = MCSPConst::kLevelContinuous) {
        SimInputSpecs input(true);
        input.SetVarName(name);
        input.SetVarLevel(level);
        for (const DistInfoElem& dist : dists) {
            const int i = input.AddDistribution(dist.GetDistType());
            *input.GetDistribution(static_cast<std::size_t>(i)) = dist;
        }
        const bool categorical =
            !dists.empty() && dists[0].GetDistType() == MCSPConst::kDistCategorical;
        if (categorical) {
            std::vector<std::string> cats;
            std::vector<double> probs;
            std::string label;
            dists[0].GetParameterNameValue(0, label, cats);
            vars.Add(std::make_unique<MCXML_800::MCCatVar>(name, MCXML_800::MCCatNumEncoder(cats)));
            input.SetString(true);
        } else {
            vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
        }
        plan.AddSimulationInput(input);
        return *plan.GetSimInput(name);
    }
    SimInputSpecs& AddInput(const std::string& name, const DistInfoElem& dist,
                            MCSPConst::MeasureLevel level = MCSPConst::kLevelContinuous) {
        return AddInput(name, std::vector<DistInfoElem>{dist}, level);
    }

    //! A simulator of iteration `iteration` with its own stream seeded by the settings' seed.
    std::unique_ptr<MCMCSP_800::SECSimulator> MakeSimulator(int iteration = 0) const {
        return std::make_unique<MCMCSP_800::SECSimulator>(&settings, &plan, &vars, iteration,
                                                          nullptr, -1.0, nullptr);
    }
};

} // namespace simgen
