// Making and writing whole documents: a new document with its root element, owned by a smart
// pointer, and the serialisation of a document (or any node) into UTF-8 text. The plan file
// writer and the fitting statistics writer produce their text through SerializeToUTF8.
#pragma once

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMNode.hpp>

#include <memory>
#include <string>

namespace MCXML_800 {

//! Deleter for Xerces-C objects that are handed back with release() (documents, parsers,
//! serializers). Never throws.
struct XercesRelease {
    template <typename T> void operator()(T* object) const noexcept {
        if (object == nullptr) {
            return;
        }
        try {
            object->release();
        } catch (...) {
            // A release that fails leaves nothing the caller could repair.
        }
    }
};

//! A document owned by the caller; released when the pointer goes.
using DOMDocumentPtr = std::unique_ptr<xercesc::DOMDocument, XercesRelease>;

//! A new document from the DOM implementation with the "LS" feature, holding only its root
//! element `rootName` in namespace `namespaceUri` (no namespace when empty) and no document
//! type. Null on failure (the XML platform not usable, an invalid name). Elements made with
//! CreateElement for this document inherit the root's namespace.
DOMDocumentPtr CreateDocument(const std::string& namespaceUri, const std::string& rootName);

//! Serialises `node` (normally a document) into `out` as UTF-8 text through the LS serializer,
//! with its pretty-print and discard-default-content features both off: no indentation or
//! added line breaks, default content kept. The text starts with an XML declaration naming
//! UTF-8 when `node` is a document. True on success; on failure (null node, a character or
//! name that cannot be written) false with `out` untouched.
bool SerializeToUTF8(const xercesc::DOMNode* node, std::string& out);

} // namespace MCXML_800
