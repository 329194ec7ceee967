#include "mccommon/records.h"

#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <atomic>

namespace MCXML_800 {

using MCCommon_800::MCMV;

Record::Record(std::size_t nVars) : fValues(nVars, MCMV::Missing()) {}

double Record::operator[](std::size_t i) const {
    return i < fValues.size() ? fValues[i] : MCMV::Missing();
}

Value::Value() : fType(kReal), fReal(MCMV::Missing()) {}
Value::Value(double real) : fType(kReal), fReal(real) {}
Value::Value(std::string text) : fType(kString), fReal(MCMV::Missing()), fText(std::move(text)) {}
Value::Value(std::vector<ListEntry> list)
    : fType(kList), fReal(MCMV::Missing()), fList(std::move(list)) {}

double Value::ConvertToReal() const {
    switch (fType) {
    case kReal:
        return fReal;
    case kString: {
        double x = 0.0;
        return MCCommon_800::ParseDouble(fText, x) ? x : MCMV::Missing();
    }
    case kList:
        break;
    }
    return MCMV::Missing();
}

std::string Value::GetString() const {
    switch (fType) {
    case kReal:
        return MCCommon_800::FormatDefault(fReal);
    case kString:
        return fText;
    case kList:
        break;
    }
    return std::string();
}

double Value::GetListValue(const std::string& name) const {
    if (fType != kList) {
        return MCMV::Missing();
    }
    for (const auto& entry : fList) {
        if (entry.first == name) {
            return entry.second;
        }
    }
    return MCMV::Missing();
}

void Value::ClearPayloads() {
    fText.clear();
    fList.clear();
}

void Value::SetString(std::string text) {
    fType = kString;
    fReal = MCMV::Missing();
    fText = std::move(text);
    fList.clear();
}

void Value::SetList(std::vector<ListEntry> list) {
    fType = kList;
    fReal = MCMV::Missing();
    fText.clear();
    fList = std::move(list);
}

namespace {

//! A layout id no record has had yet (from 1; ids are shared by all threads).
std::uint64_t NewLayoutId() {
    static std::atomic<std::uint64_t> next{1};
    return next.fetch_add(1, std::memory_order_relaxed);
}

} // namespace

ValueRecord::ValueRecord(int capacity) : fLayoutId(NewLayoutId()) {
    if (capacity > 0) {
        fNames.reserve(static_cast<std::size_t>(capacity));
        fValues.reserve(static_cast<std::size_t>(capacity));
    }
}

int ValueRecord::Add(const std::string& name, const Value& value) {
    const int at = IndexOf(name);
    if (at >= 0) {
        fValues[static_cast<std::size_t>(at)] = value;
        return at;
    }
    fNames.push_back(name);
    fValues.push_back(value);
    fLayoutId = NewLayoutId();
    return Size() - 1;
}

int ValueRecord::IndexOf(const std::string& name) const {
    const auto it = std::find(fNames.begin(), fNames.end(), name);
    return it == fNames.end() ? -1 : static_cast<int>(it - fNames.begin());
}

bool ValueRecord::Remove(const std::string& name) {
    const int at = IndexOf(name);
    if (at < 0) {
        return false;
    }
    fNames.erase(fNames.begin() + at);
    fValues.erase(fValues.begin() + at);
    fLayoutId = NewLayoutId();
    return true;
}

void ValueRecord::Clear() {
    fNames.clear();
    fValues.clear();
    fLayoutId = NewLayoutId();
}

} // namespace MCXML_800
