// Diagnostic assertions: preconditions that callers guarantee, named by a text that states the
// condition. A failed assertion never stops the program: it is reported to the handler and the
// operation goes on along its defined failure path.
#pragma once

#include <string>

namespace MCMCSP_800 {

//! Receives a failed assertion's text and where it was raised.
using AssertionHandler = void (*)(const char* text, const char* file, int line);

//! Installs `handler` (null restores the default) and returns the previous one. The default
//! handler only records the text for GetLastAssertion.
AssertionHandler SetAssertionHandler(AssertionHandler handler);
//! The text of the last assertion that failed on this thread, "" when none.
std::string GetLastAssertion();
//! Forgets the last assertion of this thread.
void ClearLastAssertion();
//! Reports a failed assertion to the current handler.
void ReportAssertion(const char* text, const char* file, int line);

} // namespace MCMCSP_800

//! Reports `text` when `cond` is false; evaluates to `cond` so the caller can branch on it.
#define MCSP_ASSERT(cond, text)                                                                \
    ((cond) ? true : (::MCMCSP_800::ReportAssertion((text), __FILE__, __LINE__), false))
