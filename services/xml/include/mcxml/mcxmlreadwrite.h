// The document parser: MCXMLReadWrite reads XML text (a string or a stream) into a DOM
// document that it owns, for the plan file reader and anyone else reading documents.
//
// Parsing is meant to be safe on hostile text. The parser checks well-formedness only (no DTD
// or schema validation) and refuses documents that carry a document type declaration, so no
// entity beyond the five predefined ones is ever declared or expanded: no entity-expansion
// bomb, no external entity. It loads no external DTD or schema and resolves no external
// resource (every resolution request is answered with nothing and the default resolution is
// switched off), and it stops at elements nested deeper than kMaxElementDepth. A refused
// document is a failed parse, like a malformed one.
#pragma once

#include "mcxml/mcxmldocument.h"

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMLSParser.hpp>

#include <cstddef>
#include <istream>
#include <memory>
#include <string>

namespace MCXML_800 {

class MCXMLReadWrite {
public:
    //! Deepest element nesting accepted; the root element is at depth 1. Documents of mcsim
    //! are a handful of levels deep; the cap keeps a hostile document from running code that
    //! walks the tree recursively out of stack.
    static constexpr int kMaxElementDepth = 256;

    MCXMLReadWrite();
    ~MCXMLReadWrite();
    MCXMLReadWrite(const MCXMLReadWrite&) = delete;
    MCXMLReadWrite& operator=(const MCXMLReadWrite&) = delete;
    MCXMLReadWrite(MCXMLReadWrite&&) noexcept;
    MCXMLReadWrite& operator=(MCXMLReadWrite&&) noexcept;

    //! Parses the document text `text` (in the encoding its XML declaration names, UTF-8 by
    //! default). True when a well-formed document resulted; any earlier document is released
    //! first, so after a false GetDocument() is null.
    bool ParseToDOM(const std::string& text);
    //! Reads `source` to its end and parses what was read, as above. False when the stream is
    //! not good at the start or fails while being read.
    bool ParseToDOM(std::istream& source);

    //! The document of the last successful parse, owned by this object and valid until the next
    //! parse or the object's end; null before any parse and after a failed one.
    xercesc::DOMDocument* GetDocument() const;
    //! Why the last parse failed, in UTF-8 ("line 3, column 7: ..."); empty after a success.
    const std::string& GetErrorMessage() const;

private:
    //! Parses `size` bytes at `bytes`, keeping the parser (and so the document) on success.
    bool ParseBytes(const char* bytes, std::size_t size);
    //! Drops the current parser and document and the last error message.
    void Reset();

    //! Parser of the last successful parse; it owns the document.
    std::unique_ptr<xercesc::DOMLSParser, XercesRelease> fpParser;
    //! The parsed document, owned by fpParser; null when there is none.
    xercesc::DOMDocument* fpDocument = nullptr;
    //! Reason for the last failure; empty after a success.
    std::string fErrorMessage;
};

} // namespace MCXML_800
