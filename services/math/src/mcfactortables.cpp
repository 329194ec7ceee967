#include "mcmath/mcfactortables.h"

#include "mccommon/display.h"

#include <algorithm>
#include <climits>
#include <cstddef>

namespace MCMath_800 {

bool MCFactorTables::SetModelEffectFactors(const std::vector<int>& factorVarIndices) {
    fCells.clear();
    fvCellCodes.clear();
    fFirstIndex = 0;
    const bool valid =
        !factorVarIndices.empty() &&
        std::all_of(factorVarIndices.begin(), factorVarIndices.end(), [](int v) { return v >= 0; });
    fvFactorVars = valid ? factorVarIndices : std::vector<int>();
    fvCodes.assign(fvFactorVars.size(), 0);
    return valid;
}

int MCFactorTables::CodeOf(double value) {
    // value > -0.5 also rejects a missing value; the upper test keeps the cast defined.
    if (!(value > -0.5) || !(value + 0.5 < static_cast<double>(INT_MAX))) {
        return -1;
    }
    return static_cast<int>(value + 0.5);
}

bool MCFactorTables::UpdateAll(const MCXML_800::Record& record) {
    if (fvFactorVars.empty()) {
        return false;
    }
    for (std::size_t k = 0; k < fvFactorVars.size(); ++k) {
        const int code = CodeOf(record[static_cast<std::size_t>(fvFactorVars[k])]);
        if (code < 0) {
            return false;
        }
        fvCodes[k] = code;
    }
    // find() first: a combination already seen costs no allocation.
    if (fCells.find(fvCodes) == fCells.end()) {
        fCells.emplace(fvCodes, -1);
    }
    return true;
}

bool MCFactorTables::UpdateCodes(const std::vector<int>& codes) {
    if (fvFactorVars.empty() || codes.size() != fvFactorVars.size() ||
        std::any_of(codes.begin(), codes.end(), [](int c) { return c < 0; })) {
        return false;
    }
    if (fCells.find(codes) == fCells.end()) {
        fCells.emplace(codes, -1);
    }
    return true;
}

int MCFactorTables::CreateParameterIndices(int firstIndex) {
    fFirstIndex = firstIndex;
    fvCellCodes.clear();
    fvCellCodes.reserve(fCells.size());
    // std::map iterates its keys in lexicographic order: the first factor varies slowest.
    int next = firstIndex;
    for (auto& cell : fCells) {
        cell.second = next++;
        fvCellCodes.push_back(cell.first);
    }
    return GetNCells();
}

const std::vector<int>& MCFactorTables::GetParameterIndices(const std::vector<int>& codes,
                                                            bool addNew) {
    fvResult.assign(1, -1);
    auto it = fCells.find(codes);
    if (it != fCells.end() && it->second >= 0) {
        fvResult[0] = it->second;
        return fvResult;
    }
    if (!addNew || codes.size() != fvFactorVars.size() || fvFactorVars.empty() ||
        std::any_of(codes.begin(), codes.end(), [](int c) { return c < 0; })) {
        return fvResult;
    }
    if (it == fCells.end()) {
        it = fCells.emplace(codes, -1).first;
    }
    it->second = fFirstIndex + GetNCells();
    fvCellCodes.push_back(it->first);
    fvResult[0] = it->second;
    return fvResult;
}

bool MCFactorTables::GetParameterFactorValues(std::vector<int>& codes, int effect,
                                              int index) const {
    const long long position = static_cast<long long>(index) - fFirstIndex;
    if (effect != 0 || position < 0 || position >= GetNCells()) {
        codes.clear();
        return false;
    }
    codes = fvCellCodes[static_cast<std::size_t>(position)];
    return true;
}

void MCFactorTables::Display() const {
    using namespace MCDisplay_800;
    const DisplayFrame frame("MCFactorTables display start", "MCFactorTables display end");
    DisplayIV("Factor variables", fvFactorVars);
    DisplayI("Combinations seen", static_cast<long long>(fCells.size()));
    DisplayI("Numbered cells", GetNCells());
    DisplayI("First index", fFirstIndex);
    for (const std::vector<int>& cell : fvCellCodes) {
        DisplayIV("Cell", cell);
    }
}

} // namespace MCMath_800
