#include "mcxml/mcxmlutil.h"

#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mcxmlinternal.h"

#include <xercesc/dom/DOMAttr.hpp>
#include <xercesc/util/XMLChar.hpp>
#include <xercesc/util/XMLString.hpp>

#include <boost/locale/utf.hpp>

#include <charconv>
#include <cmath>
#include <iterator>
#include <limits>

namespace MCXML_800 {

using xercesc::DOMDocument;
using xercesc::DOMElement;
using xercesc::DOMNode;

namespace {

//! U+FFFD REPLACEMENT CHARACTER, put where input is not valid UTF-8 or UTF-16.
constexpr boost::locale::utf::code_point kReplacement = 0xFFFD;

// Recodes [first, last) from one Unicode form to another with Boost.Locale's UTF codecs. An
// ill-formed sequence becomes one U+FFFD per code unit and decoding resumes at the next unit,
// so that a truncated sequence never swallows the valid character after it.
template <typename Out, typename In>
std::basic_string<Out> Recode(const In* first, const In* last) {
    namespace utf = boost::locale::utf;
    std::basic_string<Out> result;
    result.reserve(static_cast<std::size_t>(last - first));
    auto sink = std::back_inserter(result);
    while (first != last) {
        const In* start = first;
        utf::code_point c = utf::utf_traits<In>::decode(first, last);
        if (c == utf::illegal || c == utf::incomplete) {
            c = kReplacement;
            first = start + 1;
        }
        utf::utf_traits<Out>::encode(c, sink);
    }
    return result;
}

bool IsHighSurrogate(XMLCh c) {
    return c >= 0xD800 && c <= 0xDBFF;
}
bool IsLowSurrogate(XMLCh c) {
    return c >= 0xDC00 && c <= 0xDFFF;
}

// True when every character of `text` is a Char of XML 1.0 (section 2.2): tab, line feed,
// carriage return, U+0020..U+D7FF, U+E000..U+FFFD, and U+10000..U+10FFFF as surrogate pairs.
bool IsXMLText(const XMLCh* text) {
    for (const XMLCh* p = text; *p != 0; ++p) {
        if (IsHighSurrogate(p[0]) && IsLowSurrogate(p[1])) {
            ++p;
        } else if (!xercesc::XMLChar1_0::isXMLChar(p[0])) {
            return false;
        }
    }
    return true;
}

// True when `name` is null (any element) or names `node`: its qualified name, or its local
// name when it has one (documents parsed with namespaces).
bool NameMatches(const DOMNode* node, const XMLCh* name) {
    if (name == nullptr) {
        return true;
    }
    if (xercesc::XMLString::equals(node->getNodeName(), name)) {
        return true;
    }
    const XMLCh* local = node->getLocalName();
    return local != nullptr && xercesc::XMLString::equals(local, name);
}

// The first element among `node` and its following siblings that `name` matches.
DOMElement* FirstElementFrom(DOMNode* node, const XMLCh* name) {
    for (; node != nullptr; node = node->getNextSibling()) {
        if (node->getNodeType() == DOMNode::ELEMENT_NODE && NameMatches(node, name)) {
            return static_cast<DOMElement*>(node);
        }
    }
    return nullptr;
}

// True when `text` holds a NUL, which no XML name or text can carry and which the UTF-16
// form handed to the DOM would silently cut at.
bool HasNul(const std::string& text) {
    return text.find('\0') != std::string::npos;
}

// Strips the XML blanks (space, tab, line feed, carriage return) around `text`.
std::string TrimBlanks(const std::string& text) {
    const char* kBlanks = " \t\n\r";
    const std::size_t b = text.find_first_not_of(kBlanks);
    if (b == std::string::npos) {
        return std::string();
    }
    const std::size_t e = text.find_last_not_of(kBlanks);
    return text.substr(b, e - b + 1);
}

// Reads `text` as an int in the sense of GetIntAttribute; false when it is not one.
bool ParseIntText(const std::string& text, int base, int& out) {
    if (base == 0 || base == 10) {
        double value = 0.0;
        if (!MCCommon_800::ParseDouble(text, value) || !std::isfinite(value) ||
            value != std::trunc(value) ||
            value < static_cast<double>(std::numeric_limits<int>::min()) ||
            value > static_cast<double>(std::numeric_limits<int>::max())) {
            return false;
        }
        out = static_cast<int>(value);
        return true;
    }
    if (base < 2 || base > 36) {
        return false;
    }
    const std::string digits = TrimBlanks(text);
    const char* last = digits.data() + digits.size();
    int value = 0;
    const auto res = std::from_chars(digits.data(), last, value, base);
    if (digits.empty() || res.ec != std::errc() || res.ptr != last) {
        return false;
    }
    out = value;
    return true;
}

} // namespace

// ---- Text ----------------------------------------------------------------------------------

std::string ToUTF8(const XMLCh* text) {
    return detail::Guarded(std::string(), [&] {
        if (text == nullptr) {
            return std::string();
        }
        return Recode<char>(text, text + xercesc::XMLString::stringLen(text));
    });
}

std::string ToUTF8(const UTF16String& text) {
    return detail::Guarded(std::string(),
                           [&] { return Recode<char>(text.data(), text.data() + text.size()); });
}

UTF16String ToUTF16(const char* text) {
    return detail::Guarded(UTF16String(), [&] {
        if (text == nullptr) {
            return UTF16String();
        }
        return Recode<XMLCh>(text, text + std::char_traits<char>::length(text));
    });
}

UTF16String ToUTF16(const std::string& text) {
    return detail::Guarded(UTF16String(),
                           [&] { return Recode<XMLCh>(text.data(), text.data() + text.size()); });
}

// ---- Elements ------------------------------------------------------------------------------

DOMElement* CreateElement(DOMDocument* document, const XMLCh* name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        if (document == nullptr || name == nullptr) {
            return nullptr;
        }
        // A DOM Level 1 element below a root in a namespace would be written with xmlns=""
        // and so leave the namespace; the root's namespace is taken over instead.
        const DOMElement* root = document->getDocumentElement();
        const XMLCh* space = root != nullptr ? root->getNamespaceURI() : nullptr;
        if (space != nullptr && *space != 0) {
            return document->createElementNS(space, name);
        }
        return document->createElement(name);
    });
}

DOMElement* CreateElement(DOMDocument* document, const std::string& name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        return HasNul(name) ? nullptr : CreateElement(document, ToUTF16(name).c_str());
    });
}

bool InsertElement(DOMNode* parent, DOMNode* child, DOMNode* before) {
    return detail::Guarded(false, [&] {
        if (parent == nullptr || child == nullptr) {
            return false;
        }
        return parent->insertBefore(child, before) != nullptr;
    });
}

DOMElement* GetFirstChildElmt(const DOMNode* node, const XMLCh* name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        return node != nullptr ? FirstElementFrom(node->getFirstChild(), name) : nullptr;
    });
}

DOMElement* GetFirstChildElmt(const DOMNode* node, const std::string& name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        return HasNul(name) ? nullptr : GetFirstChildElmt(node, ToUTF16(name).c_str());
    });
}

DOMElement* GetNextSiblingElmt(const DOMNode* node, const XMLCh* name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        return node != nullptr ? FirstElementFrom(node->getNextSibling(), name) : nullptr;
    });
}

DOMElement* GetNextSiblingElmt(const DOMNode* node, const std::string& name) {
    return detail::Guarded(static_cast<DOMElement*>(nullptr), [&]() -> DOMElement* {
        return HasNul(name) ? nullptr : GetNextSiblingElmt(node, ToUTF16(name).c_str());
    });
}

// ---- Attributes ----------------------------------------------------------------------------

bool SetAttribute(DOMElement* element, const XMLCh* name, const XMLCh* text) {
    return detail::Guarded(false, [&] {
        if (element == nullptr || name == nullptr || text == nullptr || !IsXMLText(text)) {
            return false;
        }
        element->setAttribute(name, text);
        return true;
    });
}

bool SetAttribute(DOMElement* element, const std::string& name, const std::string& text) {
    return detail::Guarded(false, [&] {
        if (HasNul(name) || HasNul(text)) {
            return false;
        }
        return SetAttribute(element, ToUTF16(name).c_str(), ToUTF16(text).c_str());
    });
}

bool SetAttribute(DOMElement* element, const XMLCh* name, double value) {
    return detail::Guarded(false, [&] {
        return SetAttribute(element, name, ToUTF16(MCCommon_800::FormatRoundTrip(value)).c_str());
    });
}

bool SetAttribute(DOMElement* element, const std::string& name, double value) {
    return detail::Guarded(false, [&] {
        return !HasNul(name) && SetAttribute(element, ToUTF16(name).c_str(), value);
    });
}

const XMLCh* GetAttribute(const DOMElement* element, const XMLCh* name) {
    return detail::Guarded(static_cast<const XMLCh*>(nullptr), [&]() -> const XMLCh* {
        if (element == nullptr || name == nullptr) {
            return nullptr;
        }
        // getAttribute cannot tell an absent attribute from an empty one; the node can.
        const xercesc::DOMAttr* attribute = element->getAttributeNode(name);
        return attribute != nullptr ? attribute->getValue() : nullptr;
    });
}

const XMLCh* GetAttribute(const DOMElement* element, const std::string& name) {
    return detail::Guarded(static_cast<const XMLCh*>(nullptr), [&]() -> const XMLCh* {
        return HasNul(name) ? nullptr : GetAttribute(element, ToUTF16(name).c_str());
    });
}

bool GetAttribute(const DOMElement* element, const std::string& name, std::string& out) {
    return detail::Guarded(false, [&] {
        const XMLCh* text = GetAttribute(element, name);
        if (text == nullptr) {
            return false;
        }
        out = ToUTF8(text);
        return true;
    });
}

int GetIntAttribute(const DOMElement* element, const XMLCh* name, int base, int& out) {
    return detail::Guarded(kAttributeNotNumber, [&] {
        const XMLCh* text = GetAttribute(element, name);
        if (text == nullptr) {
            return kAttributeAbsent;
        }
        return ParseIntText(ToUTF8(text), base, out) ? kAttributeRead : kAttributeNotNumber;
    });
}

int GetIntAttribute(const DOMElement* element, const std::string& name, int base, int& out) {
    return detail::Guarded(kAttributeNotNumber, [&] {
        return HasNul(name) ? kAttributeAbsent
                            : GetIntAttribute(element, ToUTF16(name).c_str(), base, out);
    });
}

int GetDoubleAttribute(const DOMElement* element, const XMLCh* name, double& out) {
    return detail::Guarded(kAttributeNotNumber, [&] {
        const XMLCh* text = GetAttribute(element, name);
        if (text == nullptr) {
            return kAttributeAbsent;
        }
        const std::string utf8 = ToUTF8(text);
        if (TrimBlanks(utf8) == ".") {
            out = MCCommon_800::MCMV::Missing();
            return kAttributeRead;
        }
        double value = 0.0;
        if (!MCCommon_800::ParseDouble(utf8, value)) {
            return kAttributeNotNumber;
        }
        // Any NaN text stands for the one missing value.
        out = std::isnan(value) ? MCCommon_800::MCMV::Missing() : value;
        return kAttributeRead;
    });
}

int GetDoubleAttribute(const DOMElement* element, const std::string& name, double& out) {
    return detail::Guarded(kAttributeNotNumber, [&] {
        return HasNul(name) ? kAttributeAbsent
                            : GetDoubleAttribute(element, ToUTF16(name).c_str(), out);
    });
}

} // namespace MCXML_800
