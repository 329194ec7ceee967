// The vocabulary every part of the component speaks: distribution types, measurement levels and
// the small option sets of the plan and run settings (namespace MCSPConst), and the free
// functions that translate between those values, the names written in plan and fitting
// documents, and the parameter lists of each distribution.
//
// The numeric values are stored in settings, compared in code and written in diagnostics, so
// they never change. Every enumeration has a fixed 32-bit underlying type: a value outside the
// named ones (an unknown distribution read from a document, say) is still a valid value of the
// type, and every conversion below maps it to its "unknown" form.
#pragma once

#include "mccommon/variables.h"

#include <cstdint>
#include <string>
#include <vector>

namespace MCSPConst {

//! A distribution family. 15 stands for none or an unrecognised one.
enum DistType : std::int32_t {
    kDistBinomial = 0,
    kDistNegbinomial = 1,
    kDistCategorical = 2,
    kDistLognormal = 3,
    kDistNormal = 4,
    kDistPoisson = 5,
    kDistTriangular = 6,
    kDistUniform = 7,
    kDistWeibull = 8,
    kDistGamma = 9,
    kDistBeta = 10,
    kDistExponential = 11,
    kDistBernoulli = 12,
    kDistEmpirical = 13,
    kDistUserRanges = 14,
    kDistUnknown = 15
};

//! Number of DistType values 0 to 15, the size of tables indexed by DistType.
inline constexpr int kNDistTypes = 16;

//! Measurement level of a field. Also the category of a distribution type (continuous,
//! categorical, ordinal/discrete, or none).
enum MeasureLevel : std::int32_t {
    kLevelUnknown = 0,
    kLevelContinuous = 1,
    kLevelCategorical = 2,
    kLevelOrdinal = 3
};

//! Goodness-of-fit test for continuous fields.
enum GoodFitType : std::int32_t { kAndersonDarling = 0, kKolmogorovSmirnov = 1 };

//! Unit of the threshold of a stop criterion on the mean.
enum UnitType : std::int32_t { kUnitValue = 0, kUnitPercent = 1 };

//! Side of a stop criterion on a tail.
enum SideType : std::int32_t { kSideLeft = 0, kSideRight = 1 };

//! What the threshold of a stop criterion on a tail is.
enum TailType : std::int32_t { kTailValue = 0, kTailPercentile = 1 };

//! Which distribution charts of the targets to produce.
enum DistDisplay : std::int32_t {
    kDisplayNone = 0,
    kDisplayCDF = 1,
    kDisplayPDF = 2,
    kDisplayCDFAndPDF = 3
};

//! Order of CDF charts; single bits of a bit set.
enum DistOrder : std::int32_t { kOrderAscending = 1, kOrderDescending = 2 };

//! View of continuous PDF charts; single bits of a bit set.
enum DistView : std::int32_t { kViewCurve = 1, kViewHistogram = 2 };

//! Grouping of categorical charts; single bits of a bit set.
enum DistGroup : std::int32_t { kGroupCats = 1, kGroupIters = 2 };

//! Grouping of box-plot overlays; single bits of a bit set.
enum BoxplotGroup : std::int32_t { kBoxplotTargets = 1, kBoxplotIters = 2 };

//! Correlation measure used for ordinal inputs in the sensitivity measures.
enum OrdinalCorrelations : std::int32_t { kCorrPearson = 0, kCorrRank = 1, kCorrPolyserial = 2 };

//! The statistic of a point-value stop criterion: the mean is the only one.
inline constexpr std::int32_t kStatisticMean = 0;

} // namespace MCSPConst

namespace MCMCSP_800 {

// Distribution names, element names and parameter lists. The distribution names ("Normal")
// and the element names ("DistNormal") are the words of the plan and fitting documents.

//! The distribution name of `t`; "Unknown" outside 0 to 14.
const std::string& DistType2String(MCSPConst::DistType t);
//! The element name of `t`; "Unknown" outside 0 to 14.
const std::string& DistType2EleString(MCSPConst::DistType t);
//! The type whose distribution name or element name equals `name` exactly (case-sensitive);
//! 15 for anything else.
MCSPConst::DistType String2DistType(const std::string& name);
//! Appends the distribution name of each type, in order; `names` is not cleared.
void MapDistType2DistName(const std::vector<MCSPConst::DistType>& types,
                          std::vector<std::string>& names);
//! Appends the type of each name, in order (15 for unknown names); `types` is not cleared.
void MapDistName2DistType(const std::vector<std::string>& names,
                          std::vector<MCSPConst::DistType>& types);
//! Replaces `names` by the parameter names of `t` in order; empty outside 0 to 14.
void GetDistributionParameterNames(MCSPConst::DistType t, std::vector<std::string>& names);

// Host variables.

//! The level the component gives a host variable: scale kinds are continuous, categorical
//! kinds are ordinal when the variable is an MCCatVar with its ordinal flag set and categorical
//! otherwise; a null variable or any other kind is unknown.
MCSPConst::MeasureLevel GetMCSPMeasureLevel(const MCXML_800::IMCVariable* variable);
//! Replaces `indices` by MCVarList::FindVariable of each name (not-found values included);
//! leaves `indices` untouched when `variables` is null.
void GetMCVarIndices(const MCXML_800::MCVarList* variables, const std::vector<std::string>& names,
                     std::vector<int>& indices);

//! True when `modelType` is one of the 17 model kinds the simulation can score (exact,
//! case-sensitive comparison).
bool IsSupportModelType(const std::string& modelType);

// Display words of the diagnostic prints; "unrecognized" for values outside each table.

const std::string& GetDistTypeDisplayWord(MCSPConst::DistType t);
const std::string& GetMeasureLevelDisplayWord(MCSPConst::MeasureLevel level);
const std::string& GetGoodFitTypeDisplayWord(MCSPConst::GoodFitType type);
const std::string& GetUnitTypeDisplayWord(MCSPConst::UnitType unit);
const std::string& GetSideTypeDisplayWord(MCSPConst::SideType side);
const std::string& GetTailTypeDisplayWord(MCSPConst::TailType type);
const std::string& GetDistDisplayDisplayWord(MCSPConst::DistDisplay display);
//! The word of a single bit (1 or 2) of each bit-set enumeration.
const std::string& GetDistOrderDisplayWord(MCSPConst::DistOrder order);
const std::string& GetDistViewDisplayWord(MCSPConst::DistView view);
const std::string& GetDistGroupDisplayWord(MCSPConst::DistGroup group);
const std::string& GetBoxplotGroupDisplayWord(MCSPConst::BoxplotGroup group);
const std::string& GetOrdinalCorrelationsDisplayWord(MCSPConst::OrdinalCorrelations type);
//! "Mean" for the statistic code 0 of a point-value stop criterion.
const std::string& GetStatisticDisplayWord(std::int32_t statistic);
//! The word of the host's scoring-model kind (IMCScoreComputer::PMMLModelType, 0 to 17).
const std::string& GetPMMLModelTypeDisplayWord(int modelType);

} // namespace MCMCSP_800
