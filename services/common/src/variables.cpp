#include "mccommon/variables.h"

#include "mccommon/display.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>

namespace MCXML_800 {

using MCCommon_800::MCMV;

MCCatNumEncoder::MCCatNumEncoder(std::vector<double> numbers)
    : fbString(false), fNumbers(std::move(numbers)) {}

MCCatNumEncoder::MCCatNumEncoder(std::vector<std::string> texts)
    : fbString(true), fTexts(std::move(texts)) {}

int MCCatNumEncoder::GetNCategories() const {
    return static_cast<int>(fbString ? fTexts.size() : fNumbers.size());
}

int MCCatNumEncoder::Encode(double number) const {
    if (fbString || MCMV::IsMissing(number)) {
        return -1;
    }
    const auto it = std::find(fNumbers.begin(), fNumbers.end(), number);
    return it == fNumbers.end() ? -1 : static_cast<int>(it - fNumbers.begin());
}

int MCCatNumEncoder::Encode(const std::string& text) const {
    if (!fbString) {
        double x = 0.0;
        return MCCommon_800::ParseDouble(text, x) ? Encode(x) : -1;
    }
    const auto it = std::find(fTexts.begin(), fTexts.end(), text);
    return it == fTexts.end() ? -1 : static_cast<int>(it - fTexts.begin());
}

std::string MCCatNumEncoder::GetCategoryText(int code) const {
    if (code < 0 || code >= GetNCategories()) {
        return std::string();
    }
    const auto i = static_cast<std::size_t>(code);
    return fbString ? fTexts[i] : MCCommon_800::FormatDefault(fNumbers[i]);
}

double MCCatNumEncoder::GetCategoryNumber(int code) const {
    if (fbString || code < 0 || code >= GetNCategories()) {
        return MCMV::Missing();
    }
    return fNumbers[static_cast<std::size_t>(code)];
}

int MCCatNumEncoder::AddCategory(double number) {
    const int code = Encode(number);
    if (code >= 0 || fbString || MCMV::IsMissing(number)) {
        return code;
    }
    fNumbers.push_back(number);
    return GetNCategories() - 1;
}

int MCCatNumEncoder::AddCategory(const std::string& text) {
    if (!fbString) {
        double x = 0.0;
        return MCCommon_800::ParseDouble(text, x) ? AddCategory(x) : -1;
    }
    const int code = Encode(text);
    if (code >= 0) {
        return code;
    }
    fTexts.push_back(text);
    return GetNCategories() - 1;
}

MCScaleVar::MCScaleVar(std::string name, int measure, VariableStorage storage)
    : fName(std::move(name)), fMeasure(measure), fStorage(storage) {}

std::unique_ptr<IMCVariable> MCScaleVar::Clone() const {
    return std::make_unique<MCScaleVar>(*this);
}

MCCatVar::MCCatVar(std::string name, MCCatNumEncoder categories, bool ordinal, int measure)
    : fName(std::move(name)), fCategories(std::move(categories)), fbOrdinal(ordinal),
      fMeasure(measure) {}

IMCVariable::VariableStorage MCCatVar::GetStorage() const {
    return fCategories.IsString() ? kStringStorage : kNumericStorage;
}

std::unique_ptr<IMCVariable> MCCatVar::Clone() const { return std::make_unique<MCCatVar>(*this); }

MCVarList::MCVarList(const MCVarList& other) {
    fVars.reserve(other.fVars.size());
    for (const auto& v : other.fVars) {
        fVars.push_back(v->Clone());
    }
}

MCVarList& MCVarList::operator=(const MCVarList& other) {
    if (this != &other) {
        MCVarList copy(other);
        fVars = std::move(copy.fVars);
    }
    return *this;
}

int MCVarList::Add(std::unique_ptr<IMCVariable> variable) {
    fVars.push_back(std::move(variable));
    return Size() - 1;
}

const IMCVariable* MCVarList::GetVarAt(int i) const {
    return i >= 0 && i < Size() ? fVars[static_cast<std::size_t>(i)].get() : nullptr;
}

const IMCVariable* MCVarList::GetVariable(const std::string& name) const {
    return GetVarAt(FindVariable(name));
}

int MCVarList::FindVariable(const std::string& name) const {
    for (std::size_t i = 0; i < fVars.size(); ++i) {
        if (fVars[i] && fVars[i]->GetName() == name) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

void MCVarList::Display() const {
    using namespace MCDisplay_800;
    DisplayText("MCVarList display start");
    DisplayI("number of variables", Size());
    for (const auto& v : fVars) {
        const MCCatNumEncoder* cats = v->GetCategorical();
        DisplayText(v->GetName() + ": measure " + std::to_string(v->GetMeasure()) +
                    ", storage " + std::to_string(v->GetStorage()) + ", categories " +
                    std::to_string(cats ? cats->GetNCategories() : 0));
    }
    DisplayText("MCVarList display end");
}

} // namespace MCXML_800
