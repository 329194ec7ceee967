// Cases as the host hands them to the component (Record), and the named values exchanged with
// the host's scoring services (Value, ValueRecord).
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace MCXML_800 {

//! One case: the value of every variable, indexed by variable index. A missing value is
//! MCMV::Missing(). Categorical variables carry their category code 0, 1, ... as a double.
class Record {
public:
    Record() = default;
    explicit Record(std::size_t nVars);
    explicit Record(std::vector<double> values) : fValues(std::move(values)) {}

    //! The value of variable `i`; missing when `i` is out of range.
    double operator[](std::size_t i) const;
    double& operator[](std::size_t i) { return fValues[i]; }
    const std::vector<double>& GetAll() const { return fValues; }
    std::vector<double>& GetAll() { return fValues; }
    std::size_t Size() const { return fValues.size(); }

private:
    std::vector<double> fValues; //!< values by variable index
};

//! A real number, a text, or a list of named reals (such as category probabilities).
class Value {
public:
    enum ValueType { kReal = 0, kString = 1, kList = 2 };
    using ListEntry = std::pair<std::string, double>;

    Value();
    explicit Value(double real);
    explicit Value(std::string text);
    explicit Value(const char* text) : Value(std::string(text)) {}
    explicit Value(std::vector<ListEntry> list);

    ValueType GetType() const { return fType; }
    //! The real number; a text that reads wholly as a number gives that number; otherwise
    //! (and for a list) the missing value.
    double GetReal() const { return fType == kReal ? fReal : ConvertToReal(); }
    //! The text; a real is written with the default stream formatting; a list gives "".
    std::string GetString() const;
    //! The stored text without a copy: "" unless the value is a text.
    const std::string& GetText() const { return fText; }
    const std::vector<ListEntry>& GetList() const { return fList; }
    //! The value of the list entry named `name`, missing when absent or not a list.
    double GetListValue(const std::string& name) const;

    //! Once a value is a real, setting it again is a store (scoring sets every input per case).
    void SetReal(double real) {
        if (fType != kReal) {
            ClearPayloads();
            fType = kReal;
        }
        fReal = real;
    }
    void SetString(std::string text);
    void SetList(std::vector<ListEntry> list);

private:
    //! GetReal of a text or a list.
    double ConvertToReal() const;
    //! Empties the text and the list.
    void ClearPayloads();

    ValueType fType;              //!< which payload is in use
    double fReal;                 //!< payload of a real
    std::string fText;            //!< payload of a text
    std::vector<ListEntry> fList; //!< payload of a list
};

//! An ordered list of named values; names are unique within a record.
class ValueRecord {
public:
    //! `capacity` reserves room for that many values.
    explicit ValueRecord(int capacity = 0);

    //! Appends `value` under `name`, or replaces the value already stored under that name.
    //! Returns the position of the value.
    int Add(const std::string& name, const Value& value);
    int Size() const { return static_cast<int>(fNames.size()); }
    //! The position of `name`, or -1.
    int IndexOf(const std::string& name) const;
    bool Contains(const std::string& name) const { return IndexOf(name) >= 0; }
    //! Removes the value named `name`; false when there is none.
    bool Remove(const std::string& name);
    void Clear();
    const std::string& GetName(int i) const { return fNames[static_cast<std::size_t>(i)]; }
    Value& operator[](int i) { return fValues[static_cast<std::size_t>(i)]; }
    const Value& operator[](int i) const { return fValues[static_cast<std::size_t>(i)]; }
    //! Names the record's layout: a new number (never 0) whenever its names change (a new name
    //! added, one removed, Clear), kept by copies. Two records of the same layout id hold the
    //! same names in the same order, so a scorer that found its inputs' places in one record
    //! can skip looking them up again, case after case.
    std::uint64_t GetLayoutId() const { return fLayoutId; }

private:
    std::vector<std::string> fNames; //!< names in order
    std::vector<Value> fValues;      //!< values parallel to the names
    std::uint64_t fLayoutId;         //!< see GetLayoutId
};

} // namespace MCXML_800
