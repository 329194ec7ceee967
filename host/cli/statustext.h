// The texts of the status codes, which belong to the host: the component reports numbers only.
#pragma once

#include "mccommon/mcstatus.h"

#include <string>

namespace MCHost {

//! A short sentence for `status` ("a candidate distribution was dropped for a field").
std::string StatusText(const MCCommon_800::MCStatus& status);

} // namespace MCHost
