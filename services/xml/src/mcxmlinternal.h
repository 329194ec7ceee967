// Pieces shared by the sources of the XML library and seen by no caller: the one catch site
// that every entry point runs its body through, the error collector handed to the LS parser and
// serializer, and the DOM implementation lookup.
#pragma once

#include "mcxml/mcxmlutil.h"

#include <xercesc/dom/DOMError.hpp>
#include <xercesc/dom/DOMErrorHandler.hpp>
#include <xercesc/dom/DOMException.hpp>
#include <xercesc/dom/DOMImplementation.hpp>
#include <xercesc/sax/SAXException.hpp>
#include <xercesc/util/OutOfMemoryException.hpp>
#include <xercesc/util/XMLException.hpp>

#include <new>
#include <string>

namespace MCXML_800::detail {

//! Stores `text` into `*what` when `what` is given; never throws.
inline void NoteFailure(std::string* what, const std::string& text) noexcept {
    if (what == nullptr) {
        return;
    }
    try {
        *what = text;
    } catch (...) {
        // No room for the message: the failure value alone reports it.
    }
}

//! Stores the UTF-8 form of a Xerces-C message into `*what`; never throws.
inline void NoteFailure(std::string* what, const XMLCh* message) noexcept {
    if (what == nullptr) {
        return;
    }
    try {
        *what = ToUTF8(message);
    } catch (...) {
    }
}

//! Runs `body` and returns its result; when it throws, returns `failure` instead and, when
//! `what` is given, stores the reason there. This is the catch site of every entry point.
template <typename Result, typename Body>
Result Guarded(Result failure, Body&& body, std::string* what = nullptr) noexcept {
    try {
        return body();
    } catch (const xercesc::XMLException& e) {
        NoteFailure(what, e.getMessage());
    } catch (const xercesc::DOMException& e) {
        // Also DOMLSException, which the LS parser and serializer throw.
        NoteFailure(what, e.getMessage());
    } catch (const xercesc::SAXException& e) {
        NoteFailure(what, e.getMessage());
    } catch (const xercesc::OutOfMemoryException&) {
        NoteFailure(what, std::string("out of memory"));
    } catch (const std::bad_alloc&) {
        NoteFailure(what, std::string("out of memory"));
    } catch (...) {
        NoteFailure(what, std::string("unexpected exception"));
    }
    return failure;
}

//! The DOM implementation with the "LS" feature (load and save); null when unavailable.
xercesc::DOMImplementation* GetLSImplementation();

//! Error handler for the LS parser and serializer: counts errors and fatal errors, keeps the
//! first message with its position, and asks to stop at the first error. Warnings are ignored.
class ErrorCollector : public xercesc::DOMErrorHandler {
public:
    bool handleError(const xercesc::DOMError& error) override;

    //! True when an error or fatal error was reported.
    bool HasErrors() const { return fNErrors > 0; }
    //! The first error, "line L, column C: message" (the position when known).
    const std::string& GetFirstMessage() const { return fFirstMessage; }

private:
    //! Number of errors and fatal errors reported.
    int fNErrors = 0;
    //! Text of the first error.
    std::string fFirstMessage;
};

} // namespace MCXML_800::detail
