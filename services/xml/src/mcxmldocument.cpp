#include "mcxml/mcxmldocument.h"

#include "mcxml/mcxmlinit.h"
#include "mcxml/mcxmlutil.h"
#include "mcxmlinternal.h"

#include <xercesc/dom/DOMConfiguration.hpp>
#include <xercesc/dom/DOMImplementationRegistry.hpp>
#include <xercesc/dom/DOMLSOutput.hpp>
#include <xercesc/dom/DOMLSSerializer.hpp>
#include <xercesc/dom/DOMLocator.hpp>
#include <xercesc/framework/MemBufFormatTarget.hpp>
#include <xercesc/util/XMLUni.hpp>

namespace MCXML_800 {

namespace detail {

xercesc::DOMImplementation* GetLSImplementation() {
    static const XMLCh kFeatureLS[] = {xercesc::chLatin_L, xercesc::chLatin_S, xercesc::chNull};
    if (!EnsureXMLPlatform()) {
        return nullptr;
    }
    return xercesc::DOMImplementationRegistry::getDOMImplementation(kFeatureLS);
}

bool ErrorCollector::handleError(const xercesc::DOMError& error) {
    if (error.getSeverity() == xercesc::DOMError::DOM_SEVERITY_WARNING) {
        return true;
    }
    if (fNErrors++ == 0) {
        try {
            std::string text;
            const xercesc::DOMLocator* where = error.getLocation();
            if (where != nullptr && where->getLineNumber() > 0) {
                text = "line " + std::to_string(where->getLineNumber()) + ", column " +
                       std::to_string(where->getColumnNumber()) + ": ";
            }
            fFirstMessage = text + ToUTF8(error.getMessage());
        } catch (...) {
            // The count alone still marks the failure.
        }
    }
    return false;
}

} // namespace detail

DOMDocumentPtr CreateDocument(const std::string& namespaceUri, const std::string& rootName) {
    return detail::Guarded(DOMDocumentPtr(), [&] {
        xercesc::DOMImplementation* implementation = detail::GetLSImplementation();
        if (implementation == nullptr) {
            return DOMDocumentPtr();
        }
        const UTF16String space = ToUTF16(namespaceUri);
        const UTF16String root = ToUTF16(rootName);
        return DOMDocumentPtr(implementation->createDocument(
            space.empty() ? nullptr : space.c_str(), root.c_str(), nullptr));
    });
}

bool SerializeToUTF8(const xercesc::DOMNode* node, std::string& out) {
    return detail::Guarded(false, [&] {
        xercesc::DOMImplementation* implementation = detail::GetLSImplementation();
        if (node == nullptr || implementation == nullptr) {
            return false;
        }
        // The collector and the target outlive the serializer and the output that use them.
        detail::ErrorCollector errors;
        // 1023 bytes is the target's starting room; it grows as the text needs.
        xercesc::MemBufFormatTarget target(1023);
        std::unique_ptr<xercesc::DOMLSSerializer, XercesRelease> writer(
            implementation->createLSSerializer());
        std::unique_ptr<xercesc::DOMLSOutput, XercesRelease> output(
            implementation->createLSOutput());

        xercesc::DOMConfiguration* config = writer->getDomConfig();
        config->setParameter(xercesc::XMLUni::fgDOMWRTDiscardDefaultContent, false);
        config->setParameter(xercesc::XMLUni::fgDOMWRTFormatPrettyPrint, false);
        config->setParameter(xercesc::XMLUni::fgDOMErrorHandler,
                             static_cast<xercesc::DOMErrorHandler*>(&errors));
        output->setByteStream(&target);
        output->setEncoding(xercesc::XMLUni::fgUTF8EncodingString);

        if (!writer->write(node, output.get()) || errors.HasErrors()) {
            return false;
        }
        out.assign(reinterpret_cast<const char*>(target.getRawBuffer()), target.getLen());
        return true;
    });
}

} // namespace MCXML_800
