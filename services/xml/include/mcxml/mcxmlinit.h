// Xerces-C start-up: the platform is initialised once per process, on first use, from
// whichever thread gets there first, and terminated at exit.
#pragma once

namespace MCXML_800 {

//! Makes sure Xerces-C is initialised; true when it is usable.
bool EnsureXMLPlatform();

} // namespace MCXML_800
