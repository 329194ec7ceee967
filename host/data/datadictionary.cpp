#include "data/datadictionary.h"

#include "common/hosterror.h"
#include "data/csvreader.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <deque>
#include <filesystem>
#include <fstream>
#include <new>
#include <set>
#include <system_error>
#include <unordered_set>

#if defined(__GLIBC__)
#include <malloc.h>
#endif

namespace MCHost {

using MCCommon_800::MCMV;
using MCSPConst::MeasureLevel;

namespace {

//! Rows between two progress reports.
constexpr std::int64_t kProgressRows = 4096;
//! Whole numbers beyond 2^53 are not all representable: such a column is not ordinal.
constexpr double kMaxExactWhole = 9007199254740992.0;

std::string Lower(std::string s) {
    for (char& c : s) {
        c = static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
    return s;
}

//! `s` without its surrounding blanks (spaces and tabs).
std::string_view TrimBlanks(std::string_view s) {
    std::size_t b = 0;
    std::size_t e = s.size();
    while (b < e && (s[b] == ' ' || s[b] == '\t')) {
        ++b;
    }
    while (e > b && (s[e - 1] == ' ' || s[e - 1] == '\t')) {
        --e;
    }
    return s.substr(b, e - b);
}

std::string Trim(const std::string& s) {
    return std::string(TrimBlanks(s));
}

std::string JoinNames(const std::vector<std::string>& names) {
    std::string out;
    for (const std::string& n : names) {
        out += (out.empty() ? "" : ", ") + n;
    }
    return out;
}

bool IsWhole(double x) {
    return std::fabs(x) <= kMaxExactWhole && x == std::floor(x);
}

//! What one cell of a used column reads as.
struct CellRead {
    CellKind fKind = CellKind::kMissing; //!< missing, number or text
    double fNumber = 0.0;                //!< the number, for a number
    //! Index of the cell's text among the column's distinct texts (FieldScan::fTexts), or -1
    //! for a missing cell and once the column keeps its texts no longer.
    std::int32_t fTextId = -1;
};

//! What the first reading learns about one used column.
class FieldScan {
public:
    //! Reads one cell of the column, found on `line`; `cap` is the most distinct values kept.
    CellRead Add(std::string_view cell, long line, std::size_t cap);

    std::int64_t fNMissing = 0; //!< missing cells
    bool fbText = false;        //!< some cell is text
    bool fbAllWhole = true;     //!< every number is whole
    // A hash set: every cell of a field with few distinct values is looked up once (an ordered
    // set's comparisons were a fifth of a whole fit); the categories are sorted after.
    std::unordered_set<double> fNumbers; //!< distinct numbers, up to the cap
    bool fbNumbersOverflow = false;      //!< more distinct numbers than the cap
    //! Distinct cell texts (without blanks, missing cells left out), up to the cap, in the order
    //! first seen. A deque: the views in fTextIds stay valid as it grows.
    std::deque<std::string> fTexts;
    std::unordered_map<std::string_view, std::int32_t> fTextIds; //!< index of each in fTexts
    std::vector<char> fvTextIsNumber;                            //!< per text: it reads as a number
    std::vector<double> fvTextNumber; //!< per text: that number (0 for text)
    bool fbTextsOverflow = false;     //!< more distinct texts than the cap
    long fFirstTextLine = 0;          //!< line of the first text cell
    std::string fFirstText;           //!< that cell
};

CellRead FieldScan::Add(std::string_view cell, long line, std::size_t cap) {
    CellRead read;
    const std::string_view trimmed = TrimBlanks(cell);
    // A text seen before reads as it did then: one lookup instead of a parse, and what it
    // taught the scan (kind, number, wholeness) is known already.
    if (!fbTextsOverflow) {
        const auto it = fTextIds.find(trimmed);
        if (it != fTextIds.end()) {
            const auto id = static_cast<std::size_t>(it->second);
            read.fKind = fvTextIsNumber[id] ? CellKind::kNumber : CellKind::kText;
            read.fNumber = fvTextNumber[id];
            read.fTextId = it->second;
            return read;
        }
    }
    std::string_view text;
    read.fKind = ClassifyCell(trimmed, text, read.fNumber);
    if (read.fKind == CellKind::kMissing) {
        ++fNMissing;
        return read;
    }
    if (read.fKind == CellKind::kText && !fbText) {
        fbText = true;
        fFirstTextLine = line;
        fFirstText = std::string(text);
    }
    if (read.fKind == CellKind::kNumber) {
        fbAllWhole = fbAllWhole && IsWhole(read.fNumber);
        if (!fbNumbersOverflow && fNumbers.insert(read.fNumber).second && fNumbers.size() >= cap) {
            fbNumbersOverflow = true;
        }
    }
    // Numbers are kept as texts too: should the column turn out to hold text, they are
    // categories by their text.
    if (!fbTextsOverflow) {
        read.fTextId = static_cast<std::int32_t>(fTexts.size());
        fTexts.emplace_back(text);
        fTextIds.emplace(fTexts.back(), read.fTextId);
        fvTextIsNumber.push_back(read.fKind == CellKind::kNumber ? 1 : 0);
        fvTextNumber.push_back(read.fKind == CellKind::kNumber ? read.fNumber : 0.0);
        if (fTexts.size() >= cap) {
            fbTextsOverflow = true;
        }
    }
    return read;
}

// ------------------------------------------------------------------------------------------
// The values kept for the passes

//! Bytes that the kept values may take, and how many they take.
class CacheBudget {
public:
    explicit CacheBudget(std::uint64_t limit) : fLimit(limit) {}
    //! Counts `bytes` more; false (counting nothing) when they do not fit.
    bool Take(std::uint64_t bytes) {
        if (bytes > fLimit - fUsed) {
            return false;
        }
        fUsed += bytes;
        return true;
    }
    void Give(std::uint64_t bytes) { fUsed -= std::min(bytes, fUsed); }

private:
    std::uint64_t fLimit;    //!< most bytes
    std::uint64_t fUsed = 0; //!< bytes counted
};

//! A column of values that grows by chunks, so that growing never copies what is there and
//! the memory it holds is never more than a chunk beyond its size (a vector doubling its
//! capacity would hold, for a moment, three times the data).
template <class T> class Chunks {
public:
    static constexpr int kChunkShift = 16;
    static constexpr std::size_t kChunkSize = std::size_t{1} << kChunkShift;

    //! Appends `x`; false, with nothing appended, when the memory for it is not in `budget`
    //! or not to be had.
    bool Push(T x, CacheBudget& budget) {
        if (fvChunks.empty() || fvChunks.back().size() == kChunkSize) {
            fvChunks.emplace_back();
        }
        std::vector<T>& chunk = fvChunks.back();
        if (chunk.size() == chunk.capacity()) {
            // The first chunk grows from small (a file of few rows keeps little), the others
            // are whole at once. Old and new storage are both held while the chunk moves.
            const std::size_t old = chunk.capacity();
            const std::size_t grown = fvChunks.size() == 1
                                          ? std::min(kChunkSize, std::max<std::size_t>(64, 2 * old))
                                          : kChunkSize;
            if (!budget.Take(grown * sizeof(T))) {
                return false;
            }
            try {
                chunk.reserve(grown);
            } catch (const std::bad_alloc&) {
                budget.Give(grown * sizeof(T));
                return false;
            }
            budget.Give(old * sizeof(T));
        }
        chunk.push_back(x);
        ++fSize;
        return true;
    }
    T operator[](std::int64_t i) const {
        const auto u = static_cast<std::uint64_t>(i);
        return fvChunks[u >> kChunkShift][u & (kChunkSize - 1)];
    }
    T& operator[](std::int64_t i) {
        const auto u = static_cast<std::uint64_t>(i);
        return fvChunks[u >> kChunkShift][u & (kChunkSize - 1)];
    }
    std::int64_t Size() const { return fSize; }
    //! Frees every chunk and gives its memory back to `budget`.
    void Release(CacheBudget& budget) {
        for (const std::vector<T>& chunk : fvChunks) {
            budget.Give(chunk.capacity() * sizeof(T));
        }
        std::vector<std::vector<T>>().swap(fvChunks);
        fSize = 0;
    }

private:
    std::vector<std::vector<T>> fvChunks; //!< full chunks, then the one being filled
    std::int64_t fSize = 0;               //!< values held
};

//! What the records carry for one field, row by row. While the field has few distinct texts a
//! row holds a small index into them (0 for a missing cell, 1 + the text's index in
//! FieldScan::fTexts otherwise), which the end of the reading turns into values (codes or
//! numbers) through fvIdValues, since a field's level and codes are known only then; past the
//! cap of distinct texts a row holds the number itself.
struct FieldColumn {
    bool fbById = true;             //!< rows are held in fIds, not fValues
    Chunks<std::uint32_t> fIds;     //!< per row, the index of its text (0 missing)
    Chunks<double> fValues;         //!< per row, the value
    std::vector<double> fvIdValues; //!< the value of each index of fIds, once known

    //! Keeps the cell `read` of `scan`'s column; false when the budget is spent.
    bool Add(const CellRead& read, const FieldScan& scan, CacheBudget& budget);
    //! Turns the indices held so far into numbers, as the column has stopped keeping texts.
    bool ToValues(const FieldScan& scan, CacheBudget& budget);
};

bool FieldColumn::Add(const CellRead& read, const FieldScan& scan, CacheBudget& budget) {
    if (fbById && scan.fbTextsOverflow && !ToValues(scan, budget)) {
        return false;
    }
    if (fbById) {
        return fIds.Push(
            read.fKind == CellKind::kMissing ? 0u : static_cast<std::uint32_t>(read.fTextId) + 1u,
            budget);
    }
    // A text cell past the cap of distinct texts makes the reading fail at its end (a text
    // field with too many categories): what is kept for it does not matter.
    return fValues.Push(read.fKind == CellKind::kNumber ? read.fNumber : MCMV::Missing(), budget);
}

bool FieldColumn::ToValues(const FieldScan& scan, CacheBudget& budget) {
    for (std::int64_t r = 0; r < fIds.Size(); ++r) {
        const std::uint32_t id = fIds[r];
        const bool number = id > 0 && scan.fvTextIsNumber[id - 1] != 0;
        if (!fValues.Push(number ? scan.fvTextNumber[id - 1] : MCMV::Missing(), budget)) {
            return false;
        }
    }
    fIds.Release(budget);
    fbById = false;
    return true;
}

//! Frees the values kept so far when they outgrow their budget.
void DropColumns(std::vector<FieldColumn>& columns) {
    std::vector<FieldColumn>().swap(columns);
#if defined(__GLIBC__)
    // The allocator keeps freed blocks of its heap for later use, and the chunks it placed
    // there (once its threshold for mapping blocks of their own has risen) would then add to
    // the peak memory of a large fit. Give them back to the system at once.
    malloc_trim(0);
#endif
}

//! Opens `path` for reading or throws a message naming it.
void OpenData(const std::string& path, std::ifstream& in) {
    std::error_code ec;
    if (std::filesystem::is_directory(path, ec)) {
        throw HostError(LocatedMessage(path, 0, "is a folder, not a data file"));
    }
    // A pipe or device cannot be read a second time (the passes after the first read the file
    // again when its rows do not fit the cache), and /dev/zero has no end: refused at once.
    const auto status = std::filesystem::status(path, ec);
    if (!ec && std::filesystem::exists(status) && !std::filesystem::is_regular_file(status)) {
        throw HostError(LocatedMessage(path, 0,
                                       "the data file is not a regular file (a pipe or "
                                       "device); save it to a file first"));
    }
    in.open(path, std::ios::in | std::ios::binary);
    if (!in.is_open()) {
        throw HostError(LocatedMessage(
            path, 0, std::string("cannot open the data file: ") + std::strerror(errno)));
    }
}

//! The level of a scanned column; throws when an override does not fit the column.
MeasureLevel ChooseLevel(const std::string& path, const std::string& name, const FieldScan& scan,
                         const DataOptions& options, bool& inferred) {
    const auto given = options.fLevels.find(name);
    inferred = (given == options.fLevels.end());
    if (!inferred) {
        const MeasureLevel level = given->second;
        if (scan.fbText && level != MCSPConst::kLevelCategorical) {
            throw HostError(LocatedMessage(path, scan.fFirstTextLine,
                                           "field '" + name + "' holds text ('" + scan.fFirstText +
                                               "'), so it can only be "
                                               "categorical, not " +
                                               MeasureLevelName(level)));
        }
        return level;
    }
    if (scan.fbText) {
        return MCSPConst::kLevelCategorical;
    }
    // A column without any value has nothing to count: it stays continuous.
    if (!scan.fbNumbersOverflow && scan.fbAllWhole && !scan.fNumbers.empty() &&
        static_cast<int>(scan.fNumbers.size()) <= options.fMaxOrdinalValues) {
        return MCSPConst::kLevelOrdinal;
    }
    return MCSPConst::kLevelContinuous;
}

} // namespace

bool ParseMeasureLevel(const std::string& text, MeasureLevel& level) {
    const std::string t = Lower(Trim(text));
    if (t == "continuous" || t == "scale") {
        level = MCSPConst::kLevelContinuous;
    } else if (t == "ordinal") {
        level = MCSPConst::kLevelOrdinal;
    } else if (t == "categorical" || t == "nominal") {
        level = MCSPConst::kLevelCategorical;
    } else {
        return false;
    }
    return true;
}

std::string MeasureLevelName(MeasureLevel level) {
    switch (level) {
    case MCSPConst::kLevelContinuous:
        return "continuous";
    case MCSPConst::kLevelOrdinal:
        return "ordinal";
    case MCSPConst::kLevelCategorical:
        return "categorical";
    default:
        return "unknown";
    }
}

CellKind ClassifyCell(std::string_view cell, std::string_view& text, double& number) {
    text = TrimBlanks(cell);
    const std::size_t n = text.size();
    if (n == 0 || (n == 2 && text[0] == 'N' && text[1] == 'A') || (n == 1 && text[0] == '.')) {
        return CellKind::kMissing;
    }
    if (MCCommon_800::ParseDouble(text, number)) {
        return std::isfinite(number) ? CellKind::kNumber : CellKind::kMissing;
    }
    return CellKind::kText;
}

//! The kept values of every used field, in the form the records carry them.
class DataDictionary::RowCache {
public:
    //! Completes the values kept of `dict`'s fields while its file was read (`scans` and
    //! `columns`: one per used field) once the levels and codes are known; null when they do
    //! not fit in `budget`.
    static std::shared_ptr<const RowCache> Make(const DataDictionary& dict,
                                                const std::vector<const FieldScan*>& scans,
                                                std::vector<FieldColumn> columns,
                                                CacheBudget& budget);

    //! Fills `record` (sized) with the values of `row`.
    void Fill(std::int64_t row, MCXML_800::Record& record) const {
        for (std::size_t i = 0; i < fvColumns.size(); ++i) {
            const FieldColumn& column = fvColumns[i];
            record[i] = column.fbById ? column.fvIdValues[column.fIds[row]] : column.fValues[row];
        }
    }

private:
    explicit RowCache(std::vector<FieldColumn> columns) : fvColumns(std::move(columns)) {}

    std::vector<FieldColumn> fvColumns; //!< one per used field
};

std::shared_ptr<const DataDictionary::RowCache>
DataDictionary::RowCache::Make(const DataDictionary& dict,
                               const std::vector<const FieldScan*>& scans,
                               std::vector<FieldColumn> columns, CacheBudget& budget) {
    // The level and codes of each field are known now: the values of a field held by text
    // index come from its distinct texts, those held as numbers become codes when the field
    // is categorical, exactly as ConvertRow turns a cell into a value.
    for (std::size_t i = 0; i < dict.fvFields.size(); ++i) {
        const DataField& f = dict.fvFields[i];
        const FieldScan& scan = *scans[i];
        FieldColumn& column = columns[i];
        const bool categorical = f.fLevel == MCSPConst::kLevelCategorical;
        const auto& textCodes = dict.fvTextCodes[i];
        const auto& numberCodes = dict.fvNumberCodes[i];
        if (column.fbById) {
            const std::size_t n = scan.fTexts.size();
            if (!budget.Take((n + 1) * sizeof(double))) {
                return nullptr;
            }
            column.fvIdValues.assign(n + 1, MCMV::Missing());
            for (std::size_t id = 0; id < n; ++id) {
                double value = scan.fvTextNumber[id];
                if (categorical && f.fbText) {
                    const auto it = textCodes.find(scan.fTexts[id]);
                    if (it == textCodes.end()) {
                        return nullptr;
                    }
                    value = static_cast<double>(it->second);
                } else if (categorical) {
                    const auto it = numberCodes.find(value);
                    if (it == numberCodes.end()) {
                        return nullptr;
                    }
                    value = static_cast<double>(it->second);
                }
                column.fvIdValues[id + 1] = value;
            }
        } else if (categorical) {
            for (std::int64_t r = 0; r < column.fValues.Size(); ++r) {
                double& value = column.fValues[r];
                if (MCMV::IsMissing(value)) {
                    continue;
                }
                const auto it = numberCodes.find(value);
                if (it == numberCodes.end()) {
                    return nullptr;
                }
                value = static_cast<double>(it->second);
            }
        }
    }
    return std::shared_ptr<const RowCache>(new RowCache(std::move(columns)));
}

DataDictionary DataDictionary::Build(const std::string& path, const DataOptions& options,
                                     const DataProgress& progress) {
    std::ifstream in;
    OpenData(path, in);
    std::error_code ec;
    const std::uint64_t fileBytes = std::filesystem::file_size(path, ec);
    CsvReader reader(in, path, options.fDelimiter, options.fbDecimalComma);

    DataDictionary dict;
    dict.fPath = path;
    dict.fDelimiter = options.fDelimiter;
    dict.fbDecimalComma = options.fbDecimalComma;

    // The header: one distinct, non-empty name per column.
    std::vector<std::string> header;
    if (!reader.ReadRecord(header)) {
        throw HostError(LocatedMessage(path, 0, "the file is empty: a header row is needed"));
    }
    std::map<std::string, int> columnOf;
    for (std::size_t c = 0; c < header.size(); ++c) {
        header[c] = Trim(header[c]);
        if (header[c].empty()) {
            throw HostError(
                LocatedMessage(path, reader.GetRecordLine(),
                               "column " + std::to_string(c + 1) + " of the header has no name"));
        }
        const auto [it, isNew] = columnOf.emplace(header[c], static_cast<int>(c));
        if (!isNew) {
            throw HostError(LocatedMessage(
                path, reader.GetRecordLine(),
                "the field name '" + header[c] + "' is used by columns " +
                    std::to_string(it->second + 1) + " and " + std::to_string(c + 1)));
        }
    }
    dict.fNColumns = static_cast<int>(header.size());

    auto checkName = [&](const std::string& name, const char* where) {
        if (columnOf.count(name) == 0) {
            throw HostError(LocatedMessage(path, 0,
                                           std::string("unknown field '") + name + "' " + where +
                                               "; the fields are: " + JoinNames(header)));
        }
    };
    std::vector<bool> used(header.size(), options.fvFields.empty());
    for (const std::string& name : options.fvFields) {
        checkName(name, "in the list of fields");
        used[static_cast<std::size_t>(columnOf[name])] = true;
    }
    for (const auto& entry : options.fLevels) {
        checkName(entry.first, "in a level setting");
    }

    // One reading of the rows: kinds, distinct values, missing counts, and, while they fit in
    // the budget, what the records will carry (`columns`, one per used field).
    const std::size_t cap =
        static_cast<std::size_t>(std::max(options.fMaxCategories, options.fMaxOrdinalValues) + 1);
    std::vector<FieldScan> scans(header.size());
    std::vector<std::size_t> fieldOf(header.size(), 0); // index among the used columns
    std::size_t nUsed = 0;
    for (std::size_t c = 0; c < header.size(); ++c) {
        fieldOf[c] = used[c] ? nUsed++ : 0;
    }
    bool caching = options.fMaxCacheBytes > 0;
    CacheBudget budget(options.fMaxCacheBytes);
    std::vector<FieldColumn> columns(caching ? nUsed : 0);
    std::vector<std::string> cells;
    while (reader.ReadRecord(cells)) {
        if (cells.size() != header.size()) {
            throw HostError(LocatedMessage(path, reader.GetRecordLine(),
                                           "the row has " + std::to_string(cells.size()) +
                                               " fields, the header has " +
                                               std::to_string(header.size())));
        }
        ++dict.fNRows;
        for (std::size_t c = 0; c < cells.size(); ++c) {
            if (!used[c]) {
                continue;
            }
            FieldScan& scan = scans[c];
            const CellRead read = scan.Add(cells[c], reader.GetRecordLine(), cap);
            if (caching && !columns[fieldOf[c]].Add(read, scan, budget)) {
                // Over the budget: the passes will read the file again.
                caching = false;
                DropColumns(columns);
            }
        }
        if (progress && dict.fNRows % kProgressRows == 0) {
            progress(reader.GetBytesRead(), fileBytes);
        }
    }
    if (progress) {
        progress(reader.GetBytesRead(), fileBytes);
    }

    for (std::size_t c = 0; c < header.size(); ++c) {
        if (!used[c]) {
            continue;
        }
        const FieldScan& scan = scans[c];
        DataField field;
        field.fName = header[c];
        field.fColumn = static_cast<int>(c);
        field.fbText = scan.fbText;
        field.fNMissing = scan.fNMissing;
        field.fLevel = ChooseLevel(path, field.fName, scan, options, field.fbInferred);
        if (field.fLevel != MCSPConst::kLevelContinuous) {
            const bool overflow = scan.fbText ? scan.fbTextsOverflow : scan.fbNumbersOverflow;
            const std::size_t n = scan.fbText ? scan.fTexts.size() : scan.fNumbers.size();
            if (overflow || n > static_cast<std::size_t>(options.fMaxCategories)) {
                throw HostError(LocatedMessage(
                    path, 0,
                    "field '" + field.fName + "' has more than " +
                        std::to_string(options.fMaxCategories) + " distinct values, too many " +
                        "for a " + MeasureLevelName(field.fLevel) + " field" +
                        (scan.fbText ? " (leave it out with --fields)" : "")));
            }
            if (scan.fbText) {
                field.fvTexts.assign(scan.fTexts.begin(), scan.fTexts.end());
                std::sort(field.fvTexts.begin(), field.fvTexts.end());
            } else {
                field.fvNumbers.assign(scan.fNumbers.begin(), scan.fNumbers.end());
                std::sort(field.fvNumbers.begin(), field.fvNumbers.end());
            }
        }
        dict.fvFields.push_back(std::move(field));
    }
    dict.fFileBytes = reader.GetBytesRead();
    dict.Finish();
    if (caching) {
        std::vector<const FieldScan*> usedScans;
        for (std::size_t c = 0; c < header.size(); ++c) {
            if (used[c]) {
                usedScans.push_back(&scans[c]);
            }
        }
        dict.fpCache = RowCache::Make(dict, usedScans, std::move(columns), budget);
    }
    return dict;
}

void DataDictionary::GetCachedRow(std::int64_t row, MCXML_800::Record& record) const {
    if (record.Size() != fvFields.size()) {
        record = MCXML_800::Record(fvFields.size());
    }
    fpCache->Fill(row, record);
}

void DataDictionary::Finish() {
    fVarList = MCXML_800::MCVarList();
    fvTextCodes.assign(fvFields.size(), {});
    fvNumberCodes.assign(fvFields.size(), {});
    for (std::size_t i = 0; i < fvFields.size(); ++i) {
        const DataField& f = fvFields[i];
        using MCXML_800::IMCVariable;
        switch (f.fLevel) {
        case MCSPConst::kLevelOrdinal:
            fVarList.Add(std::make_unique<MCXML_800::MCCatVar>(
                f.fName, MCXML_800::MCCatNumEncoder(f.fvNumbers), true, IMCVariable::kOrderedKind));
            break;
        case MCSPConst::kLevelCategorical:
            if (f.fbText) {
                fVarList.Add(std::make_unique<MCXML_800::MCCatVar>(
                    f.fName, MCXML_800::MCCatNumEncoder(f.fvTexts), false,
                    IMCVariable::kNominalKind));
                for (std::size_t k = 0; k < f.fvTexts.size(); ++k) {
                    fvTextCodes[i].emplace(f.fvTexts[k], static_cast<int>(k));
                }
            } else {
                fVarList.Add(std::make_unique<MCXML_800::MCCatVar>(
                    f.fName, MCXML_800::MCCatNumEncoder(f.fvNumbers), false,
                    IMCVariable::kNominalKind));
                for (std::size_t k = 0; k < f.fvNumbers.size(); ++k) {
                    fvNumberCodes[i].emplace(f.fvNumbers[k], static_cast<int>(k));
                }
            }
            break;
        default:
            fVarList.Add(std::make_unique<MCXML_800::MCScaleVar>(f.fName));
            break;
        }
    }
}

int DataDictionary::FindField(const std::string& name) const {
    for (std::size_t i = 0; i < fvFields.size(); ++i) {
        if (fvFields[i].fName == name) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

void DataDictionary::ConvertRow(const std::vector<std::string>& cells, long line,
                                MCXML_800::Record& record) const {
    if (static_cast<int>(cells.size()) != fNColumns) {
        throw HostError(LocatedMessage(fPath, line,
                                       "the row has " + std::to_string(cells.size()) +
                                           " fields, the header has " + std::to_string(fNColumns)));
    }
    if (record.Size() != fvFields.size()) {
        record = MCXML_800::Record(fvFields.size());
    }
    std::string_view text;
    double number = 0.0;
    for (std::size_t i = 0; i < fvFields.size(); ++i) {
        const DataField& f = fvFields[i];
        const CellKind kind =
            ClassifyCell(cells[static_cast<std::size_t>(f.fColumn)], text, number);
        double value = MCMV::Missing();
        if (kind == CellKind::kMissing) {
            record[i] = value;
            continue;
        }
        if (f.fLevel == MCSPConst::kLevelCategorical) {
            int code = -1;
            if (f.fbText) {
                const auto it = fvTextCodes[i].find(std::string(text));
                code = it == fvTextCodes[i].end() ? -1 : it->second;
            } else if (kind == CellKind::kNumber) {
                const auto it = fvNumberCodes[i].find(number);
                code = it == fvNumberCodes[i].end() ? -1 : it->second;
            }
            if (code < 0) {
                throw HostError(LocatedMessage(fPath, line,
                                               "field '" + f.fName + "' holds '" +
                                                   std::string(text) +
                                                   "', which was not in the file when it was "
                                                   "first read (did the file change?)"));
            }
            value = static_cast<double>(code);
        } else if (kind == CellKind::kNumber) {
            value = number;
        } else {
            throw HostError(LocatedMessage(fPath, line,
                                           "field '" + f.fName + "' holds '" + std::string(text) +
                                               "', which is not a number (did the file "
                                               "change?)"));
        }
        record[i] = value;
    }
}

} // namespace MCHost
