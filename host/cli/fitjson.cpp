#include "cli/fitjson.h"

#include "cli/statustext.h"
#include "mccommon/mcmv.h"

#include <algorithm>
#include <cmath>
#include <map>

namespace MCHost {

using Json = nlohmann::ordered_json;
using MCCommon_800::MCMV;
using MCMCSP_800::DFCOutputStats;
using namespace MCSPConst;

namespace {

using Element = DFCOutputStats::DFCVarDistElement;
using Info = DFCOutputStats::DFCVarDistInfo;

//! A number, or null for the missing value (and anything not finite, which JSON cannot carry).
Json Number(double x) {
    if (MCMV::IsMissing(x) || !std::isfinite(x)) {
        return Json(nullptr);
    }
    return Json(x);
}

Json Numbers(const std::vector<double>& values) {
    Json list = Json::array();
    for (double x : values) {
        list.push_back(Number(x));
    }
    return list;
}

Json Text(const std::string& text) {
    return text.empty() ? Json(nullptr) : Json(text);
}

double At(const std::vector<double>& v, std::size_t i) {
    return i < v.size() ? v[i] : MCMV::Missing();
}

//! The parameters by name; values beyond the names belong to the last one as a list (the
//! proportions of an Empirical). Each scalar carries its standard error and bootstrap interval.
Json Parameters(const Element& e, const FitBootstrap* boot) {
    const std::vector<std::string> names = ReportParamNames(e.fDistType, e.fDistParamNames);
    Json list = Json::array();
    const std::vector<double>& values = e.fDistParams;
    for (std::size_t i = 0; i < names.size(); ++i) {
        Json p;
        p["name"] = names[i];
        const bool tail = i + 1 == names.size() && values.size() > names.size();
        if (tail) {
            p["value"] =
                Numbers(std::vector<double>(values.begin() + static_cast<long>(i), values.end()));
            list.push_back(std::move(p));
            break;
        }
        p["value"] = Number(At(values, i));
        p["std_error"] = Number(At(e.fvStdErrors, i));
        if (boot) {
            p["bootstrap_lower"] = Number(At(boot->fvLower, i));
            p["bootstrap_upper"] = Number(At(boot->fvUpper, i));
        }
        list.push_back(std::move(p));
    }
    return list;
}

Json Correlations(const Element& e) {
    const std::size_t k = e.fDistParams.size();
    if (e.fvParamCorrelations.size() != k * k || k == 0) {
        return Json(nullptr);
    }
    Json rows = Json::array();
    for (std::size_t i = 0; i < k; ++i) {
        rows.push_back(Numbers(
            std::vector<double>(e.fvParamCorrelations.begin() + static_cast<long>(i * k),
                                e.fvParamCorrelations.begin() + static_cast<long>((i + 1) * k))));
    }
    return rows;
}

Json Edf(double stat, double modified, double p, double lower, double upper, double bootP) {
    if (MCMV::IsMissing(stat)) {
        return Json(nullptr);
    }
    return Json{{"value", Number(stat)},    {"modified", Number(modified)},
                {"p_value", Number(p)},     {"p_lower", Number(lower)},
                {"p_upper", Number(upper)}, {"bootstrap_p_value", Number(bootP)}};
}

Json Statistics(const Element& e, const FitBootstrap* boot, GoodFitType gfType) {
    const double bootP = boot ? boot->fPValue : MCMV::Missing();
    const bool ks = gfType == kKolmogorovSmirnov;
    Json stats;
    stats["anderson_darling"] = Edf(e.fADFit, e.fADZStar, e.fADPValue, e.fADPValueLower,
                                    e.fADPValueUpper, ks ? MCMV::Missing() : bootP);
    stats["kolmogorov_smirnov"] = Edf(e.fKSFit, e.fKSDStat, e.fKSPValue, e.fKSPValueLower,
                                      e.fKSPValueUpper, ks ? bootP : MCMV::Missing());
    if (MCMV::IsMissing(e.fChiSquareFit)) {
        stats["chi_square"] = nullptr;
    } else {
        stats["chi_square"] = Json{{"value", Number(e.fChiSquareFit)},
                                   {"p_value", Number(e.fChiSquarePValue)},
                                   {"pooled", Json{{"value", Number(e.fChiSquarePooled)},
                                                   {"df", Number(e.fChiSquarePooledDF)},
                                                   {"p_value", Number(e.fChiSquarePooledPValue)}}}};
    }
    return stats;
}

Json Plots(const Element& e) {
    if (e.fvPlotSampleQuantiles.empty()) {
        return Json(nullptr);
    }
    return Json{{"qq", Json{{"sample", Numbers(e.fvPlotSampleQuantiles)},
                            {"fitted", Numbers(e.fvPlotFittedQuantiles)}}},
                {"pp", Json{{"sample", Numbers(e.fvPlotSampleProbs)},
                            {"fitted", Numbers(e.fvPlotFittedProbs)}}}};
}

Json Candidate(const Element& e, int rank, const FitBootstrap* boot, GoodFitType gfType) {
    Json c;
    c["family"] = e.fDistName;
    c["rank"] = rank > 0 ? Json(rank) : Json(nullptr);
    const std::string reason = MCMCSP_800::DFCDropReasonText(e.fDropReason);
    c["dropped"] = !e.fbDistAllowed;
    c["dropped_reason"] = e.fbDistAllowed ? Json(nullptr) : Text(reason);
    c["parameters"] = Parameters(e, boot);
    c["std_error_reason"] = Text(e.fStdErrorReason);
    c["parameter_correlations"] = Correlations(e);
    c["statistics"] = Statistics(e, boot, gfType);
    c["log_likelihood"] = Number(e.fLogLikelihood);
    c["estimated_parameters"] =
        e.fDistType == kDistEmpirical ? Json(nullptr) : Json(e.fNEstimatedParams);
    c["aic"] = Number(e.fAIC);
    c["bic"] = Number(e.fBIC);
    c["aicc"] = Number(e.fAICc);
    c["log_likelihood_reason"] = Text(e.fLogLikReason);
    c["bootstrap_replicates"] = boot ? Json(boot->fReplicates) : Json(nullptr);
    c["plots"] = Plots(e);
    return c;
}

const FitBootstrap* FindBootstrap(const FitJsonRun& run, const std::string& field, DistType type) {
    for (const FitBootstrap& b : run.fvBootstraps) {
        if (b.fField == field && b.fType == type) {
            return &b;
        }
    }
    return nullptr;
}

//! The field's candidates: the reported ones in report order with their rank, then the other
//! allowed ones, then the dropped ones; families the settings never allowed are left out.
Json Candidates(const Info& info, const FitJsonRun& run, GoodFitType gfType,
                const std::vector<DistType>& allowed) {
    Json list = Json::array();
    std::vector<bool> listed(info.fDistElements.size(), false);
    int rank = 0;
    for (const Element& e : info.fReportedElements) {
        const auto k = static_cast<std::size_t>(e.fDistType);
        if (k < listed.size()) {
            listed[k] = true;
        }
        // The component's reported copies are taken before the last results are filled in;
        // the candidate's own element is the whole one.
        const Element& whole = k < info.fDistElements.size() ? info.fDistElements[k] : e;
        list.push_back(
            Candidate(whole, ++rank, FindBootstrap(run, info.fFittedVarName, e.fDistType), gfType));
    }
    for (bool dropped : {false, true}) {
        for (const Element& e : info.fDistElements) {
            const bool isAllowed =
                std::find(allowed.begin(), allowed.end(), e.fDistType) != allowed.end();
            if (!isAllowed || listed[static_cast<std::size_t>(e.fDistType)] ||
                e.fbDistAllowed == dropped) {
                continue;
            }
            list.push_back(
                Candidate(e, 0, FindBootstrap(run, info.fFittedVarName, e.fDistType), gfType));
        }
    }
    return list;
}

Json Field(const Info& info, const FitJsonRun& run, GoodFitType gfType,
           const std::vector<DistType>& allowed, const FitDecision* decision) {
    Json f;
    f["name"] = info.fFittedVarName;
    f["level"] = info.fMeasureLevel == kLevelContinuous
                     ? "continuous"
                     : (info.fMeasureLevel == kLevelOrdinal ? "ordinal" : "categorical");
    Json best;
    if (info.fDistBestType == kDistUnknown) {
        best = nullptr;
    } else {
        best["family"] = info.fDistBestName;
        Element shown(info.fDistBestType, true);
        shown.fDistParams = info.fDistBestParams;
        shown.fDistParamNames = info.fDistBestParamNames;
        const auto k = static_cast<std::size_t>(info.fDistBestType);
        if (k < info.fDistElements.size()) {
            shown.fvStdErrors = info.fDistElements[k].fvStdErrors;
        }
        if (info.fDistBestType == kDistCategorical) {
            best["categories"] = info.fDistBestParamNames;
            best["probabilities"] = Numbers(info.fDistBestParams);
        } else {
            best["parameters"] = Parameters(shown, nullptr);
        }
        best["statistic"] = Number(info.fBestFitStat);
        best["p_value"] = Number(info.fBestFitPValue);
        best["rule"] = decision ? Json(decision->fRule) : Json("the component's rule");
        best["why"] = decision ? Json(decision->fWhy) : Json(nullptr);
        best["empirical_fallback"] = decision && decision->fbEmpirical;
    }
    f["best"] = std::move(best);
    if (info.fMeasureLevel != kLevelCategorical) {
        f["candidates"] = Candidates(info, run, gfType, allowed);
    }
    return f;
}

} // namespace

std::vector<std::string> ReportParamNames(DistType type, std::vector<std::string> names) {
    if (type == kDistGamma && names.size() == 2) {
        names[1] = "rate";
    } else if (type == kDistExponential && names.size() == 1) {
        names[0] = "rate";
    }
    return names;
}

Json FitResultsToJson(const FitJsonRun& run, const DFCOutputStats& results,
                      const std::vector<MCCommon_800::MCStatus>& warnings) {
    const GoodFitType gfType = results.GetGFType();
    Json doc;
    doc["format"] = "mcsim fit results";
    doc["version"] = kFitResultsFormatVersion;
    doc["data"] = run.fDataPath;
    doc["rows_read"] = run.fRowsRead;
    doc["rows_used"] = run.fRowsUsed;
    doc["weight_field"] = Text(run.fWeightField);
    doc["total_weight"] = Number(run.fTotalWeight);
    const auto ruleKey = [](FitRule r) {
        return r == FitRule::kComponent ? Json(nullptr) : Json(FitRuleName(r));
    };
    doc["settings"] = Json{
        {"test", run.fTest},
        {"choose", ruleKey(run.fChoose)},
        {"rank", ruleKey(run.fRank)},
        {"empirical_below", Number(run.fEmpiricalBelow)},
        {"bootstrap", run.fBootstrapReplicates},
        {"seed", run.fBootstrapReplicates > 0 && run.fSeed >= 0 ? Json(run.fSeed) : Json(nullptr)}};
    std::vector<double> positions;
    for (int i = 1; i <= 99; ++i) {
        positions.push_back(i / 100.0);
    }
    doc["plot_positions"] = positions;
    Json fields = Json::array();
    const auto& covariates = results.GetCovarDistInfo();
    const auto& covInfo = results.GetSettings().GetCovariateInfoElems();
    for (std::size_t i = 0; i < covariates.size(); ++i) {
        std::vector<DistType> allowed;
        for (int t = kDistBinomial; t <= kDistExponential; ++t) {
            if (i < covInfo.size() && covInfo[i].IsDistAllowed(static_cast<DistType>(t))) {
                allowed.push_back(static_cast<DistType>(t));
            }
        }
        const FitDecision* d = i < run.fvDecisions.size() ? &run.fvDecisions[i] : nullptr;
        fields.push_back(Field(covariates[i], run, gfType, allowed, d));
    }
    for (const Info& info : results.GetFactorDistInfo()) {
        fields.push_back(Field(info, run, gfType, {}, nullptr));
    }
    doc["fields"] = std::move(fields);
    Json corr = Json::array();
    const auto& matrix = results.GetCorrMatrix();
    const int n = std::min(static_cast<int>(covariates.size()), matrix.GetNRows());
    for (int r = 0; r < n; ++r) {
        Json row = Json::array();
        for (int c = 0; c < n; ++c) {
            row.push_back(Number(matrix.GetElem(r, c)));
        }
        corr.push_back(std::move(row));
    }
    doc["correlations"] = std::move(corr);
    std::map<std::pair<long, bool>, int> counts;
    for (const MCCommon_800::MCStatus& s : warnings) {
        if (!s.IsOK()) {
            ++counts[{s.GetErrorCode(), s.IsWarning()}];
        }
    }
    Json list = Json::array();
    for (const auto& [key, count] : counts) {
        list.push_back(Json{{"code", key.first},
                            {"kind", key.second ? "warning" : "error"},
                            {"text", StatusText(MCCommon_800::MCStatus(key.first, key.second))},
                            {"count", count}});
    }
    doc["warnings"] = std::move(list);
    return doc;
}

} // namespace MCHost
