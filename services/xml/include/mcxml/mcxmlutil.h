// XML helpers over the Xerces-C DOM: text conversion between UTF-8 and the DOM's UTF-16,
// element creation and insertion, element lookup by name, and attributes written and read as
// text or as numbers. The plan file writer and reader and the fitting statistics writer build
// and read their documents through these functions.
//
// No function lets an exception out: whatever Xerces-C or the allocator throws is caught at the
// function and becomes its failure value (null, false, an empty string or a non-zero code).
// Names and texts come in two forms: the DOM's own UTF-16 (`const XMLCh*`) and UTF-8
// `std::string`, so that callers need not convert.
//
// Numbers are written as the shortest text that reads back to the same double
// (MCCommon_800::FormatRoundTrip): integral values below 2^53 in magnitude in plain notation
// ("95", "100000"), others as the shortest round-trip form ("0.1", "1e+300"), the specials as
// the xsd:double literals "INF", "-INF" and "NaN". Every such text is also an xsd:double
// literal. Numbers are read with MCCommon_800::ParseDouble, which gives back what was written
// bit for bit (subnormals and the sign of zero included).
#pragma once

#include <xercesc/dom/DOMDocument.hpp>
#include <xercesc/dom/DOMElement.hpp>
#include <xercesc/dom/DOMNode.hpp>
#include <xercesc/util/XercesDefs.hpp>

#include <string>

namespace MCXML_800 {

//! Text in the DOM's encoding, UTF-16 code units.
using UTF16String = std::basic_string<XMLCh>;

//! Result of GetIntAttribute and GetDoubleAttribute: a number was read into `out`.
inline constexpr int kAttributeRead = 0;
//! Result of the number getters: no element, no name or no such attribute.
inline constexpr int kAttributeAbsent = 1;
//! Result of the number getters: the text is not a number of the asked kind (for counts: not
//! integral or outside the range of int), or the lookup failed.
inline constexpr int kAttributeNotNumber = 2;

// ---- Text ----------------------------------------------------------------------------------

//! The UTF-8 form of a DOM text; empty for null. A unit that is not valid UTF-16 (an unpaired
//! surrogate) becomes U+FFFD.
std::string ToUTF8(const XMLCh* text);
//! The UTF-8 form of a UTF-16 string, as above.
std::string ToUTF8(const UTF16String& text);
//! The UTF-16 form of a UTF-8 text; empty for null. Each byte that does not belong to a valid
//! UTF-8 sequence becomes U+FFFD.
UTF16String ToUTF16(const char* text);
//! The UTF-16 form of a UTF-8 string, as above.
UTF16String ToUTF16(const std::string& text);

// ---- Elements ------------------------------------------------------------------------------

//! A new element of `document`, not yet attached; null on failure (no document, an invalid
//! name). The element takes the namespace of the document's root element, so that a document
//! made in a namespace keeps its children in it; under a root without namespace (or before
//! there is a root) it has none.
xercesc::DOMElement* CreateElement(xercesc::DOMDocument* document, const XMLCh* name);
//! As above, with a UTF-8 name.
xercesc::DOMElement* CreateElement(xercesc::DOMDocument* document, const std::string& name);

//! Inserts `child` into `parent` before `before`, or as the last child when `before` is null.
//! True on success; false for a null parent or child, a child of another document, a `before`
//! that is not a child of `parent`, or an insertion the DOM refuses.
bool InsertElement(xercesc::DOMNode* parent, xercesc::DOMNode* child,
                   xercesc::DOMNode* before = nullptr);

//! The first child element of `node` named `name`, or the first child element of any name when
//! `name` is null; null when there is none. A name matches an element's qualified name, or its
//! local name when the document was parsed with namespaces ("Target" finds "p:Target").
xercesc::DOMElement* GetFirstChildElmt(const xercesc::DOMNode* node, const XMLCh* name = nullptr);
//! As above, with a UTF-8 name (which never stands for "any name").
xercesc::DOMElement* GetFirstChildElmt(const xercesc::DOMNode* node, const std::string& name);

//! The next sibling element after `node` named `name` (any name when null); null when none.
xercesc::DOMElement* GetNextSiblingElmt(const xercesc::DOMNode* node, const XMLCh* name = nullptr);
//! As above, with a UTF-8 name.
xercesc::DOMElement* GetNextSiblingElmt(const xercesc::DOMNode* node, const std::string& name);

// ---- Attributes ----------------------------------------------------------------------------

//! Sets attribute `name` of `element` to `text`. True on success; false for a null argument,
//! an invalid name, or a text holding a character that XML 1.0 cannot carry (a control
//! character other than tab, line feed and carriage return, an unpaired surrogate, U+FFFE,
//! U+FFFF), which could not be read back.
bool SetAttribute(xercesc::DOMElement* element, const XMLCh* name, const XMLCh* text);
//! As above, with UTF-8 name and text.
bool SetAttribute(xercesc::DOMElement* element, const std::string& name, const std::string& text);
//! Sets attribute `name` to the number text of `value` (see the top of this file).
bool SetAttribute(xercesc::DOMElement* element, const XMLCh* name, double value);
//! As above, with a UTF-8 name.
bool SetAttribute(xercesc::DOMElement* element, const std::string& name, double value);

//! The text of attribute `name` of `element`, owned by the document; null when the element or
//! the attribute is absent (an attribute that is present but empty gives an empty text).
const XMLCh* GetAttribute(const xercesc::DOMElement* element, const XMLCh* name);
//! As above, with a UTF-8 name.
const XMLCh* GetAttribute(const xercesc::DOMElement* element, const std::string& name);
//! The UTF-8 text of attribute `name` into `out`; false, with `out` untouched, when absent.
bool GetAttribute(const xercesc::DOMElement* element, const std::string& name, std::string& out);

//! Reads attribute `name` as an int into `out`. `base` is the radix of the text: 0 (or 10)
//! takes the number form that SetAttribute writes ("95", and also "95.0" or "1e2"), whose value
//! must be integral and within the range of int; 2 to 36 take plain digits in that base with an
//! optional leading minus. Blanks around the text are allowed. Returns kAttributeRead with `out`
//! set, or kAttributeAbsent / kAttributeNotNumber with `out` untouched.
int GetIntAttribute(const xercesc::DOMElement* element, const XMLCh* name, int base, int& out);
//! As above, with a UTF-8 name.
int GetIntAttribute(const xercesc::DOMElement* element, const std::string& name, int base,
                    int& out);

//! Reads attribute `name` as a double into `out`: what SetAttribute wrote comes back bit for
//! bit; "INF", "-INF" give the infinities, and "NaN" and the one-character text "." (the
//! document form of a missing value) give the missing value MCMV::Missing(). Returns
//! kAttributeRead with `out` set, or kAttributeAbsent / kAttributeNotNumber with `out`
//! untouched.
int GetDoubleAttribute(const xercesc::DOMElement* element, const XMLCh* name, double& out);
//! As above, with a UTF-8 name.
int GetDoubleAttribute(const xercesc::DOMElement* element, const std::string& name, double& out);

} // namespace MCXML_800
