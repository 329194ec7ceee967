// The choices `mcsim fit` makes around the component's fitting: which families are candidates
// of which field (--families, --exclude), which candidate the plan takes (--choose,
// --empirical-below) and in which order the report lists them (--rank). The component fits and
// tests the allowed candidates and picks its own best fit; these steps work on a copy of its
// results, so the fitting statistics document keeps what the component wrote.
#pragma once

#include "distribution_fitting/dfcoutputstats.h"
#include "simulation_common/mcspconst.h"

#include <map>
#include <string>
#include <vector>

namespace MCHost {

//! A rule that orders or chooses candidates. kComponent is the component's own (the configured
//! EDF statistic for continuous fields, chi-square for count fields).
enum class FitRule { kComponent, kAD, kKS, kAIC, kBIC };

//! "ad", "ks", "aic" or "bic" (and "" for kComponent); throws UsageError on anything else.
FitRule ParseFitRule(const std::string& text, const std::string& option);
//! "A-D", "K-S", "AIC", "BIC" or "the component's rule".
std::string FitRuleName(FitRule rule);

//! The --families and --exclude entries: per field name the families named, "" for every field.
struct FamilyFilter {
    std::map<std::string, std::vector<MCSPConst::DistType>> fInclude; //!< --families
    std::map<std::string, std::vector<MCSPConst::DistType>> fExclude; //!< --exclude
};

//! Parses entries FIELD=Family,Family or Family,Family (every field); family names are matched
//! without regard to case ("lognormal", "NegBin"). Throws UsageError on an unknown family.
FamilyFilter ParseFamilyFilter(const std::vector<std::string>& families,
                               const std::vector<std::string>& exclude);
//! The field names the filter names (to check against the data).
std::vector<std::string> FilterFieldNames(const FamilyFilter& filter);
//! The candidates of field `field` out of `all`: those its --families entry (or else the one
//! for every field) names, less those any applicable --exclude names.
std::vector<MCSPConst::DistType> FilterCandidates(const FamilyFilter& filter,
                                                  const std::string& field,
                                                  const std::vector<MCSPConst::DistType>& all);

//! How the plan's distribution of one fitted field was chosen.
struct FitDecision {
    std::string fField;                                  //!< the field
    MCSPConst::DistType fType = MCSPConst::kDistUnknown; //!< what the plan takes
    std::string fRule;                                   //!< the rule that chose it
    std::string fWhy;                                    //!< one sentence: why this one
    bool fbEmpirical = false; //!< replaced by the Empirical under --empirical-below
};

//! Applies --choose `choose` and --empirical-below `empiricalBelow` (missing: off) to every
//! covariate of `results` (its best-fit fields are rewritten in place) and returns one decision
//! per covariate. `gfType` is the configured EDF statistic.
std::vector<FitDecision> ApplyFitChoice(MCMCSP_800::DFCOutputStats& results, FitRule choose,
                                        double empiricalBelow, MCSPConst::GoodFitType gfType);

//! Reorders the reported candidates of every covariate by `rank` (kComponent: as the component
//! ordered them); candidates without the rule's number keep their order after the others.
void RankReported(MCMCSP_800::DFCOutputStats& results, FitRule rank);

} // namespace MCHost
