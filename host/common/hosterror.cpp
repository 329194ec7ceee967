#include "common/hosterror.h"

namespace MCHost {

std::string LocatedMessage(const std::string& file, long line, const std::string& text) {
    if (line < 1) {
        return file + ": " + text;
    }
    return file + ":" + std::to_string(line) + ": " + text;
}

} // namespace MCHost
