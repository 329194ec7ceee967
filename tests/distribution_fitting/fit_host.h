// The host side of a fitting run, shared by the fitting tests: records in memory, variables and
// settings that live as long as the algorithm, and a cancel query raised on demand.
#pragma once

#include "distribution_fitting/dfcalgorithm.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace dfctest {

using Rows = std::vector<std::vector<double>>;

inline std::vector<MCXML_800::Record> ToRecords(const Rows& rows) {
    return std::vector<MCXML_800::Record>(rows.begin(), rows.end());
}

//! Scale variables v0, v1, ..., one per value of a row.
inline MCXML_800::MCVarList ScaleVariables(std::size_t n) {
    MCXML_800::MCVarList vars;
    for (std::size_t v = 0; v < n; ++v) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>("v" + std::to_string(v)));
    }
    return vars;
}

//! One fitting run over `rows`; without variables, every value is a scale variable.
class FitRun {
public:
    FitRun(const Rows& rows, MCMCSP_800::DFCSettings settings, MCXML_800::MCVarList vars)
        : fVars(std::move(vars)), fSettings(std::move(settings)), fData(ToRecords(rows)),
          fAlgorithm(fSettings, fVars) {}
    FitRun(const Rows& rows, MCMCSP_800::DFCSettings settings)
        : FitRun(rows, std::move(settings), ScaleVariables(rows.at(0).size())) {}

    MCCommon_800::MCStatus Build() { return fAlgorithm.BuildModel(fData, nullptr); }
    MCMCSP_800::DFCAlgorithm& Algo() { return fAlgorithm; }
    MCCommon_800::MCMemoryRecordIter& Data() { return fData; }
    const MCMCSP_800::DFCOutputStats& Results() {
        MCMCSP_800::DFCOutputStats* out = nullptr;
        EXPECT_FALSE(fAlgorithm.GetOutputStats(out).IsError());
        EXPECT_NE(out, nullptr);
        return *out;
    }
    const MCMCSP_800::DFCOutputStats::DFCVarDistInfo& Covariate(int i) {
        return fAlgorithm.GetOutCovarVarInfo(i);
    }
    const std::vector<double>& Params(int covariate, MCSPConst::DistType type) {
        return fAlgorithm.GetOutCovarDistInfo(covariate, type).fDistParams;
    }
    int CountWarnings(long code) const {
        const auto& w = fAlgorithm.GetWarnings();
        return static_cast<int>(std::count_if(
            w.begin(), w.end(), [code](const auto& s) { return s.GetErrorCode() == code; }));
    }

private:
    MCXML_800::MCVarList fVars;
    MCMCSP_800::DFCSettings fSettings;
    MCCommon_800::MCMemoryRecordIter fData;
    MCMCSP_800::DFCAlgorithm fAlgorithm;
};

//! A host cancel query that answers yes once raised (from any thread).
struct FlagCancel : MCCommon_800::MCQueryCancel {
    bool IsCancelled() const override { return fbRaised.load(); }
    std::atomic<bool> fbRaised{false};
};

//! Test names from the parameter rows' fName.
struct ByName {
    template <class T> std::string operator()(const ::testing::TestParamInfo<T>& row) const {
        return row.param.fName;
    }
};

} // namespace dfctest
