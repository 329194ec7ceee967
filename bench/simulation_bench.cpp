// W-SIM-1 end to end in the component: the inputs of wsim1_plan.h, the linear target
// 2·x0 + 3·x1 − 1.5·x2 + 10·x3 + 0.7·x4 + 20·x5 plus a region effect (0, 5, −3) as a
// transformation, 1,000,000 cases per run with the target's histogram, through
// SECAlgorithm::SimulateData (correlation model, pilot, workers, merge, completion).
//
//   BM_SimulateWSim1/threads:n   cases per second of a whole run on n workers (wall clock)
//   BM_SimulateWSim1_Tornado     the same on one worker with the delta and variance measures
//   BM_SimulateWSim1_Added       one worker with the quantile summary and first-order indices
#include <benchmark/benchmark.h>

#include "wsim1_plan.h"

#include "mccommon/hostinterfaces.h"
#include "mccommon/scoring.h"
#include "simulation_evaluation/secalgorithm.h"

#include <array>
#include <memory>
#include <string>
#include <vector>

namespace {

using MCCommon_800::MCStatus;
using MCXML_800::IMCScoreComputer;
using MCXML_800::Value;
using MCXML_800::ValueRecord;

constexpr int kCases = 1000000;

//! The W-SIM-1 target as a transformation with one field.
class LinearTarget : public IMCScoreComputer {
public:
    MCStatus PrepareOutputRecord(const ValueRecord& input, ValueRecord& output) override {
        static const char* const names[] = {"normal", "lognormal", "triangular",
                                            "uniform", "gamma", "beta"};
        for (std::size_t k = 0; k < fvPos.size(); ++k) {
            fvPos[k] = input.IndexOf(names[k]);
        }
        fRegion = input.IndexOf("region");
        output.Clear();
        output.Add("profit", Value(0.0));
        return MCStatus();
    }
    PMMLModelType GetModelType() const override { return kTransformsOnly; }
    int GetNTargets() const override { return 1; }
    const MCXML_800::IMCVariable* GetTargetVariable(int) const override { return &fVar; }
    std::string GetAlgorithmName() const override { return "Transformation"; }
    MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) override {
        static constexpr std::array<double, 6> coefs = {2.0, 3.0, -1.5, 10.0, 0.7, 20.0};
        double y = 0.0;
        for (std::size_t k = 0; k < coefs.size(); ++k) {
            y += coefs[k] * input[fvPos[k]].GetReal();
        }
        const std::string& region = input[fRegion].GetText();
        y += region == "south" ? 5.0 : region == "west" ? -3.0 : 0.0;
        output[0].SetReal(y);
        return MCStatus();
    }

private:
    MCXML_800::MCScaleVar fVar{"profit"};
    std::array<int, 6> fvPos{};
    int fRegion = -1;
};

class LinearFactory : public MCXML_800::IMCSPScoreFactory {
public:
    std::unique_ptr<IMCScoreComputer> CreateScoreComputer() override {
        return std::make_unique<LinearTarget>();
    }
};

void RunWSim1(benchmark::State& state, int threads, bool tornado, bool added = false) {
    wsim1::WSim1 w(false, threads);
    w.plan.SetMaxCases(kCases);
    w.settings.SetQuantilesAndIndices(added);
    if (tornado) {
        w.settings.SetTornadoDeltaStddev(1.0);
        w.settings.SetTornadoVariance(true);
    }
    LinearFactory factory;
    double mean = 0.0;
    for (auto _ : state) {
        MCMCSP_800::SECAlgorithm alg(w.settings, w.plan, w.vars);
        MCCommon_800::MCMemoryRecordIter data({MCXML_800::Record(1)});
        if (!alg.BuildModel(data, nullptr).IsOK() || !alg.SimulateData(&factory, nullptr).IsOK()) {
            state.SkipWithError("simulation failed");
            break;
        }
        MCMCSP_800::SECOutputStats* results = nullptr;
        (void)alg.GetOutputStats(results);
        mean = results->GetContTargetInfo()[0].fMean;
    }
    state.SetItemsProcessed(state.iterations() * kCases);
    state.counters["profit_mean"] = mean;
}

void BM_SimulateWSim1(benchmark::State& state) {
    RunWSim1(state, static_cast<int>(state.range(0)), false);
}
BENCHMARK(BM_SimulateWSim1)
    ->ArgName("threads")
    ->Arg(1)
    ->Arg(2)
    ->Unit(benchmark::kMillisecond)
    ->UseRealTime();

void BM_SimulateWSim1_Tornado(benchmark::State& state) {
    RunWSim1(state, 1, true);
}
BENCHMARK(BM_SimulateWSim1_Tornado)->Unit(benchmark::kMillisecond)->UseRealTime();

void BM_SimulateWSim1_Added(benchmark::State& state) {
    RunWSim1(state, 1, false, true);
}
BENCHMARK(BM_SimulateWSim1_Added)->Unit(benchmark::kMillisecond)->UseRealTime();

} // namespace

BENCHMARK_MAIN();
