#include "cli/fitoptions.h"

#include "common/hosterror.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <cctype>
#include <set>

namespace MCHost {

using MCCommon_800::MCMV;
using MCMCSP_800::DFCOutputStats;
using namespace MCSPConst;

namespace {

using Element = DFCOutputStats::DFCVarDistElement;
using Info = DFCOutputStats::DFCVarDistInfo;

std::string Lower(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(),
                   [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    return text;
}

//! The parametric family named `name` in any case, by its plan name or its display word.
DistType ParseFamily(const std::string& name, const std::string& option) {
    const std::string wanted = Lower(name);
    for (int t = kDistBinomial; t <= kDistExponential; ++t) {
        const auto type = static_cast<DistType>(t);
        if (type != kDistCategorical &&
            (Lower(MCMCSP_800::DistType2String(type)) == wanted ||
             Lower(MCMCSP_800::GetDistTypeDisplayWord(type)) == wanted)) {
            return type;
        }
    }
    throw UsageError(option + ": unknown family '" + name +
                     "' (Normal, Lognormal, Gamma, Weibull, Beta, Exponential, Uniform, "
                     "Triangular, Binomial, Negbinomial, Poisson)");
}

void ParseEntries(const std::vector<std::string>& entries, const std::string& option,
                  std::map<std::string, std::vector<DistType>>& out) {
    for (const std::string& entry : entries) {
        const std::size_t eq = entry.find('=');
        const std::string field = eq == std::string::npos ? std::string() : entry.substr(0, eq);
        const std::string list = eq == std::string::npos ? entry : entry.substr(eq + 1);
        if (eq == 0 || list.empty()) {
            throw UsageError(option + " " + entry + ": expected FIELD=Family,Family or Family");
        }
        std::vector<DistType>& types = out[field];
        std::size_t start = 0;
        while (start <= list.size()) {
            const std::size_t comma = std::min(list.find(',', start), list.size());
            types.push_back(ParseFamily(list.substr(start, comma - start), option));
            start = comma + 1;
        }
    }
}

//! The number `rule` orders by for element `e` of a field at `level`: the information criteria
//! for every field, the EDF statistics for continuous fields, chi-square for count fields.
double RuleValue(const Element& e, FitRule rule, MeasureLevel level, GoodFitType gfType) {
    if (rule == FitRule::kAIC) {
        return e.fAIC;
    }
    if (rule == FitRule::kBIC) {
        return e.fBIC;
    }
    if (level != kLevelContinuous) {
        return e.fChiSquareFit;
    }
    const bool ks =
        rule == FitRule::kKS || (rule == FitRule::kComponent && gfType == kKolmogorovSmirnov);
    return ks ? e.fKSFit : e.fADFit;
}

//! The p-value that --empirical-below compares: the chi-square p-value of a count field; for a
//! continuous field the configured statistic's, or the upper end of its table interval (missing
//! when the table leaves it unbounded above), `bound` then true.
double PValueToCompare(const Element& e, MeasureLevel level, GoodFitType gfType, bool& bound) {
    bound = false;
    if (level != kLevelContinuous) {
        return e.fChiSquarePValue;
    }
    const bool ks = gfType == kKolmogorovSmirnov;
    const double lower = ks ? e.fKSPValueLower : e.fADPValueLower;
    const double upper = ks ? e.fKSPValueUpper : e.fADPValueUpper;
    if (!MCMV::IsMissing(lower) || !MCMV::IsMissing(upper)) {
        bound = true;
        return upper;
    }
    return ks ? e.fKSPValue : e.fADPValue;
}

void SetBest(Info& info, const Element& e, GoodFitType gfType) {
    info.fDistBestType = e.fDistType;
    info.fDistBestName = e.fDistName;
    info.fDistBestParams = e.fDistParams;
    info.fDistBestParamNames = e.fDistParamNames;
    if (e.fDistType == kDistEmpirical) {
        info.fBestFitStat = MCMV::Missing();
        info.fBestFitPValue = MCMV::Missing();
    } else if (info.fMeasureLevel != kLevelContinuous) {
        info.fBestFitStat = e.fChiSquareFit;
        info.fBestFitPValue = e.fChiSquarePValue;
    } else {
        const bool ks = gfType == kKolmogorovSmirnov;
        info.fBestFitStat = ks ? e.fKSFit : e.fADFit;
        info.fBestFitPValue = ks ? e.fKSPValue : e.fADPValue;
    }
}

const Element* FindReported(const Info& info, DistType type) {
    for (const Element& e : info.fReportedElements) {
        if (e.fDistType == type) {
            return &e;
        }
    }
    return nullptr;
}

//! The element of the best fit of `info`: its candidate element, or the reported Empirical.
const Element* BestElement(const Info& info) {
    const auto k = static_cast<std::size_t>(info.fDistBestType);
    if (k < info.fDistElements.size()) {
        return &info.fDistElements[k];
    }
    return FindReported(info, info.fDistBestType);
}

//! --choose for one field: the allowed candidate with the smallest value of `rule`.
FitDecision ChooseByRule(Info& info, FitRule rule, GoodFitType gfType) {
    FitDecision d;
    d.fField = info.fFittedVarName;
    const bool continuous = info.fMeasureLevel == kLevelContinuous;
    const bool own = rule == FitRule::kComponent ||
                     (!continuous && (rule == FitRule::kAD || rule == FitRule::kKS));
    if (own) {
        d.fRule = continuous
                      ? FitRuleName(gfType == kKolmogorovSmirnov ? FitRule::kKS : FitRule::kAD)
                      : std::string("chi-square");
        d.fRule += rule == FitRule::kComponent ? " (the component's rule)"
                                               : " (count fields are chosen by chi-square)";
        d.fType = info.fDistBestType;
        d.fWhy = info.fDistBestType == kDistEmpirical
                     ? "no parametric candidate passed its test; the field's observed "
                       "distribution is taken"
                     : "smallest statistic among the candidates kept";
        return d;
    }
    d.fRule = FitRuleName(rule);
    const Element* best = nullptr;
    double bestValue = 0.0;
    for (const Element& e : info.fDistElements) {
        const double v = RuleValue(e, rule, info.fMeasureLevel, gfType);
        if (e.fbDistAllowed && !MCMV::IsMissing(v) && (!best || v < bestValue)) {
            best = &e;
            bestValue = v;
        }
    }
    if (!best) {
        d.fType = info.fDistBestType;
        d.fRule += " (no candidate has one: the component's choice stands)";
        d.fWhy = "no candidate kept has a finite " + FitRuleName(rule);
        return d;
    }
    SetBest(info, *best, gfType);
    d.fType = best->fDistType;
    d.fWhy = "smallest " + FitRuleName(rule) + " (" + MCCommon_800::FormatDefault(bestValue) +
             ") among the candidates kept";
    return d;
}

} // namespace

FitRule ParseFitRule(const std::string& text, const std::string& option) {
    const std::string rule = Lower(text);
    if (rule.empty()) {
        return FitRule::kComponent;
    }
    if (rule == "ad") {
        return FitRule::kAD;
    }
    if (rule == "ks") {
        return FitRule::kKS;
    }
    if (rule == "aic") {
        return FitRule::kAIC;
    }
    if (rule == "bic") {
        return FitRule::kBIC;
    }
    throw UsageError(option + " " + text + ": expected ad, ks, aic or bic");
}

std::string FitRuleName(FitRule rule) {
    switch (rule) {
    case FitRule::kAD:
        return "A-D";
    case FitRule::kKS:
        return "K-S";
    case FitRule::kAIC:
        return "AIC";
    case FitRule::kBIC:
        return "BIC";
    default:
        return "the component's rule";
    }
}

FamilyFilter ParseFamilyFilter(const std::vector<std::string>& families,
                               const std::vector<std::string>& exclude) {
    FamilyFilter filter;
    ParseEntries(families, "--families", filter.fInclude);
    ParseEntries(exclude, "--exclude", filter.fExclude);
    return filter;
}

std::vector<std::string> FilterFieldNames(const FamilyFilter& filter) {
    std::set<std::string> names;
    for (const auto* map : {&filter.fInclude, &filter.fExclude}) {
        for (const auto& entry : *map) {
            if (!entry.first.empty()) {
                names.insert(entry.first);
            }
        }
    }
    return std::vector<std::string>(names.begin(), names.end());
}

std::vector<DistType> FilterCandidates(const FamilyFilter& filter, const std::string& field,
                                       const std::vector<DistType>& all) {
    const auto named = [](const std::map<std::string, std::vector<DistType>>& map,
                          const std::string& key) -> const std::vector<DistType>* {
        const auto it = map.find(key);
        return it == map.end() ? nullptr : &it->second;
    };
    const std::vector<DistType>* include = named(filter.fInclude, field);
    if (!include) {
        include = named(filter.fInclude, "");
    }
    std::vector<DistType> out;
    for (DistType type : all) {
        const auto in = [type](const std::vector<DistType>* list) {
            return list && std::find(list->begin(), list->end(), type) != list->end();
        };
        if ((!include || in(include)) && !in(named(filter.fExclude, field)) &&
            !in(named(filter.fExclude, ""))) {
            out.push_back(type);
        }
    }
    return out;
}

std::vector<FitDecision> ApplyFitChoice(DFCOutputStats& results, FitRule choose,
                                        double empiricalBelow, GoodFitType gfType) {
    std::vector<FitDecision> decisions;
    for (Info& info : results.GetCovarDistInfo()) {
        FitDecision d = ChooseByRule(info, choose, gfType);
        const Element* chosen = BestElement(info);
        if (!MCMV::IsMissing(empiricalBelow) && chosen && d.fType != kDistEmpirical) {
            bool bound = false;
            const double p = PValueToCompare(*chosen, info.fMeasureLevel, gfType, bound);
            const Element* empirical = FindReported(info, kDistEmpirical);
            if (!MCMV::IsMissing(p) && p < empiricalBelow) {
                const std::string below = "; its p-value (" + std::string(bound ? "at most " : "") +
                                          MCCommon_800::FormatDefault(p) + ") is below " +
                                          MCCommon_800::FormatDefault(empiricalBelow);
                if (empirical) {
                    SetBest(info, *empirical, gfType);
                    d.fType = kDistEmpirical;
                    d.fbEmpirical = true;
                    d.fWhy += below + ", so the plan takes the field's observed distribution";
                } else {
                    d.fWhy += below + ", but the field has no observed distribution to take";
                }
            }
        }
        decisions.push_back(std::move(d));
    }
    return decisions;
}

void RankReported(DFCOutputStats& results, FitRule rank) {
    if (rank == FitRule::kComponent) {
        return;
    }
    for (Info& info : results.GetCovarDistInfo()) {
        const GoodFitType gfType = results.GetGFType();
        std::stable_sort(info.fReportedElements.begin(), info.fReportedElements.end(),
                         [&](const Element& a, const Element& b) {
                             const double va = RuleValue(a, rank, info.fMeasureLevel, gfType);
                             const double vb = RuleValue(b, rank, info.fMeasureLevel, gfType);
                             if (MCMV::IsMissing(va) || MCMV::IsMissing(vb)) {
                                 return !MCMV::IsMissing(va) && MCMV::IsMissing(vb);
                             }
                             return va < vb;
                         });
    }
}

} // namespace MCHost
