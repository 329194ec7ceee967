// Fuzz target: the formula model reader on arbitrary model text, and scoring with what it
// reads.
//
// A text that is not a model must end in a HostError with a message. A model that reads is
// scored the way the simulation scores it: a computer from the factory lays out the output
// record for a case holding every input the model names, then scores a handful of cases whose
// values run from ordinary numbers through zero, the missing value and the ends of the double
// range to texts. Scoring may fail a case with a status, but then the message must be there;
// a case it scores must give each continuous target a finite value or the missing value, and
// each categorical target one of its label indices or the missing value.
#include "common/hosterror.h"
#include "mccommon/mcmv.h"
#include "models/formulamodel.h"

#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

namespace {

using MCCommon_800::MCMV;
using MCHost::FormulaModel;
using MCHost::FormulaTarget;
using MCXML_800::Value;
using MCXML_800::ValueRecord;

[[noreturn]] void Broken(const char* what) {
    std::fprintf(stderr, "model_fuzz: %s\n", what);
    std::abort();
}

//! The value input `name` takes in case `k`: numbers for most cases, a text for the last.
Value CaseValue(const FormulaModel& model, const std::string& name, int k) {
    static const double kNumbers[] = {1.5, 0.0, -2.0, 1e308, -1e308, 4.9e-324, 7.0};
    for (const MCHost::FormulaInputLevels& levels : model.GetInputLevels()) {
        if (levels.fName == name) {
            // A text input: each of its texts in turn, then one it does not list.
            const std::size_t n = levels.fvLabels.size();
            const auto i = static_cast<std::size_t>(k);
            return i < n ? Value(levels.fvLabels[i]) : Value("not listed");
        }
    }
    constexpr int kNNumbers = static_cast<int>(sizeof kNumbers / sizeof kNumbers[0]);
    if (k < kNNumbers) {
        return Value(kNumbers[k]);
    }
    return k == kNNumbers ? Value(MCMV::Missing()) : Value("text");
}

void CheckOutput(const std::vector<FormulaTarget>& targets, const ValueRecord& output) {
    if (output.Size() != static_cast<int>(targets.size())) {
        Broken("the output record does not hold one value per target");
    }
    for (std::size_t t = 0; t < targets.size(); ++t) {
        const Value& v = output[static_cast<int>(t)];
        if (v.GetType() != Value::kReal) {
            Broken("a target's value is not a number");
        }
        const double x = v.GetReal();
        if (MCMV::IsMissing(x)) {
            continue;
        }
        if (!std::isfinite(x)) {
            Broken("a target's value is neither finite nor the missing value");
        }
        if (targets[t].fbCategorical && (x < 0.0 || x != std::floor(x) ||
                                         x >= static_cast<double>(targets[t].fvLabels.size()))) {
            Broken("a categorical target's value is not one of its label indices");
        }
    }
}

void Score(const FormulaModel& model) {
    MCHost::FormulaScoreFactory factory(model);
    const std::unique_ptr<MCXML_800::IMCScoreComputer> created = factory.CreateScoreComputer();
    auto* computer = dynamic_cast<MCHost::FormulaScoreComputer*>(created.get());
    if (computer == nullptr) {
        Broken("the factory made no formula score computer");
    }
    const std::vector<FormulaTarget>& targets = model.GetTargets();
    if (computer->GetNTargets() != static_cast<int>(targets.size())) {
        Broken("the computer and the model differ in their number of targets");
    }
    const std::vector<std::string> names = model.GetInputNames();
    ValueRecord input;
    for (const std::string& n : names) {
        input.Add(n, Value(0.0));
    }
    ValueRecord output;
    if (!computer->PrepareOutputRecord(input, output).IsOK()) {
        if (factory.GetFirstError().empty()) {
            Broken("preparing failed without a message");
        }
        return;
    }
    CheckOutput(targets, output);
    for (int k = 0; k < 10; ++k) {
        for (int i = 0; i < input.Size(); ++i) {
            input[i] = CaseValue(model, names[static_cast<std::size_t>(i)], k);
        }
        const bool scored = computer->ScoreRecord(input, output).IsOK();
        if (!scored && computer->GetLastError().empty()) {
            Broken("a case failed without a message");
        }
        // A failed case leaves its remaining targets missing: the record still holds numbers.
        CheckOutput(targets, output);
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    std::istringstream in(std::string(reinterpret_cast<const char*>(data), size));
    try {
        const FormulaModel model = FormulaModel::Parse(in, "fuzz.model");
        if (model.GetTargets().empty()) {
            Broken("a model without targets was read");
        }
        static_cast<void>(model.CheckInputs(model.GetInputNames()));
        Score(model);
    } catch (const MCHost::HostError&) {
        // Not a model, with a message naming the line.
    }
    return 0;
}
