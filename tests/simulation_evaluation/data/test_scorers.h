// Score computers standing in for the host's models in the simulation tests: a linear model
// with one or several continuous targets (as a predictive model's "prediction" or as a
// transformation's fields), a categorical model with "prediction" and "probcategory", a
// clustering model with "clustering-clusterid", and models that fail or throw.
#pragma once

#include "component/mcspcomponent.h"
#include "mccommon/mcmv.h"
#include "mccommon/scoring.h"

#include <atomic>
#include <map>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

namespace scorers {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCXML_800::IMCScoreComputer;
using MCXML_800::Value;
using MCXML_800::ValueRecord;

//! target = intercept + Σ coefficient·input + effect of a text input's label.
struct LinearTarget {
    std::string fName;
    double fIntercept = 0.0;
    std::vector<std::pair<std::string, double>> fvCoefs;
    std::string fEffectInput;                 //!< a text input, or empty
    std::map<std::string, double> fEffects;   //!< label -> effect
};

//! Counts the scores of every computer of one factory (shared by the worker threads).
struct ScoreCounter {
    std::atomic<long long> fCount{0};
};

//! Linear targets. kTransformsOnly: one field per target, named after it. Any other type: one
//! target as "prediction", plus a field that is not a target (which the component must drop).
class LinearScorer : public IMCScoreComputer {
public:
    LinearScorer(std::vector<LinearTarget> targets, PMMLModelType type, ScoreCounter* counter)
        : fvTargets(std::move(targets)), fType(type), fpCounter(counter) {
        for (const LinearTarget& t : fvTargets) {
            fvVars.push_back(std::make_unique<MCXML_800::MCScaleVar>(t.fName));
        }
    }
    MCStatus PrepareOutputRecord(const ValueRecord& input, ValueRecord& output) override {
        fvCoefPos.clear();
        for (const LinearTarget& t : fvTargets) {
            std::vector<int> pos;
            for (const auto& [name, coef] : t.fvCoefs) {
                pos.push_back(input.IndexOf(name));
            }
            fvCoefPos.push_back(pos);
            fvEffectPos.push_back(t.fEffectInput.empty() ? -1 : input.IndexOf(t.fEffectInput));
        }
        output.Clear();
        if (fType == kTransformsOnly) {
            for (const LinearTarget& t : fvTargets) {
                output.Add(t.fName, Value(0.0));
            }
        } else {
            output.Add("$linear-extra", Value(0.0));
            output.Add("prediction", Value(0.0));
        }
        return MCStatus();
    }
    PMMLModelType GetModelType() const override { return fType; }
    int GetNTargets() const override { return static_cast<int>(fvVars.size()); }
    const MCXML_800::IMCVariable* GetTargetVariable(int i) const override {
        return i >= 0 && i < GetNTargets() ? fvVars[static_cast<std::size_t>(i)].get() : nullptr;
    }
    std::string GetAlgorithmName() const override { return "LINEAR"; }
    MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) override {
        if (fpCounter != nullptr) {
            fpCounter->fCount.fetch_add(1, std::memory_order_relaxed);
        }
        for (std::size_t t = 0; t < fvTargets.size(); ++t) {
            const LinearTarget& target = fvTargets[t];
            double y = target.fIntercept;
            for (std::size_t k = 0; k < target.fvCoefs.size(); ++k) {
                y += target.fvCoefs[k].second * input[fvCoefPos[t][k]].GetReal();
            }
            if (fvEffectPos[t] >= 0) {
                const auto it = target.fEffects.find(input[fvEffectPos[t]].GetString());
                y += it == target.fEffects.end() ? MCMV::Missing() : it->second;
            }
            // The component may drop fields that are not targets: look the field up by name.
            const int field = output.IndexOf(fType == kTransformsOnly ? target.fName
                                                                      : std::string("prediction"));
            output[field].SetReal(y);
        }
        return MCStatus();
    }

private:
    std::vector<LinearTarget> fvTargets;
    PMMLModelType fType;
    ScoreCounter* fpCounter;
    std::vector<std::unique_ptr<MCXML_800::MCScaleVar>> fvVars;
    std::vector<std::vector<int>> fvCoefPos;
    std::vector<int> fvEffectPos;
};

//! A two-category model of one input x in [0, 1]: P("low") = 1 − x, P("high") = x; the
//! prediction is the likelier label. Fields "prediction" and, when asked, "probcategory".
class CategoricalScorer : public IMCScoreComputer {
public:
    CategoricalScorer(std::string input, bool withProbs)
        : fInput(std::move(input)), fbProbs(withProbs),
          fVar("risk", MCXML_800::MCCatNumEncoder(std::vector<std::string>{"low", "high"})) {}
    MCStatus PrepareOutputRecord(const ValueRecord& input, ValueRecord& output) override {
        fPos = input.IndexOf(fInput);
        output.Clear();
        output.Add("prediction", Value(""));
        if (fbProbs) {
            output.Add("probcategory", Value(std::vector<Value::ListEntry>{}));
        }
        return MCStatus();
    }
    PMMLModelType GetModelType() const override { return kTree; }
    int GetNTargets() const override { return 1; }
    const MCXML_800::IMCVariable* GetTargetVariable(int i) const override {
        return i == 0 ? &fVar : nullptr;
    }
    std::string GetAlgorithmName() const override { return "TREE"; }
    MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) override {
        const double x = input[fPos].GetReal();
        output[0].SetString(x > 0.5 ? "high" : "low");
        if (fbProbs) {
            output[1].SetList({{"high", x}, {"low", 1.0 - x}});
        }
        return MCStatus();
    }

private:
    std::string fInput;
    bool fbProbs;
    MCXML_800::MCCatVar fVar;
    int fPos = -1;
};

//! Two clusters split at `cut` of one input; no target variable.
class ClusterScorer : public IMCScoreComputer {
public:
    ClusterScorer(std::string input, double cut) : fInput(std::move(input)), fCut(cut) {}
    MCStatus PrepareOutputRecord(const ValueRecord& input, ValueRecord& output) override {
        fPos = input.IndexOf(fInput);
        output.Clear();
        output.Add("clustering-distance", Value(0.0));
        output.Add("clustering-clusterid", Value(0.0));
        return MCStatus();
    }
    PMMLModelType GetModelType() const override { return kClustering; }
    int GetNTargets() const override { return 0; }
    const MCXML_800::IMCVariable* GetTargetVariable(int) const override { return nullptr; }
    std::string GetAlgorithmName() const override { return "KMEANS"; }
    MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) override {
        output[output.IndexOf("clustering-clusterid")].SetReal(
            input[fPos].GetReal() < fCut ? 1.0 : 2.0);
        return MCStatus();
    }

private:
    std::string fInput;
    double fCut;
    int fPos = -1;
};

//! A transformation that fails (status 99) when the input's thousandths digit pattern says so:
//! about `failShare` of the cases; throws instead after `throwAfter` scores when that is >= 0.
class FailingScorer : public LinearScorer {
public:
    FailingScorer(std::vector<LinearTarget> targets, double failShare, long long throwAfter)
        : LinearScorer(std::move(targets), kTransformsOnly, nullptr), fFailShare(failShare),
          fThrowAfter(throwAfter) {}
    MCStatus ScoreRecord(const ValueRecord& input, ValueRecord& output) override {
        if (fThrowAfter >= 0 && fScores++ >= fThrowAfter) {
            throw std::runtime_error("model failure");
        }
        const double x = input[0].GetReal() * 1000.0;
        if (x - static_cast<double>(static_cast<long long>(x)) < fFailShare) {
            return MCStatus(99, false);
        }
        return LinearScorer::ScoreRecord(input, output);
    }

private:
    double fFailShare;
    long long fThrowAfter;
    long long fScores = 0;
};

//! Hands out computers made by `make`.
template <class Make> class Factory : public MCXML_800::IMCSPScoreFactory {
public:
    explicit Factory(Make make) : fMake(std::move(make)) {}
    std::unique_ptr<IMCScoreComputer> CreateScoreComputer() override { return fMake(); }

private:
    Make fMake;
};
template <class Make> Factory<Make> MakeFactory(Make make) { return Factory<Make>(std::move(make)); }

} // namespace scorers
