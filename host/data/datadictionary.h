// The data dictionary of a CSV file: which columns are used, each one's measurement level and
// categories, and the host variable list (MCVarList) the component sees.
//
// Build reads the file once. A cell is missing when, without its surrounding blanks, it is
// empty, "NA" or "." (numbers that are not finite, such as "NaN", count as missing too). A
// column with any other cell that is not a number holds text. Levels are inferred and can be
// overridden per field:
//   - text                                         -> categorical
//   - numbers, all whole, at most fMaxOrdinalValues distinct values -> ordinal
//   - other numbers                                -> continuous
// Text can only be categorical; numbers can take any level.
//
// What the variables are and what records carry for them:
//   - continuous: MCScaleVar (scale kind, numeric); the record holds the number.
//   - ordinal:    MCCatVar with its distinct numbers as categories (ascending), ordinal flag
//                 set, ordered kind; the record holds the number itself, which is what the
//                 discrete distributions (Poisson, binomial, negative binomial) are fitted to.
//   - categorical: MCCatVar with its distinct texts (byte order) or numbers (ascending) as
//                 categories, nominal kind; the record holds the category's code 0..k-1 as a
//                 double, which is how the fitting counts a factor. The encoder turns codes
//                 back into the category texts.
//
// While Build reads the rows it also keeps what every record will carry, as long as that fits in
// DataOptions::fMaxCacheBytes; the record iterator then serves all the fitting's passes from
// memory instead of reading the file again. A file too large for the budget is read again for
// every pass, in memory independent of its number of rows.
#pragma once

#include "mccommon/records.h"
#include "mccommon/variables.h"
#include "simulation_common/mcspconst.h"

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace MCHost {

//! Reads "continuous" (or "scale"), "ordinal", "categorical" (or "nominal"), in any case.
//! False for anything else.
bool ParseMeasureLevel(const std::string& text, MCSPConst::MeasureLevel& level);
//! "continuous", "ordinal", "categorical" or "unknown".
std::string MeasureLevelName(MCSPConst::MeasureLevel level);

//! What the reader is told about a CSV file.
struct DataOptions {
    char fDelimiter = ',';       //!< field separator
    bool fbDecimalComma = false; //!< numbers are written with a decimal comma ("3,14")
    //! Columns to use, by header name, in any order; empty: every column. The variables keep
    //! the file's column order.
    std::vector<std::string> fvFields;
    //! Levels given by the user, by field name; they replace the inferred ones.
    std::map<std::string, MCSPConst::MeasureLevel> fLevels;
    //! Whole numbers with at most this many distinct values are ordinal.
    int fMaxOrdinalValues = 20;
    //! Most categories a categorical or ordinal field may have.
    int fMaxCategories = 1000;
    //! Most bytes kept of the records' values for the passes over the data (0: none; the file
    //! is then read again for every pass).
    std::uint64_t fMaxCacheBytes = std::uint64_t{256} << 20;
};

//! Progress of one reading pass over a file: bytes read and the file's size.
using DataProgress = std::function<void(std::uint64_t bytesRead, std::uint64_t fileBytes)>;

//! One used column of the file.
struct DataField {
    std::string fName; //!< header name
    int fColumn = 0;   //!< position in the file's rows, from 0
    MCSPConst::MeasureLevel fLevel = MCSPConst::kLevelContinuous; //!< final level
    bool fbInferred = true;           //!< the level was inferred, not given
    bool fbText = false;              //!< the column holds text
    std::int64_t fNMissing = 0;       //!< missing cells
    std::vector<std::string> fvTexts; //!< text categories in code order
    std::vector<double> fvNumbers;    //!< numeric categories in code order
};

class DataDictionary {
public:
    //! Reads `path` once and builds the dictionary. Throws HostError naming the file (and the
    //! line or field) when the file cannot be read, is malformed or does not fit `options`.
    static DataDictionary Build(const std::string& path, const DataOptions& options,
                                const DataProgress& progress = DataProgress());

    const std::string& GetPath() const { return fPath; }
    char GetDelimiter() const { return fDelimiter; }
    bool HasDecimalComma() const { return fbDecimalComma; }
    //! Number of columns of the header, used or not.
    int GetNColumns() const { return fNColumns; }
    //! Number of data rows.
    std::int64_t GetNRows() const { return fNRows; }
    //! The used fields, in file order; field i is variable i.
    const std::vector<DataField>& GetFields() const { return fvFields; }
    //! The index of the field named `name`, or -1.
    int FindField(const std::string& name) const;
    //! The variables the component sees, one per used field.
    const MCXML_800::MCVarList& GetVarList() const { return fVarList; }
    //! Bytes of the file read when the dictionary was built.
    std::uint64_t GetFileBytes() const { return fFileBytes; }

    //! Fills `record` (one value per used field) from the cells of a data row. Throws
    //! HostError naming the line when the row does not match the dictionary (wrong number of
    //! cells, or a value not seen when the dictionary was built: the file changed).
    void ConvertRow(const std::vector<std::string>& cells, long line,
                    MCXML_800::Record& record) const;
    //! Fills `record` with the values of data row `row` (from 0, below GetNRows) as ConvertRow
    //! gave them from the file. Only when HasCache.
    void GetCachedRow(std::int64_t row, MCXML_800::Record& record) const;

    //! True when the records' values were kept while the file was read (they fitted in
    //! DataOptions::fMaxCacheBytes), so the passes need not read the file again.
    bool HasCache() const { return fpCache != nullptr; }

private:
    class RowCache;

    DataDictionary() = default;
    //! Builds the variable list and the lookup tables from the fields.
    void Finish();

    std::string fPath;               //!< the file
    char fDelimiter = ',';           //!< its separator
    bool fbDecimalComma = false;     //!< its numbers have a decimal comma
    int fNColumns = 0;               //!< header columns
    std::int64_t fNRows = 0;         //!< data rows
    std::uint64_t fFileBytes = 0;    //!< bytes read by Build
    std::vector<DataField> fvFields; //!< used fields in file order
    MCXML_800::MCVarList fVarList;   //!< one variable per field
    //! Per field, the code of each text category (categorical text fields).
    std::vector<std::unordered_map<std::string, int>> fvTextCodes;
    //! Per field, the code of each numeric category (categorical numeric fields).
    std::vector<std::map<double, int>> fvNumberCodes;
    //! The records' values kept by Build; shared by copies, never changed after Build. Null
    //! when they did not fit in the budget.
    std::shared_ptr<const RowCache> fpCache;
};

//! How a cell reads: missing, a number, or text. `text` receives the cell without its
//! surrounding blanks (a view into `cell`) and `number` the value of a number.
enum class CellKind { kMissing, kNumber, kText };
CellKind ClassifyCell(std::string_view cell, std::string_view& text, double& number);

} // namespace MCHost
