// Fuzz target: the host's data layer on arbitrary file content, and the fitting on what it
// reads.
//
// The bytes become a data file, which the data dictionary reads (CSV reader, level inference,
// categories) and the record iterator then serves over two passes, as the fitting reads it.
// A small file that reads is then fitted as `mcsim fit` fits it: its results may hold the
// missing value but no infinity, and a best fit's parameters are numbers.
// A malformed file must end in a HostError with a message; anything else that leaves these
// calls is a finding. Records that are handed out must keep the dictionary's promises: one
// value per used field, each either missing or a finite number, a categorical field's value
// one of its codes 0..k-1 and an ordinal field's value one of its categories; both passes must
// hand out the same number of records, which is the dictionary's row count.
#include "common/hosterror.h"
#include "data/csvreader.h"
#include "data/csvrecorditer.h"
#include "data/datadictionary.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"

#include <unistd.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>

namespace {

using MCCommon_800::MCMV;
using MCHost::DataDictionary;
using MCHost::DataField;

//! Files with at most this many rows and fields are fitted as well as read.
constexpr std::int64_t kMaxFitRows = 200;
constexpr std::size_t kMaxFitFields = 8;

//! Stops the run with `what`: the fuzzer records the input that got here.
[[noreturn]] void Broken(const char* what) {
    std::fprintf(stderr, "csv_fuzz: %s\n", what);
    std::abort();
}

//! A scratch file of this process for the current input.
const std::string& ScratchPath() {
    static const std::string path =
        (std::filesystem::temp_directory_path() /
         ("mcsim_csv_fuzz_" + std::to_string(static_cast<long>(::getpid())) + ".csv"))
            .string();
    return path;
}

void CheckValue(const DataField& field, double x) {
    if (MCMV::IsMissing(x)) {
        return;
    }
    if (!std::isfinite(x)) {
        Broken("a record holds a non-finite value that is not the missing value");
    }
    switch (field.fLevel) {
    case MCSPConst::kLevelCategorical: {
        const std::size_t k = field.fbText ? field.fvTexts.size() : field.fvNumbers.size();
        if (x < 0.0 || x != std::floor(x) || x >= static_cast<double>(k)) {
            Broken("a categorical value is not one of the field's codes");
        }
        break;
    }
    case MCSPConst::kLevelOrdinal:
        if (!std::binary_search(field.fvNumbers.begin(), field.fvNumbers.end(), x)) {
            Broken("an ordinal value is not one of the field's categories");
        }
        break;
    default:
        break;
    }
}

//! Reads every record of one pass; the number of records, or -1 when the pass failed.
std::int64_t ReadPass(MCHost::CsvRecordIter& iter, const DataDictionary& dict) {
    const std::vector<DataField>& fields = dict.GetFields();
    std::int64_t n = 0;
    while (iter.HasMore()) {
        const MCXML_800::Record* record = iter.NextRecord();
        if (record == nullptr) {
            if (iter.GetError().empty()) {
                Broken("a null record without a message");
            }
            return -1;
        }
        if (record->Size() != fields.size()) {
            Broken("a record's size is not the number of fields");
        }
        for (std::size_t i = 0; i < fields.size(); ++i) {
            CheckValue(fields[i], (*record)[i]);
        }
        ++n;
    }
    return n;
}

//! A number of the fitting's results: finite, or the missing value.
void CheckNumber(double x) {
    if (!MCMV::IsMissing(x) && !std::isfinite(x)) {
        Broken("the fitting's results hold an infinity");
    }
}

void CheckNumbers(const std::vector<double>& xs) {
    for (double x : xs) {
        CheckNumber(x);
    }
}

//! Fits every field of a small file as `mcsim fit` does (categorical fields as factors, the
//! others as covariates with every candidate of their level) and checks that the results hold
//! no infinity and the best fits' parameters are numbers.
void Fit(const DataDictionary& dict) {
    using namespace MCSPConst;
    static const std::vector<DistType> kContinuous = {
        kDistLognormal, kDistNormal, kDistTriangular, kDistUniform,
        kDistWeibull,   kDistGamma,  kDistBeta,       kDistExponential};
    static const std::vector<DistType> kOrdinal = {kDistBinomial, kDistNegbinomial, kDistPoisson};
    MCMCSP_800::DFCSettings settings;
    const std::vector<DataField>& fields = dict.GetFields();
    for (std::size_t i = 0; i < fields.size(); ++i) {
        const DataField& f = fields[i];
        const int index = static_cast<int>(i);
        const int n = static_cast<int>(f.fbText ? f.fvTexts.size() : f.fvNumbers.size());
        const int added =
            f.fLevel == kLevelCategorical
                ? (n < 1 ? 0 : settings.AddFactor(index, n, {kDistCategorical}, f.fLevel, false))
            : f.fLevel == kLevelOrdinal
                ? settings.AddCovariate(index, kOrdinal, f.fLevel, false)
                : settings.AddCovariate(index, kContinuous, f.fLevel, false);
        if (added < 0) {
            Broken("a field of the dictionary cannot be fitted");
        }
    }
    settings.SetInteractiveMode(true);
    settings.SetUseCrosstabs(true);
    settings.SetExportCrosstabs(true);
    MCHost::CsvRecordIter records(dict);
    MCMCSP_800::DFCAlgorithm algorithm(settings, dict.GetVarList());
    const MCCommon_800::MCStatus status = algorithm.BuildModel(records, nullptr);
    MCMCSP_800::DFCOutputStats* results = nullptr;
    if (status.IsError() || algorithm.GetOutputStats(results).IsError()) {
        return;
    }
    for (const auto* infos : {&results->GetCovarDistInfo(), &results->GetFactorDistInfo()}) {
        for (const auto& info : *infos) {
            for (const auto& e : info.fDistElements) {
                CheckNumbers(e.fDistParams);
                CheckNumbers({e.fChiSquareFit, e.fChiSquarePValue, e.fADFit, e.fADPValue, e.fKSFit,
                              e.fKSPValue});
            }
            CheckNumbers(info.fDistBestParams);
            for (std::size_t k = 0; k < info.fDistBestParams.size(); ++k) {
                // Only an Empirical distribution's standard deviation may be missing.
                const bool mayBeMissing = info.fDistBestType == kDistEmpirical && k == 2;
                if (MCMV::IsMissing(info.fDistBestParams[k]) && !mayBeMissing) {
                    Broken("a best fit has a missing parameter");
                }
            }
        }
    }
    const auto& corr = results->GetCorrMatrix();
    for (int i = 0; i < corr.GetNRows(); ++i) {
        for (int j = 0; j <= i; ++j) {
            const double r = corr.GetElem(i, j);
            if (!MCMV::IsMissing(r) && !(std::fabs(r) <= 1.0)) {
                Broken("a correlation outside [-1, 1]");
            }
        }
    }
    CheckNumbers(results->GetCrstabsProbs());
}

//! The values of every record of one pass, as bits (missing values compare equal).
std::vector<std::uint64_t> PassBits(const DataDictionary& dict) {
    std::vector<std::uint64_t> bits;
    MCHost::CsvRecordIter iter(dict);
    while (iter.HasMore()) {
        const MCXML_800::Record* record = iter.NextRecord();
        if (record == nullptr) {
            break;
        }
        for (double v : record->GetAll()) {
            std::uint64_t b = 0;
            std::memcpy(&b, &v, sizeof b);
            bits.push_back(b);
        }
    }
    return bits;
}

//! The passes served from memory must be the passes read from the file.
void CompareWithRereading(const std::string& path, const MCHost::DataOptions& options,
                          const DataDictionary& cached) {
    MCHost::DataOptions rereading = options;
    rereading.fMaxCacheBytes = 0;
    const DataDictionary dict = DataDictionary::Build(path, rereading);
    if (dict.HasCache() || PassBits(dict) != PassBits(cached)) {
        Broken("the data kept in memory differ from the file read again");
    }
}

void ReadFile(const std::string& path, const MCHost::DataOptions& options) {
    try {
        const DataDictionary dict = DataDictionary::Build(path, options);
        if (dict.GetVarList().Size() != static_cast<int>(dict.GetFields().size())) {
            Broken("the variable list and the fields differ in number");
        }
        MCHost::CsvRecordIter iter(dict);
        const std::int64_t first = ReadPass(iter, dict);
        if (iter.Restart() != 0) {
            Broken("the file cannot be read a second time");
        }
        const std::int64_t second = ReadPass(iter, dict);
        if (first != second) {
            Broken("two passes over the same file differ");
        }
        if (first >= 0 && first != dict.GetNRows()) {
            Broken("a pass hands out a number of records other than the rows counted");
        }
        if (dict.HasCache()) {
            CompareWithRereading(path, options, dict);
        }
        // Small files that read are fitted too: bad data for the fitting.
        if (first > 0 && first <= kMaxFitRows && !dict.GetFields().empty() &&
            dict.GetFields().size() <= kMaxFitFields) {
            Fit(dict);
        }
    } catch (const MCHost::HostError&) {
        // A file the host refuses, with a message for the user.
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const std::string& path = ScratchPath();
    {
        std::ofstream out(path, std::ios::binary | std::ios::trunc);
        out.write(reinterpret_cast<const char*>(data), static_cast<std::streamsize>(size));
        if (!out) {
            Broken("cannot write the scratch file");
        }
    }
    // As `mcsim fit` reads a file without --delimiter (the separator guessed from its first
    // rows), then with tight limits, a semicolon and decimal commas, so that the paths that
    // refuse too many categories, the other delimiter and the comma-to-point rewriting are
    // taken as well.
    MCHost::DataOptions guessed;
    const MCHost::SeparatorGuess guess = MCHost::GuessSeparator(
        MCHost::ReadSeparatorSample(path),
        std::string_view(MCHost::kSeparatorCandidates, sizeof MCHost::kSeparatorCandidates));
    guessed.fDelimiter = guess.fDelimiter;
    ReadFile(path, guessed);
    MCHost::DataOptions tight;
    tight.fDelimiter = ';';
    tight.fbDecimalComma = true;
    tight.fMaxOrdinalValues = 2;
    tight.fMaxCategories = 3;
    ReadFile(path, tight);
    return 0;
}
