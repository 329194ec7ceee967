#include "mcxml/mcxmlinit.h"

#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLException.hpp>

namespace MCXML_800 {

namespace {

struct XMLPlatform {
    bool fbReady = false;
    XMLPlatform() {
        try {
            xercesc::XMLPlatformUtils::Initialize();
            fbReady = true;
        } catch (const xercesc::XMLException&) {
            fbReady = false;
        }
    }
    ~XMLPlatform() {
        if (fbReady) {
            xercesc::XMLPlatformUtils::Terminate();
        }
    }
};

} // namespace

bool EnsureXMLPlatform() {
    // A function-local static is initialised exactly once, thread-safely.
    static XMLPlatform platform;
    return platform.fbReady;
}

} // namespace MCXML_800
