// MCPlanCorrCells: the correlation cells of a plan text through the Xerces-C SAX2 parser, set
// up as the DOM parse is (well-formedness only, no DTD or external entity, the entity
// expansion and nesting caps), and the text without them for the DOM parse.
#include "simulation_common/mcplanxmlhandler.h"

#include "mccommon/mcmv.h"
#include "mcxml/mcxmlinit.h"
#include "mcxml/mcxmlreadwrite.h"
#include "mcxml/mcxmlutil.h"

#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/sax2/Attributes.hpp>
#include <xercesc/sax2/DefaultHandler.hpp>
#include <xercesc/sax2/SAX2XMLReader.hpp>
#include <xercesc/sax2/XMLReaderFactory.hpp>
#include <xercesc/util/SecurityManager.hpp>
#include <xercesc/util/XMLUniDefs.hpp>

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <unordered_map>

namespace MCMCSP_800 {

namespace {

//! Entity references a document may expand, as for the DOM parse.
constexpr XMLSize_t kEntityExpansionLimit = 1000;

//! Thrown from the handler to stop the parse at a nesting deeper than the DOM parse allows.
struct TooDeep : std::runtime_error {
    TooDeep() : std::runtime_error("too deep") {}
};

// ---- The content range of the first CorrMatrix under the root -------------------------------

//! The name of the tag that starts at `i` (just after '<'), without its prefix.
std::string LocalTagName(const std::string& text, std::size_t i) {
    std::size_t end = i;
    while (end < text.size() && std::strchr(" \t\r\n/>", text[end]) == nullptr) {
        ++end;
    }
    const std::string name = text.substr(i, end - i);
    const std::size_t colon = name.rfind(':');
    return colon == std::string::npos ? name : name.substr(colon + 1);
}

//! The position just after the '>' that closes the tag starting at `i`, quoted values skipped;
//! `selfClosing` tells whether it ended with "/>".
std::size_t TagEnd(const std::string& text, std::size_t i, bool& selfClosing) {
    char quote = 0;
    for (; i < text.size(); ++i) {
        const char c = text[i];
        if (quote != 0) {
            quote = c == quote ? 0 : quote;
        } else if (c == '"' || c == '\'') {
            quote = c;
        } else if (c == '>') {
            selfClosing = i > 0 && text[i - 1] == '/';
            return i + 1;
        }
    }
    selfClosing = false;
    return text.size();
}

// Finds [begin, end), the content of the first CorrMatrix element that is a child of the root,
// in a text the SAX parser has found well-formed. Comments, CDATA sections, processing
// instructions and the document type declaration are skipped as units. False when there is
// none, or it is empty (<CorrMatrix .../>).
bool FindCorrMatrixContent(const std::string& text, std::size_t& begin, std::size_t& end) {
    int depth = 0;
    std::size_t i = 0;
    bool inMatrix = false;
    const auto skipPast = [&](const char* stop) {
        const std::size_t at = text.find(stop, i);
        i = at == std::string::npos ? text.size() : at + std::strlen(stop);
    };
    while ((i = text.find('<', i)) != std::string::npos) {
        const std::size_t tag = i;
        if (text.compare(i, 4, "<!--") == 0) {
            skipPast("-->");
        } else if (text.compare(i, 9, "<![CDATA[") == 0) {
            skipPast("]]>");
        } else if (text.compare(i, 2, "<?") == 0) {
            skipPast("?>");
        } else if (text.compare(i, 2, "<!") == 0) {
            // A document type declaration: its internal subset ends with "]>".
            const std::size_t bracket = text.find('[', i);
            skipPast(bracket < text.find('>', i) ? "]>" : ">");
        } else if (text.compare(i, 2, "</") == 0) {
            skipPast(">");
            --depth;
            if (inMatrix && depth == 1) {
                end = tag;
                return true;
            }
        } else {
            bool selfClosing = false;
            const std::string name = LocalTagName(text, i + 1);
            i = TagEnd(text, i + 1, selfClosing);
            if (!inMatrix && depth == 1 && name == "CorrMatrix") {
                if (selfClosing) {
                    return false;
                }
                inMatrix = true;
                begin = i;
            }
            depth += selfClosing ? 0 : 1;
        }
    }
    return false;
}

} // namespace

// ---- The SAX handler ------------------------------------------------------------------------

//! Collects the cells of the first CorrMatrix under the root into an MCPlanCorrCells.
class MCPlanCorrCellsHandler : public xercesc::DefaultHandler {
public:
    explicit MCPlanCorrCellsHandler(MCPlanCorrCells& cells)
        : fCells(cells), fRowVar(MCXML_800::ToUTF16("rowVar")),
          fColVar(MCXML_800::ToUTF16("colVar")), fValue(MCXML_800::ToUTF16("value")) {}

    void startElement(const XMLCh* const, const XMLCh* const localname, const XMLCh* const,
                      const xercesc::Attributes& attributes) override {
        if (++fDepth > MCXML_800::MCXMLReadWrite::kMaxElementDepth) {
            throw TooDeep();
        }
        if (fDepth == 2 && !fCells.fbHasMatrix && Is(localname, "CorrMatrix")) {
            fCells.fbHasMatrix = true;
            fbInMatrix = true;
        } else if (fbInMatrix && fDepth == 3 && Is(localname, "CorrCell")) {
            ++fCells.fCellElements;
            ReadCell(attributes);
        }
    }

    void endElement(const XMLCh* const, const XMLCh* const, const XMLCh* const) override {
        if (fDepth-- == 2) {
            fbInMatrix = false;
        }
    }

    void fatalError(const xercesc::SAXParseException& e) override {
        if (fCells.fErrorMessage.empty()) {
            fCells.fErrorMessage = "line " + std::to_string(e.getLineNumber()) + ", column " +
                                   std::to_string(e.getColumnNumber()) + ": " +
                                   MCXML_800::ToUTF8(e.getMessage());
        }
        throw e;
    }
    void error(const xercesc::SAXParseException& e) override { fatalError(e); }

private:
    static bool Is(const XMLCh* name, const char* expected) {
        return MCXML_800::ToUTF8(name) == expected;
    }

    //! The position of `name` among the names, adding it when new.
    std::uint32_t Intern(const std::string& name) {
        const auto [it, added] =
            fPositions.emplace(name, static_cast<std::uint32_t>(fCells.fvNames.size()));
        if (added) {
            fCells.fvNames.push_back(name);
        }
        return it->second;
    }

    // As the reader takes a cell from the DOM: both names required and not empty; a cell
    // without a value is skipped; a value is a finite xsd:double, "." or NaN (missing).
    void ReadCell(const xercesc::Attributes& attributes) {
        const XMLCh* row = attributes.getValue(fRowVar.c_str());
        const XMLCh* col = attributes.getValue(fColVar.c_str());
        if (row == nullptr || col == nullptr || *row == 0 || *col == 0) {
            fCells.fbReadable = false;
            return;
        }
        const XMLCh* text = attributes.getValue(fValue.c_str());
        if (text == nullptr) {
            return;
        }
        double value = MCCommon_800::MCMV::Missing();
        if (!(text[0] == xercesc::chPeriod && text[1] == 0)) {
            try {
                const MCXMLDouble number(text);
                if (number.GetLiteralType() == xercesc::XMLDouble::Normal) {
                    value = number.GetValue();
                } else if (number.GetLiteralType() != xercesc::XMLDouble::NaN) {
                    fCells.fbReadable = false;
                    return;
                }
            } catch (...) {
                fCells.fbReadable = false;
                return;
            }
        }
        MCPlanCorrCells::Cell cell;
        cell.fRow = Intern(MCXML_800::ToUTF8(row));
        cell.fCol = Intern(MCXML_800::ToUTF8(col));
        cell.fValue = value;
        fCells.fvCells.push_back(cell);
    }

    MCPlanCorrCells& fCells;                                   //!< what is filled
    std::unordered_map<std::string, std::uint32_t> fPositions; //!< name -> position
    MCXML_800::UTF16String fRowVar;                            //!< "rowVar"
    MCXML_800::UTF16String fColVar;                            //!< "colVar"
    MCXML_800::UTF16String fValue;                             //!< "value"
    int fDepth = 0;                                            //!< open elements
    bool fbInMatrix = false;                                   //!< inside the first CorrMatrix
};

bool MCPlanCorrCells::Read(const std::string& text, std::string& rest) {
    *this = MCPlanCorrCells();
    if (!MCXML_800::EnsureXMLPlatform()) {
        fErrorMessage = "the XML platform is unusable";
        return false;
    }
    try {
        MCPlanCorrCellsHandler handler(*this);
        xercesc::SecurityManager security;
        security.setEntityExpansionLimit(kEntityExpansionLimit);
        std::unique_ptr<xercesc::SAX2XMLReader> parser(
            xercesc::XMLReaderFactory::createXMLReader());
        using xercesc::XMLUni;
        parser->setFeature(XMLUni::fgSAX2CoreNameSpaces, true);
        parser->setFeature(XMLUni::fgSAX2CoreValidation, false);
        parser->setFeature(XMLUni::fgXercesSchema, false);
        parser->setFeature(XMLUni::fgXercesLoadSchema, false);
        parser->setFeature(XMLUni::fgXercesLoadExternalDTD, false);
        parser->setFeature(XMLUni::fgXercesDisableDefaultEntityResolution, true);
        parser->setProperty(XMLUni::fgXercesSecurityManager, &security);
        parser->setProperty(XMLUni::fgXercesScannerName,
                            const_cast<XMLCh*>(XMLUni::fgWFXMLScanner));
        parser->setContentHandler(&handler);
        parser->setErrorHandler(&handler);
        xercesc::MemBufInputSource input(reinterpret_cast<const XMLByte*>(text.data()), text.size(),
                                         "plan", false);
        try {
            parser->parse(input);
        } catch (const TooDeep&) {
            fErrorMessage = "elements are nested deeper than " +
                            std::to_string(MCXML_800::MCXMLReadWrite::kMaxElementDepth) + " levels";
            return false;
        }
    } catch (...) {
        if (fErrorMessage.empty()) {
            fErrorMessage = "the document could not be parsed";
        }
        return false;
    }
    if (!fErrorMessage.empty()) {
        return false;
    }
    std::size_t begin = 0;
    std::size_t end = 0;
    if (!fbHasMatrix || !FindCorrMatrixContent(text, begin, end)) {
        rest = text;
        return true;
    }
    rest.clear();
    rest.reserve(begin + (text.size() - end) + 64);
    rest.append(text, 0, begin);
    rest.append(static_cast<std::size_t>(std::count(text.begin() + static_cast<long>(begin),
                                                    text.begin() + static_cast<long>(end), '\n')),
                '\n');
    rest.append(text, end, std::string::npos);
    return true;
}

} // namespace MCMCSP_800
