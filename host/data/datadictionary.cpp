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
#include <filesystem>
#include <fstream>
#include <set>
#include <unordered_set>
#include <system_error>

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

std::string Trim(const std::string& s) {
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

//! What the first reading learns about one used column.
struct FieldScan {
    std::int64_t fNMissing = 0;     //!< missing cells
    bool fbText = false;            //!< some cell is text
    bool fbAllWhole = true;         //!< every number is whole
    // Hash sets: every cell of a field with few distinct values is looked up once (an ordered
    // set's string comparisons were a fifth of a whole fit); the categories are sorted after.
    std::unordered_set<double> fNumbers;    //!< distinct numbers, up to the cap
    bool fbNumbersOverflow = false;         //!< more distinct numbers than the cap
    std::unordered_set<std::string> fTexts; //!< distinct cell texts, up to the cap
    bool fbTextsOverflow = false;   //!< more distinct texts than the cap
    long fFirstTextLine = 0;        //!< line of the first text cell
    std::string fFirstText;         //!< that cell
};

//! Opens `path` for reading or throws a message naming it.
void OpenData(const std::string& path, std::ifstream& in) {
    std::error_code ec;
    if (std::filesystem::is_directory(path, ec)) {
        throw HostError(LocatedMessage(path, 0, "is a folder, not a data file"));
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

CellKind ClassifyCell(const std::string& cell, std::string& text, double& number) {
    text = Trim(cell);
    const std::size_t n = text.size();
    if (n == 0 || (n == 2 && text[0] == 'N' && text[1] == 'A') || (n == 1 && text[0] == '.')) {
        return CellKind::kMissing;
    }
    if (MCCommon_800::ParseDouble(text, number)) {
        return std::isfinite(number) ? CellKind::kNumber : CellKind::kMissing;
    }
    return CellKind::kText;
}

DataDictionary DataDictionary::Build(const std::string& path, const DataOptions& options,
                                     const DataProgress& progress) {
    std::ifstream in;
    OpenData(path, in);
    std::error_code ec;
    const std::uint64_t fileBytes = std::filesystem::file_size(path, ec);
    CsvReader reader(in, path, options.fDelimiter);

    DataDictionary dict;
    dict.fPath = path;
    dict.fDelimiter = options.fDelimiter;

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

    // One reading of the rows: kinds, distinct values, missing counts.
    const std::size_t cap =
        static_cast<std::size_t>(std::max(options.fMaxCategories, options.fMaxOrdinalValues) + 1);
    std::vector<FieldScan> scans(header.size());
    std::vector<std::string> cells;
    std::string text;
    double number = 0.0;
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
            const CellKind kind = ClassifyCell(cells[c], text, number);
            if (kind == CellKind::kMissing) {
                ++scan.fNMissing;
                continue;
            }
            if (kind == CellKind::kText && !scan.fbText) {
                scan.fbText = true;
                scan.fFirstTextLine = reader.GetRecordLine();
                scan.fFirstText = text;
            }
            if (kind == CellKind::kNumber) {
                scan.fbAllWhole = scan.fbAllWhole && IsWhole(number);
                if (!scan.fbNumbersOverflow && scan.fNumbers.insert(number).second &&
                    scan.fNumbers.size() >= cap) {
                    scan.fbNumbersOverflow = true;
                }
            }
            if (!scan.fbTextsOverflow && scan.fTexts.insert(text).second &&
                scan.fTexts.size() >= cap) {
                scan.fbTextsOverflow = true;
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
    dict.Finish();
    return dict;
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
    std::string text;
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
                const auto it = fvTextCodes[i].find(text);
                code = it == fvTextCodes[i].end() ? -1 : it->second;
            } else if (kind == CellKind::kNumber) {
                const auto it = fvNumberCodes[i].find(number);
                code = it == fvNumberCodes[i].end() ? -1 : it->second;
            }
            if (code < 0) {
                throw HostError(LocatedMessage(fPath, line,
                                               "field '" + f.fName + "' holds '" + text +
                                                   "', which was not in the file when it was "
                                                   "first read (did the file change?)"));
            }
            value = static_cast<double>(code);
        } else if (kind == CellKind::kNumber) {
            value = number;
        } else {
            throw HostError(LocatedMessage(fPath, line,
                                           "field '" + f.fName + "' holds '" + text +
                                               "', which is not a number (did the file "
                                               "change?)"));
        }
        record[i] = value;
    }
}

} // namespace MCHost
