// The plan file: a simulation plan (SPCSettings) written as an XML document with root
// `SimulationPlan`, and such a document read back into a plan; and the fitting statistics
// document (root `FitStats`) written from the results of a distribution-fitting run.
//
// The host asks MCPlanXMLHandler to write a plan into a string (WritePlanFile) and later hands
// the text, a stream or a parsed document back to be read (ParsePlanFile). When the handler was
// made with the host's variable list, a plan that has been read is completed and checked
// against it. The documents are built and read through the XML service functions over the
// Xerces-C DOM; the same handler also writes the fitting statistics document, reusing the
// correlation and contingency-table builders, the missing-value rule (".") and the
// serialisation step.
//
// The writer's builders raise an internal error for an element or attribute that cannot be
// made (a text holding a character XML cannot carry), which the entry point turns into false:
// such a document would lack the item and could not be read back. The fitting statistics
// writer is in mcplanxmlhandler.cpp, beside the element and attribute helpers it shares.
//
// Nothing leaves these operations as an exception: every entry point catches what the XML
// library or the allocator throws and reports false. A false read leaves whatever was added to
// the plan before the failure in it; the caller treats such a plan as unusable.
#pragma once

#include "mccommon/variables.h"
#include "simulation_common/simulatespecs.h"
#include "simulation_common/spcsettings.h"

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/util/XMLDouble.hpp>

#include <cstdint>
#include <ctime>
#include <istream>
#include <string>
#include <vector>

namespace MCMCSP_800 {

//! An xsd:double literal parsed by Xerces-C: its kind (a normal number, NaN, or an infinity,
//! which is also what an overflowing literal becomes) and its value. Construction throws the
//! library's NumberFormatException for a text that is not such a literal.
class MCXMLDouble : public xercesc::XMLDouble {
public:
    //! Parses `text` (UTF-16) with the library's default memory manager.
    explicit MCXMLDouble(const XMLCh* text);
    ~MCXMLDouble() override;

    //! Normal, NaN, PosINF or NegINF.
    LiteralType GetLiteralType() const { return getType(); }
    //! The value of a normal literal.
    double GetValue() const { return getValue(); }
};

//! The correlation cells of a plan document, read from its text by a streaming (SAX) parser.
//! A plan of N correlated inputs lists N(N+1)/2 cells, and as DOM nodes they take some twenty
//! times the bytes of their text (a 3,000-input plan: 240 MB of text, over 6 GB of nodes). So
//! the cells of the first CorrMatrix under the root are read here, 16 bytes each, and the rest
//! of the document, with that element's content blanked out, goes to the DOM parser; the
//! handler then takes the cells from here (SetCorrCells).
class MCPlanCorrCells {
public:
    //! One cell with a value: the positions of its variables in GetNames, and the value (the
    //! missing value for "." or NaN).
    struct Cell {
        std::uint32_t fRow = 0; //!< rowVar
        std::uint32_t fCol = 0; //!< colVar
        double fValue = 0.0;    //!< value
    };

    //! Reads `text`. Sets `rest` to `text` with the content of the first CorrMatrix element
    //! under the root replaced by its line ends (so that the lines of what follows stay where
    //! they are). False, with GetErrorMessage "line L, column C: what" (or a message without
    //! a place), when the text is not a well-formed document.
    bool Read(const std::string& text, std::string& rest);

    //! True when the document has a CorrMatrix under its root.
    bool HasMatrix() const { return fbHasMatrix; }
    //! Number of CorrCell elements of the matrix, with a value or without.
    std::size_t GetCellElementCount() const { return fCellElements; }
    //! False when a cell lacks a variable name or holds a value that is not a finite number,
    //! "." or NaN: the reader then refuses the plan, as it does reading the cell from a DOM.
    bool AreCellsReadable() const { return fbReadable; }
    const std::vector<std::string>& GetNames() const { return fvNames; }
    //! The cells with a value, in document order.
    const std::vector<Cell>& GetCells() const { return fvCells; }
    const std::string& GetErrorMessage() const { return fErrorMessage; }

private:
    friend class MCPlanCorrCellsHandler;

    bool fbHasMatrix = false;         //!< a CorrMatrix was found
    bool fbReadable = true;           //!< every cell could be read
    std::size_t fCellElements = 0;    //!< CorrCell elements seen
    std::vector<std::string> fvNames; //!< variable names, each once, in order of appearance
    std::vector<Cell> fvCells;        //!< cells with a value
    std::string fErrorMessage;        //!< why Read failed
};

class MCPlanXMLHandler {
public:
    //! A handler that completes and validates plans it reads against `vars`.
    MCPlanXMLHandler(const MCXML_800::MCVarList& vars, const std::string& tag,
                     bool selectedFitOnly);
    //! A handler without variable list.
    MCPlanXMLHandler(const std::string& tag, bool selectedFitOnly);
    //! A handler without variable list, tag or fit selection.
    MCPlanXMLHandler();
    virtual ~MCPlanXMLHandler();
    MCPlanXMLHandler(const MCPlanXMLHandler&) = default;
    MCPlanXMLHandler& operator=(const MCPlanXMLHandler&) = default;

    // ---- Writing ---------------------------------------------------------------------------

    //! Writes the plan file of `plan` into `out`; true on success. On failure `out` keeps its
    //! content unless the final serialisation step was reached.
    bool WritePlanFile(std::string& out, const SPCSettings* plan);
    //! Writes the fitting statistics document of `results` into `out`: per fitted field its
    //! allowed candidates with parameters and test statistics, then the covariates'
    //! correlations and, when the fitting settings export it, the factors' contingency table.
    //! For a continuous field only the statistic of the chosen test is written when the
    //! handler was made with `selectedFitOnly`, else both. True on success; on failure `out`
    //! keeps its content unless the final serialisation step was reached.
    bool WriteFittingOutStats(std::string& out, const DFCOutputStats* results);

    // ---- Reading ---------------------------------------------------------------------------

    //! Reads `doc` into the caller's plan `*plan`, adding to what it holds; completes and
    //! validates it against the variable list when the handler has one. True on success,
    //! after which GetSPCSettings returns `plan`.
    bool ParsePlanFile(const xercesc::DOMDocument* doc, SPCSettings*& plan);
    //! Parses the document text `source` and reads it as above.
    bool ParsePlanFile(const std::string& source, SPCSettings*& plan);
    //! Reads `source` to its end, parses it and reads it as above.
    bool ParsePlanFile(std::istream& source, SPCSettings*& plan);
    //! The plan of the last successful read; null before one.
    const SPCSettings* GetSPCSettings() const { return fSettings; }
    //! Takes the correlation cells of the next documents read from `cells` (read from the same
    //! text) instead of the document's CorrMatrix children; null goes back to the children.
    //! `cells` must outlive the reads.
    void SetCorrCells(const MCPlanCorrCells* cells) { fpCorrCells = cells; }

    //! Appends the `value` of every `Probability` child of `parent` to `probs`, in order. False
    //! at the first value that cannot be read (the values before it stay appended); true
    //! otherwise, also without any `Probability` child. A missing value (".", "NaN") reads as
    //! the missing value; an infinity cannot be read.
    static bool HandleProbabilityEle(const xercesc::DOMElement* parent, std::vector<double>& probs);
    //! As above; when every value was read and there is at least one, also adds `probs` to
    //! `dist` as the list parameter `name`.
    static bool HandleProbabilityEle(const xercesc::DOMElement* parent, DistInfoElem*& dist,
                                     const std::string& name, std::vector<double>& probs);

    // ---- Shared by the document writers ------------------------------------------------------

    //! Serialises `doc` into `out` as UTF-8 text, without indentation or added line breaks
    //! and with default content kept. `out` is emptied first. True on success.
    static bool WriteFromDOM(std::string& out, const xercesc::DOMDocument* doc);
    //! The local date and time now, as the plan's time stamp ("2012.03.05 9:07").
    static std::string GetCurrentTime();
    //! The time stamp of `local`: year.month.day with two-digit month and day, a blank, the
    //! hour without leading zero, ":" and the two-digit minute.
    static std::string FormatTimeStamp(const std::tm& local);
    //! The version this handler writes on a plan's root ("21.0.0.0"). The reader does not
    //! examine a document's version or namespace; a host that wants them checked compares.
    static const char* GetPlanVersion();
    //! The namespace of the plan documents this handler writes.
    static const char* GetPlanNamespace();

private:
    // ---- Plan file builders: each fills the element it is given; the caller appends it ----

    bool CreateModelFilesEle(xercesc::DOMElement* modelFiles, const SPCSettings* plan);
    bool AddTargetElement(xercesc::DOMElement* target, const SPCSettings::ModelFileTarget& info);
    bool AddSimulatedFieldsEle(xercesc::DOMElement* simulatedFields,
                               const std::vector<SimInputSpecs>& inputs);
    bool AddCategoricalDist(xercesc::DOMElement*& distElement, const SimInputSpecs& input);
    bool AddUserRangeDist(xercesc::DOMElement*& distElement, const SimInputSpecs& input);
    void AddEmpiricalDist(xercesc::DOMElement* distElement, const SimInputSpecs& input);
    void AddParameterSets(xercesc::DOMElement* distElement, const SimInputSpecs& input);
    bool AddFixedFieldsEle(xercesc::DOMElement* fixedFields,
                           const std::vector<FixedInputSpecs>& inputs);
    bool AddSettingsEle(xercesc::DOMElement* settings, const SPCSettings* plan);

    // ---- Builders shared with the fitting statistics document ------------------------------

    //! `numberOfCells`, `locked` and a place holder that the text of the cells (one
    //! `CorrCell` per cell, written beside the DOM) replaces once the document is serialised.
    bool AddCorrMetrixElement(xercesc::DOMElement* corrMatrix, std::size_t nCells, bool locked);
    //! The counts, `CrossFactors` and one `TableCell` per row.
    bool AddCrossTabMetrixElement(xercesc::DOMElement* table,
                                  const std::vector<std::string>& factors,
                                  const std::vector<std::vector<std::string>>& rows,
                                  const std::vector<double>& probs);
    //! Sets `name` to "." for the missing value, else to the number; true when it was set.
    static bool SetDoubleAttribute(xercesc::DOMElement* element, const std::string& name,
                                   double value);

    // ---- Fitting statistics builders ---------------------------------------------------------

    //! One `SimulatedField` per record with a best distribution, covariate records first.
    bool AddStatsInforEle(xercesc::DOMElement* simulatedFields,
                          const std::vector<DFCOutputStats::DFCVarDistInfo>& covariates,
                          const std::vector<DFCOutputStats::DFCVarDistInfo>& factors,
                          MCSPConst::GoodFitType gfType, bool exportCrosstabs);
    //! Appends an "AnderDarling" `Fit` to `distElement`; the result of the append.
    bool AddADFitStats(xercesc::DOMElement*& distElement,
                       const DFCOutputStats::DFCVarDistElement& element);
    //! Appends a "KolmogSmirn" `Fit` to `distElement`; the result of the append.
    bool AddKSFitStats(xercesc::DOMElement*& distElement,
                       const DFCOutputStats::DFCVarDistElement& element);
    //! Appends a `Fit` named `fitName` with its statistic and p-value; the result of the append.
    static bool AddFitElement(xercesc::DOMElement* parent, const std::string& fitName,
                              double fitValue, double pValue);
    //! The parameters of one candidate inside its distribution element, by type.
    static void AddFittedDistParams(xercesc::DOMElement* distElement,
                                    const DFCOutputStats::DFCVarDistElement& element,
                                    bool exportCrosstabs);

    // ---- Plan file readers: false ends the read --------------------------------------------

    bool ParseDocument(const xercesc::DOMDocument* doc, SPCSettings*& plan);
    bool HandleModelFilesEle(xercesc::DOMElement* modelFiles, SPCSettings*& plan);
    bool HandleTargetElement(xercesc::DOMElement* element, SPCSettings::ModelFileTarget& target);
    bool HandleSimulatedFields(xercesc::DOMElement* simulatedFields, SPCSettings*& plan);
    bool HandleSimulatedField(xercesc::DOMElement* field, SimInputSpecs& input);
    bool HandleFixedFieldElement(xercesc::DOMElement* fixedFields, SPCSettings*& plan);
    bool HandleCorrMetrixElement(xercesc::DOMElement* corrMatrix, SPCSettings*& plan);
    bool HandleCrossTabMetrixElement(xercesc::DOMElement* table, SPCSettings*& plan);
    bool HandleSettingsElement(xercesc::DOMElement* settings, SPCSettings*& plan);

    bool fSelectedFitOnly = false;    //!< fitting statistics: write only the chosen fit test
    std::string fTag;                 //!< the host's tag, kept and copied
    SPCSettings* fSettings = nullptr; //!< plan of the last successful read, not owned
    MCXML_800::MCVarList fVarList;    //!< the host's variables, when given
    bool fHasVarList = false;         //!< complete and validate plans against fVarList
    const MCPlanCorrCells* fpCorrCells = nullptr; //!< cells read by the streaming parser
};

} // namespace MCMCSP_800
