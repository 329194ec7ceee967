// The joint contingency table of several factors (categorical fields), built from records.
//
// The fitting gives the table the record variables of its factors (SetModelEffectFactors),
// shows it every valid record of its first data pass (UpdateAll), numbers the cells
// (CreateParameterIndices), then in its second pass sums the record weights per cell
// (GetParameterIndices) and finally writes one row of category texts per cell
// (GetParameterFactorValues). The simulation later draws whole rows of this table by their
// probabilities, so the table must hold every combination that occurs in the data and no
// other: a cell is a combination of factor codes that some record showed. Combinations that
// never occur are not cells (listing them would only add rows of probability 0, and their
// number grows as the product of the factors' category counts).
//
// Factor codes: the value v of a factor variable in a record becomes the code trunc(v + 0.5)
// (2.4 → 2, 2.5 → 3, -0.4 → 0); a missing value, a value at or below -0.5, or one whose code
// exceeds the int range has no code, and a record with such a value is not counted.
//
// Order of the cells: CreateParameterIndices numbers the cells by their code vectors in
// lexicographic order, the first factor varying slowest and the last fastest, as nested loops
// over the factors in the order given to SetModelEffectFactors would visit them.
#pragma once

#include "mccommon/records.h"

#include <map>
#include <vector>

namespace MCMath_800 {

class MCFactorTables {
public:
    MCFactorTables() = default;

    //! Sets the record variables whose joint table is built, in factor order, and forgets every
    //! cell. False (and no factors) when the list is empty or holds a negative index.
    bool SetModelEffectFactors(const std::vector<int>& factorVarIndices);
    //! Number of factors.
    int GetNFactors() const { return static_cast<int>(fvFactorVars.size()); }
    //! The code of one factor value (see the header note); -1 when it has none.
    static int CodeOf(double value);

    //! Records the combination of factor codes that `record` shows. False (nothing recorded)
    //! when there are no factors or a factor value has no code.
    bool UpdateAll(const MCXML_800::Record& record);
    //! As UpdateAll for a vector of codes, one per factor; false when its length differs from
    //! the number of factors or a code is negative.
    bool UpdateCodes(const std::vector<int>& codes);

    //! Numbers the cells seen so far firstIndex, firstIndex + 1, ... in the documented order
    //! and returns the number of cells. May be called again after further updates; the
    //! numbering is then redone over all cells.
    int CreateParameterIndices(int firstIndex);
    //! Number of numbered cells.
    int GetNCells() const { return static_cast<int>(fvCellCodes.size()); }

    //! The parameter indices of the code vector `codes` (one per factor), one entry per model
    //! effect; the table has one effect, the joint table, so the first (only) entry is the
    //! cell's index, or -1 when `codes` is not a numbered cell. With `addNew` true an unnumbered
    //! code vector becomes a new cell with the next free index (after the numbered ones, outside
    //! the lexicographic order until the next CreateParameterIndices); with false the table
    //! does not change. The reference stays valid until the next call.
    const std::vector<int>& GetParameterIndices(const std::vector<int>& codes, bool addNew);
    //! The codes of cell `index` of model effect `effect` into `codes` (one per factor). The
    //! only effect is 0; false (codes emptied) for another effect or an index that is not a
    //! numbered cell.
    bool GetParameterFactorValues(std::vector<int>& codes, int effect, int index) const;

    //! Diagnostic listing through the display stream.
    void Display() const;

private:
    std::vector<int> fvFactorVars;             //!< record variable index of each factor
    std::map<std::vector<int>, int> fCells;    //!< code vector → cell index (-1: unnumbered)
    std::vector<std::vector<int>> fvCellCodes; //!< code vector of each numbered cell
    int fFirstIndex = 0;                       //!< index of the first numbered cell
    std::vector<int> fvCodes;                  //!< scratch: the codes of the current record
    std::vector<int> fvResult;                 //!< the result of GetParameterIndices
};

} // namespace MCMath_800
