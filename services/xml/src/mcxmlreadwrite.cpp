#include "mcxml/mcxmlreadwrite.h"

#include "mcxmlinternal.h"

#include <xercesc/dom/DOMConfiguration.hpp>
#include <xercesc/dom/DOMImplementation.hpp>
#include <xercesc/dom/DOMLSParserFilter.hpp>
#include <xercesc/dom/DOMLSResourceResolver.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/framework/Wrapper4InputSource.hpp>
#include <xercesc/util/SecurityManager.hpp>
#include <xercesc/util/XMLUni.hpp>

#include <iterator>

namespace MCXML_800 {

namespace {

//! System id of in-memory documents; it names no file, so nothing relative to it resolves.
constexpr char kBufferId[] = "mcxml-buffer";

//! Entity expansions allowed. Documents with a document type are refused before any entity
//! can be declared, so this is a second wall only.
constexpr XMLSize_t kEntityExpansionLimit = 1000;

// Answers every request for an external resource (DTD, entity, schema) with nothing; with the
// parser's default resolution switched off, nothing is then opened or fetched.
class RefuseResources : public xercesc::DOMLSResourceResolver {
public:
    xercesc::DOMLSInput* resolveResource(const XMLCh* /*resourceType*/,
                                         const XMLCh* /*namespaceUri*/, const XMLCh* /*publicId*/,
                                         const XMLCh* /*systemId*/,
                                         const XMLCh* /*baseURI*/) override {
        return nullptr;
    }
};

// Tracks element depth during the parse: startElement is called as an element opens and
// acceptNode (asked for elements only) as it closes. Deeper than the cap, the parse is
// interrupted, which the LS parser reports by throwing.
class DepthLimit : public xercesc::DOMLSParserFilter {
public:
    FilterAction startElement(xercesc::DOMElement* /*node*/) override {
        if (++fDepth > MCXMLReadWrite::kMaxElementDepth) {
            fbExceeded = true;
            return FILTER_INTERRUPT;
        }
        return FILTER_ACCEPT;
    }
    FilterAction acceptNode(xercesc::DOMNode* /*node*/) override {
        --fDepth;
        return FILTER_ACCEPT;
    }
    xercesc::DOMNodeFilter::ShowType getWhatToShow() const override {
        return xercesc::DOMNodeFilter::SHOW_ELEMENT;
    }

    //! True when the cap stopped the parse.
    bool IsExceeded() const { return fbExceeded; }

private:
    //! Number of elements open at this point of the text.
    int fDepth = 0;
    //! True once an element went past the cap.
    bool fbExceeded = false;
};

// Sets up `config` for a well-formedness parse that reads nothing but the given text.
void ConfigureSafeParse(xercesc::DOMConfiguration* config, xercesc::DOMErrorHandler* errors,
                        xercesc::DOMLSResourceResolver* resolver,
                        xercesc::SecurityManager* security) {
    using xercesc::XMLUni;
    config->setParameter(XMLUni::fgDOMErrorHandler, errors);
    config->setParameter(XMLUni::fgDOMResourceResolver, resolver);
    // The scanner that checks well-formedness only: no DTD or schema grammar is ever built.
    config->setParameter(XMLUni::fgXercesScannerName, XMLUni::fgWFXMLScanner);
    config->setParameter(XMLUni::fgDOMDisallowDoctype, true);
    config->setParameter(XMLUni::fgXercesLoadExternalDTD, false);
    config->setParameter(XMLUni::fgXercesDisableDefaultEntityResolution, true);
    config->setParameter(XMLUni::fgXercesSecurityManager, security);
    config->setParameter(XMLUni::fgDOMValidate, false);
    config->setParameter(XMLUni::fgDOMValidateIfSchema, false);
    config->setParameter(XMLUni::fgXercesSchema, false);
    config->setParameter(XMLUni::fgXercesLoadSchema, false);
    config->setParameter(XMLUni::fgDOMNamespaces, true);
}

} // namespace

MCXMLReadWrite::MCXMLReadWrite() = default;
MCXMLReadWrite::~MCXMLReadWrite() = default;
MCXMLReadWrite::MCXMLReadWrite(MCXMLReadWrite&&) noexcept = default;
MCXMLReadWrite& MCXMLReadWrite::operator=(MCXMLReadWrite&&) noexcept = default;

bool MCXMLReadWrite::ParseToDOM(const std::string& text) {
    Reset();
    return ParseBytes(text.data(), text.size());
}

bool MCXMLReadWrite::ParseToDOM(std::istream& source) {
    Reset();
    std::string text;
    const bool read = detail::Guarded(
        false,
        [&] {
            if (!source.good()) {
                detail::NoteFailure(&fErrorMessage, std::string("the stream is not readable"));
                return false;
            }
            text.assign(std::istreambuf_iterator<char>(source), std::istreambuf_iterator<char>());
            if (source.bad()) {
                detail::NoteFailure(&fErrorMessage, std::string("reading the stream failed"));
                return false;
            }
            return true;
        },
        &fErrorMessage);
    return read && ParseBytes(text.data(), text.size());
}

xercesc::DOMDocument* MCXMLReadWrite::GetDocument() const {
    return fpDocument;
}

const std::string& MCXMLReadWrite::GetErrorMessage() const {
    return fErrorMessage;
}

bool MCXMLReadWrite::ParseBytes(const char* bytes, std::size_t size) {
    return detail::Guarded(
        false,
        [&] {
            xercesc::DOMImplementation* implementation = detail::GetLSImplementation();
            if (implementation == nullptr) {
                detail::NoteFailure(&fErrorMessage, std::string("the XML platform is unusable"));
                return false;
            }
            // Everything the parser points to is declared before it, so outlives it.
            detail::ErrorCollector errors;
            RefuseResources resolver;
            DepthLimit depth;
            xercesc::SecurityManager security;
            security.setEntityExpansionLimit(kEntityExpansionLimit);
            xercesc::MemBufInputSource buffer(reinterpret_cast<const XMLByte*>(bytes), size,
                                              kBufferId, false);
            xercesc::Wrapper4InputSource input(&buffer, false);

            std::unique_ptr<xercesc::DOMLSParser, XercesRelease> parser(
                implementation->createLSParser(xercesc::DOMImplementationLS::MODE_SYNCHRONOUS,
                                               nullptr));
            ConfigureSafeParse(parser->getDomConfig(), &errors, &resolver, &security);
            parser->setFilter(&depth);

            xercesc::DOMDocument* document = nullptr;
            try {
                document = parser->parse(&input);
            } catch (const xercesc::DOMException&) {
                // The depth cap interrupts by throwing; other reasons are passed on.
                if (!depth.IsExceeded()) {
                    throw;
                }
            }
            if (depth.IsExceeded()) {
                fErrorMessage = "elements are nested deeper than " +
                                std::to_string(kMaxElementDepth) + " levels";
                return false;
            }
            if (errors.HasErrors() || document == nullptr ||
                document->getDocumentElement() == nullptr) {
                fErrorMessage = errors.HasErrors() ? errors.GetFirstMessage()
                                                   : std::string("no document element");
                return false;
            }
            // The filter and handlers are about to go; the parser keeps only the document.
            parser->setFilter(nullptr);
            parser->getDomConfig()->setParameter(xercesc::XMLUni::fgDOMErrorHandler,
                                                 static_cast<const void*>(nullptr));
            parser->getDomConfig()->setParameter(xercesc::XMLUni::fgDOMResourceResolver,
                                                 static_cast<const void*>(nullptr));
            parser->getDomConfig()->setParameter(xercesc::XMLUni::fgXercesSecurityManager,
                                                 static_cast<const void*>(nullptr));
            fpParser = std::move(parser);
            fpDocument = document;
            return true;
        },
        &fErrorMessage);
}

void MCXMLReadWrite::Reset() {
    fpDocument = nullptr;
    fpParser.reset();
    fErrorMessage.clear();
}

} // namespace MCXML_800
