// The XML service library in one include: start-up, element and attribute helpers, document
// creation and serialisation, and the parser.
#pragma once

#include "mcxml/mcxmldocument.h"
#include "mcxml/mcxmlinit.h"
#include "mcxml/mcxmlreadwrite.h"
#include "mcxml/mcxmlutil.h"
