// The host's description of the fields of a dataset: each variable's name, measurement kind,
// value storage and, for categorical variables, its categories and the encoder between
// category values and codes 0, 1, ...
#pragma once

#include <memory>
#include <string>
#include <vector>

namespace MCXML_800 {

//! Maps the categories of one variable to the codes 0, 1, ... in category order, and back.
//! Categories are either numbers (numeric variables) or texts (string variables). The text of
//! a numeric category is its number in the default stream form ("1", "2.5").
class MCCatNumEncoder {
public:
    MCCatNumEncoder() = default;
    explicit MCCatNumEncoder(std::vector<double> numbers);
    explicit MCCatNumEncoder(std::vector<std::string> texts);

    int GetNCategories() const;
    bool IsString() const { return fbString; }
    //! The code of the category with this number (numeric categories) or -1.
    int Encode(double number) const;
    //! The code of the category with this text (exact match) or -1. A numeric encoder also
    //! accepts the text of a number equal to one of its categories.
    int Encode(const std::string& text) const;
    //! The text of category `code`; "" when out of range.
    std::string GetCategoryText(int code) const;
    //! The number of category `code`; missing for string categories or out of range.
    double GetCategoryNumber(int code) const;
    //! Appends a category unless it is already there; returns its code.
    int AddCategory(double number);
    int AddCategory(const std::string& text);

private:
    bool fbString = false;             //!< categories are texts
    std::vector<double> fNumbers;      //!< numeric categories in code order
    std::vector<std::string> fTexts;   //!< text categories in code order
};

//! A variable of the host's dataset.
class IMCVariable {
public:
    //! How values are stored. The component reads numbers (2) and texts (3); the other codes
    //! are the host's storage kinds that a plan file may name.
    enum VariableStorage : int {
        kNoStorage = 0, kIntegerStorage = 1, kNumericStorage = 2, kStringStorage = 3,
        kDateStorage = 4, kTimeStorage = 5, kTimestampStorage = 6
    };
    //! Measurement kinds: 1 and 4 are scale (continuous) kinds, 2 and 3 categorical kinds
    //! (nominal and ordered-categorical); 0 is unknown.
    enum MeasureKind { kUnknownKind = 0, kScaleKind = 1, kNominalKind = 2, kOrderedKind = 3,
                       kContinuousKind = 4 };

    virtual ~IMCVariable() = default;
    virtual const std::string& GetName() const = 0;
    virtual int GetMeasure() const = 0;
    virtual VariableStorage GetStorage() const = 0;
    //! The categorical view of the variable (its categories and encoder), null when the
    //! variable has none.
    virtual const MCCatNumEncoder* GetCategorical() const = 0;
    virtual std::unique_ptr<IMCVariable> Clone() const = 0;
};

//! A scale (continuous) variable, or any variable without categories.
class MCScaleVar : public IMCVariable {
public:
    MCScaleVar(std::string name, int measure = kScaleKind,
               VariableStorage storage = kNumericStorage);
    const std::string& GetName() const override { return fName; }
    int GetMeasure() const override { return fMeasure; }
    VariableStorage GetStorage() const override { return fStorage; }
    const MCCatNumEncoder* GetCategorical() const override { return nullptr; }
    std::unique_ptr<IMCVariable> Clone() const override;

private:
    std::string fName;        //!< variable name
    int fMeasure;             //!< measurement kind
    VariableStorage fStorage; //!< value storage
};

//! A categorical variable with its categories; the ordinal flag marks ordered categories that
//! the component treats as an ordinal (discrete) level.
class MCCatVar : public IMCVariable {
public:
    MCCatVar(std::string name, MCCatNumEncoder categories, bool ordinal = false,
             int measure = kNominalKind);
    const std::string& GetName() const override { return fName; }
    int GetMeasure() const override { return fMeasure; }
    VariableStorage GetStorage() const override;
    const MCCatNumEncoder* GetCategorical() const override { return &fCategories; }
    std::unique_ptr<IMCVariable> Clone() const override;

    bool GetOrdinalFlag() const { return fbOrdinal; }
    void SetOrdinalFlag(bool ordinal) { fbOrdinal = ordinal; }
    MCCatNumEncoder& GetEncoder() { return fCategories; }

private:
    std::string fName;           //!< variable name
    MCCatNumEncoder fCategories; //!< categories in code order
    bool fbOrdinal;              //!< ordered categories
    int fMeasure;                //!< measurement kind (2 or 3)
};

//! The host's list of variables, in index order. A value: copies are deep.
class MCVarList {
public:
    MCVarList() = default;
    MCVarList(const MCVarList& other);
    MCVarList& operator=(const MCVarList& other);
    MCVarList(MCVarList&&) = default;
    MCVarList& operator=(MCVarList&&) = default;

    //! Appends a variable; returns its index.
    int Add(std::unique_ptr<IMCVariable> variable);
    int Size() const { return static_cast<int>(fVars.size()); }
    //! Variable `i`, null when out of range.
    const IMCVariable* GetVarAt(int i) const;
    //! The variable named `name`, null when absent.
    const IMCVariable* GetVariable(const std::string& name) const;
    //! The index of the variable named `name`, or -1.
    int FindVariable(const std::string& name) const;
    //! Prints one line per variable to the display stream.
    void Display() const;

private:
    std::vector<std::unique_ptr<IMCVariable>> fVars; //!< owned variables in index order
};

} // namespace MCXML_800
