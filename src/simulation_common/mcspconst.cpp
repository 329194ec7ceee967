#include "simulation_common/mcspconst.h"

#include <algorithm>
#include <array>
#include <cstddef>

namespace MCMCSP_800 {

using namespace MCSPConst;

namespace {

//! One row of the distribution vocabulary.
struct DistEntry {
    const char* fName;                    //!< distribution name
    const char* fElementName;             //!< element name in the plan document
    const char* fDisplayWord;             //!< word of the diagnostic prints
    std::vector<const char*> fParameters; //!< parameter names in order
};

//! Rows 0 to 14 by DistType value.
const std::array<DistEntry, 15>& DistTable() {
    static const std::array<DistEntry, 15> kTable = {{
        {"Binomial", "DistBinomial", "Binomial", {"n", "prob"}},
        {"Negbinomial", "DistNegbinomial", "NegBin", {"thresh", "prob", "type"}},
        {"Categorical", "DistCategorical", "Categorical", {"cats", "probs"}},
        {"Lognormal", "DistLognormal", "LogNormal", {"a", "b"}},
        {"Normal", "DistNormal", "Normal", {"mean", "stddev"}},
        {"Poisson", "DistPoisson", "Poisson", {"mean"}},
        {"Triangular", "DistTriangular", "Triangular", {"min", "max", "mode"}},
        {"Uniform", "DistUniform", "Uniform", {"min", "max"}},
        {"Weibull", "DistWeibull", "Weibull", {"a", "b", "c"}},
        {"Gamma", "DistGamma", "Gamma", {"shape", "scale"}},
        {"Beta", "DistBeta", "Beta", {"shape1", "shape2"}},
        {"Exponential", "DistExponential", "Exponential", {"scale"}},
        {"Bernoulli", "DistBernoulli", "Bernoulli", {"prob"}},
        {"Empirical", "DistEmpirical", "Empirical", {"min", "max", "stddev", "probs"}},
        {"UserRanges", "DistUserRanges", "UserRanges", {"min", "max", "probs"}},
    }};
    return kTable;
}

bool IsKnownDist(DistType t) {
    return t >= kDistBinomial && t <= kDistUserRanges;
}

//! The strings of one column of the table, built once so that callers get stable references.
template <std::size_t N> struct WordColumn {
    std::array<std::string, N> fWords; //!< word by value
    std::string fOther;                //!< word for values outside the table
    const std::string& Get(long long value) const {
        return value >= 0 && value < static_cast<long long>(N)
                   ? fWords[static_cast<std::size_t>(value)]
                   : fOther;
    }
};

template <std::size_t N>
WordColumn<N> MakeColumn(const char* DistEntry::*member, const char* other) {
    WordColumn<N> column;
    for (std::size_t i = 0; i < N; ++i) {
        column.fWords[i] = DistTable()[i].*member;
    }
    column.fOther = other;
    return column;
}

const WordColumn<15>& DistNames() {
    static const WordColumn<15> kColumn = MakeColumn<15>(&DistEntry::fName, "Unknown");
    return kColumn;
}

const WordColumn<15>& DistElementNames() {
    static const WordColumn<15> kColumn = MakeColumn<15>(&DistEntry::fElementName, "Unknown");
    return kColumn;
}

const WordColumn<15>& DistDisplayWords() {
    static const WordColumn<15> kColumn = MakeColumn<15>(&DistEntry::fDisplayWord, "unrecognized");
    return kColumn;
}

const char* const kUnrecognized = "unrecognized";

//! A column of display words for an enumeration whose values start at `first`.
template <std::size_t N> class DisplayWords {
public:
    DisplayWords(long long first, std::array<const char*, N> words) : fFirst(first) {
        for (std::size_t i = 0; i < N; ++i) {
            fColumn.fWords[i] = words[i];
        }
        fColumn.fOther = kUnrecognized;
    }
    const std::string& Get(long long value) const { return fColumn.Get(value - fFirst); }

private:
    long long fFirst;      //!< value of the first word
    WordColumn<N> fColumn; //!< the words
};

} // namespace

const std::string& DistType2String(DistType t) {
    return DistNames().Get(t);
}

const std::string& DistType2EleString(DistType t) {
    return DistElementNames().Get(t);
}

DistType String2DistType(const std::string& name) {
    for (int t = kDistBinomial; t <= kDistUserRanges; ++t) {
        if (name == DistNames().Get(t) || name == DistElementNames().Get(t)) {
            return static_cast<DistType>(t);
        }
    }
    return kDistUnknown;
}

void MapDistType2DistName(const std::vector<DistType>& types, std::vector<std::string>& names) {
    for (const DistType t : types) {
        names.push_back(DistType2String(t));
    }
}

void MapDistName2DistType(const std::vector<std::string>& names, std::vector<DistType>& types) {
    for (const std::string& name : names) {
        types.push_back(String2DistType(name));
    }
}

void GetDistributionParameterNames(DistType t, std::vector<std::string>& names) {
    names.clear();
    if (!IsKnownDist(t)) {
        return;
    }
    for (const char* name : DistTable()[static_cast<std::size_t>(t)].fParameters) {
        names.emplace_back(name);
    }
}

MeasureLevel GetMCSPMeasureLevel(const MCXML_800::IMCVariable* variable) {
    using MCXML_800::IMCVariable;
    if (!variable) {
        return kLevelUnknown;
    }
    switch (variable->GetMeasure()) {
    case IMCVariable::kScaleKind:
    case IMCVariable::kContinuousKind:
        return kLevelContinuous;
    case IMCVariable::kNominalKind:
    case IMCVariable::kOrderedKind: {
        const auto* catVar = dynamic_cast<const MCXML_800::MCCatVar*>(variable);
        return catVar && catVar->GetOrdinalFlag() ? kLevelOrdinal : kLevelCategorical;
    }
    default:
        return kLevelUnknown;
    }
}

void GetMCVarIndices(const MCXML_800::MCVarList* variables, const std::vector<std::string>& names,
                     std::vector<int>& indices) {
    if (!variables) {
        return;
    }
    indices.clear();
    for (const std::string& name : names) {
        indices.push_back(variables->FindVariable(name));
    }
}

bool IsSupportModelType(const std::string& modelType) {
    // clang-format off
    static const std::vector<std::string> kModelTypes{
        "LR", "GLR", "GZLR", "BLR", "MLR", "OR", "COXREG", "TREE_PMML", "TREE_BOOSTED", "DA",
        "CLUSTER_TWOSTEP", "CLUSTER_KMEANS", "NNETWORK_MLP", "NNETWORK_RBF", "NNETWORK_SOM",
        "RULESET_DL", "Transformation"};
    // clang-format on
    return std::find(kModelTypes.begin(), kModelTypes.end(), modelType) != kModelTypes.end();
}

const std::string& GetDistTypeDisplayWord(DistType t) {
    // Value 15 has its own word in the table, the same as any other unknown value.
    return DistDisplayWords().Get(t);
}

const std::string& GetMeasureLevelDisplayWord(MeasureLevel level) {
    static const DisplayWords<4> kWords(0, {"Unknown", "Continuous", "Categorical", "Ordinal"});
    return kWords.Get(level);
}

const std::string& GetGoodFitTypeDisplayWord(GoodFitType type) {
    static const DisplayWords<2> kWords(0, {"AnderDarling", "KolmogSmirn"});
    return kWords.Get(type);
}

const std::string& GetUnitTypeDisplayWord(UnitType unit) {
    static const DisplayWords<2> kWords(0, {"Value", "Percent"});
    return kWords.Get(unit);
}

const std::string& GetSideTypeDisplayWord(SideType side) {
    static const DisplayWords<2> kWords(0, {"Left", "Right"});
    return kWords.Get(side);
}

const std::string& GetTailTypeDisplayWord(TailType type) {
    static const DisplayWords<2> kWords(0, {"Value", "Percentile"});
    return kWords.Get(type);
}

const std::string& GetDistDisplayDisplayWord(DistDisplay display) {
    static const DisplayWords<4> kWords(0, {"None", "CDF(Cumulative Distribution Functions)",
                                            "PDF(Probability Density Functions)", "CDF and PDF"});
    return kWords.Get(display);
}

const std::string& GetDistOrderDisplayWord(DistOrder order) {
    static const DisplayWords<2> kWords(1, {"Ascending", "Descending"});
    return kWords.Get(order);
}

const std::string& GetDistViewDisplayWord(DistView view) {
    static const DisplayWords<2> kWords(1, {"Curve", "Histogram"});
    return kWords.Get(view);
}

const std::string& GetDistGroupDisplayWord(DistGroup group) {
    static const DisplayWords<2> kWords(1, {"Cats", "Iters"});
    return kWords.Get(group);
}

const std::string& GetBoxplotGroupDisplayWord(BoxplotGroup group) {
    static const DisplayWords<2> kWords(1, {"Targets", "Iters"});
    return kWords.Get(group);
}

const std::string& GetOrdinalCorrelationsDisplayWord(OrdinalCorrelations type) {
    static const DisplayWords<3> kWords(0, {"Pearson", "Rank", "Polyserial"});
    return kWords.Get(type);
}

const std::string& GetStatisticDisplayWord(std::int32_t statistic) {
    static const DisplayWords<1> kWords(kStatisticMean, {"Mean"});
    return kWords.Get(statistic);
}

const std::string& GetPMMLModelTypeDisplayWord(int modelType) {
    static const DisplayWords<18> kWords(0, {"Association", "Clustering", "GeneralRegression",
                                             "Mining", "NaiveBayes", "NeuralNetwork", "Regression",
                                             "RuleSet", "Sequence", "SVM", "TimeSeries", "Tree",
                                             "NearestNeighbor", "ScoreCard", "Baseline",
                                             "BayesNetExtension", "TransformsOnly", "Other"});
    return kWords.Get(modelType);
}

} // namespace MCMCSP_800
