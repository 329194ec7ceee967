// Writes the simulation workload W-SIM-1: a plan file and the formula model it names.
//
//   gen_wsim1 PLAN.xml [MODEL]    MODEL defaults to wsim1.model beside the plan; the plan
//                                 records it relative to the plan's folder
//
// Inputs (the set of simulation_generation_bench.cpp): six correlated continuous inputs
//   normal      Normal, mean 100, standard deviation 15
//   lognormal   LogNormal, a = e (the median), b = 0.5 (the sd of the log)
//   triangular  Triangular, min 1, max 10, mode 4
//   uniform     Uniform on [0, 1]
//   gamma       Gamma, shape 2, second parameter (the rate) 0.5
//   beta        Beta, shapes 2 and 5
// with the correlation matrix kCorrelations below, and one categorical input region with
// "north", "south", "west" at 0.5, 0.3, 0.2. The model has one continuous target
//   target = 2 normal + 3 lognormal - 1.5 triangular + 10 uniform + 0.7 gamma + 20 beta
//            + (0, 5, -3 for north, south, west)
// whose mean is 216.15 whatever the correlations. The plan asks for 1,000,000 cases with a
// fixed seed.
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <cmath>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <string>
#include <utility>
#include <vector>

namespace {

using namespace MCMCSP_800;
using namespace MCSPConst;

constexpr int kNContinuous = 6;
const char* const kNames[kNContinuous] = {"normal",  "lognormal", "triangular",
                                          "uniform", "gamma",     "beta"};
//! Target correlations of the continuous inputs; the peers take them as the normal copula's.
constexpr double kCorrelations[kNContinuous][kNContinuous] = {
    {1.0, 0.5, 0.3, 0.2, -0.2, 0.1}, {0.5, 1.0, 0.3, 0.1, 0.4, 0.2},
    {0.3, 0.3, 1.0, 0.0, 0.2, -0.1}, {0.2, 0.1, 0.0, 1.0, 0.3, 0.3},
    {-0.2, 0.4, 0.2, 0.3, 1.0, 0.0}, {0.1, 0.2, -0.1, 0.3, 0.0, 1.0}};
constexpr int kCases = 1000000;
constexpr double kSeed = 20261206.0;

const char* const kModelText =
    "# W-SIM-1: a linear target of the six continuous inputs plus a region effect\n"
    "levels region \"north\" \"south\" \"west\"\n"
    "target = 2*normal + 3*lognormal - 1.5*triangular + 10*uniform + 0.7*gamma + 20*beta"
    " + (region == 1 ? 5 : (region == 2 ? -3 : 0))\n";

void AddContinuous(SPCSettings& plan, const std::string& name, DistType type,
                   const std::vector<std::pair<std::string, double>>& params) {
    SimInputSpecs input(true);
    input.SetVarName(name);
    input.SetVarLevel(kLevelContinuous);
    input.SetString(false);
    input.SetAssociatTargetNames({"target"});
    DistInfoElem* dist =
        input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(type)));
    for (const auto& [label, value] : params) {
        dist->AddParameter(label, value);
    }
    plan.AddSimulationInput(input);
}

SPCSettings BuildPlan(const std::string& modelPath) {
    SPCSettings plan;
    plan.SetModel(modelPath, false);
    SPCSettings::ModelFileTarget target;
    target.fName = "target";
    target.fMeasurementLevel = kLevelContinuous;
    plan.AddModelTarget(target);

    AddContinuous(plan, "normal", kDistNormal, {{"mean", 100.0}, {"stddev", 15.0}});
    AddContinuous(plan, "lognormal", kDistLognormal, {{"a", std::exp(1.0)}, {"b", 0.5}});
    AddContinuous(plan, "triangular", kDistTriangular,
                  {{"min", 1.0}, {"max", 10.0}, {"mode", 4.0}});
    AddContinuous(plan, "uniform", kDistUniform, {{"min", 0.0}, {"max", 1.0}});
    AddContinuous(plan, "gamma", kDistGamma, {{"shape", 2.0}, {"scale", 0.5}});
    AddContinuous(plan, "beta", kDistBeta, {{"shape1", 2.0}, {"shape2", 5.0}});

    SimInputSpecs region(true);
    region.SetVarName("region");
    region.SetVarLevel(kLevelCategorical);
    region.SetString(true);
    region.SetAssociatTargetNames({"target"});
    DistInfoElem* dist =
        region.GetDistribution(static_cast<std::size_t>(region.AddDistribution(kDistCategorical)));
    dist->AddParameter("cats", std::vector<std::string>{"north", "south", "west"});
    dist->AddParameter("probs", std::vector<double>{0.5, 0.3, 0.2});
    plan.AddSimulationInput(region);

    for (int i = 0; i < kNContinuous; ++i) {
        for (int j = 0; j <= i; ++j) {
            plan.SetCorrMatrixCell(kNames[i], kNames[j], kCorrelations[i][j]);
        }
    }
    plan.SetMaxCases(kCases);
    plan.SetUseRandomSeed(false);
    plan.SetSeed(kSeed);
    return plan;
}

//! `model` as the plan records it: relative to the plan's folder when possible.
std::string ModelPathForPlan(const std::filesystem::path& model,
                             const std::filesystem::path& plan) {
    namespace fs = std::filesystem;
    std::error_code ec;
    const fs::path planDir = fs::absolute(plan, ec).parent_path();
    const fs::path absolute = fs::absolute(model, ec);
    if (ec) {
        return model.string();
    }
    const fs::path relative = absolute.lexically_relative(planDir);
    return relative.empty() ? absolute.string() : relative.generic_string();
}

bool WriteText(const std::filesystem::path& path, const std::string& text) {
    std::ofstream out(path, std::ios::binary);
    out << text;
    out.close();
    if (!out) {
        std::fprintf(stderr, "gen_wsim1: cannot write %s\n", path.string().c_str());
        return false;
    }
    return true;
}

} // namespace

int main(int argc, char** argv) {
    if (argc < 2 || argc > 3) {
        std::fprintf(stderr, "usage: %s PLAN.xml [MODEL]\n", argv[0]);
        return 2;
    }
    const std::filesystem::path planPath(argv[1]);
    const std::filesystem::path modelPath =
        argc == 3 ? std::filesystem::path(argv[2]) : planPath.parent_path() / "wsim1.model";

    const SPCSettings plan = BuildPlan(ModelPathForPlan(modelPath, planPath));
    MCPlanXMLHandler handler;
    std::string xml;
    if (!handler.WritePlanFile(xml, &plan)) {
        std::fprintf(stderr, "gen_wsim1: the plan could not be written as XML\n");
        return 1;
    }
    if (!WriteText(modelPath, kModelText) || !WriteText(planPath, xml)) {
        return 1;
    }
    return 0;
}
