#include "data/inputlimits.h"

#include "common/hosterror.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstdlib>
#include <cstring>
#include <fstream>

#include <sys/stat.h>

namespace MCHost {

namespace {

//! The whole number of at least 1 in the environment variable `name`, or `fallback`.
std::uint64_t FromEnvironment(const char* name, std::uint64_t fallback, std::uint64_t unit) {
    const char* text = std::getenv(name);
    if (text == nullptr || *text == '\0') {
        return fallback;
    }
    std::uint64_t value = 0;
    const char* end = text + std::strlen(text);
    const auto [stop, ec] = std::from_chars(text, end, value);
    if (ec != std::errc() || stop != end || value < 1 || value > UINT64_MAX / unit) {
        return fallback;
    }
    return value * unit;
}

InputLimits MakeLimits() {
    InputLimits limits;
    limits.fMaxPlanBytes = FromEnvironment("MCSIM_MAX_PLAN_MB", limits.fMaxPlanBytes, 1u << 20);
    limits.fMaxModelBytes = FromEnvironment("MCSIM_MAX_MODEL_MB", limits.fMaxModelBytes, 1u << 20);
    limits.fMaxFieldsPerRecord = static_cast<std::size_t>(
        FromEnvironment("MCSIM_MAX_FIELDS", limits.fMaxFieldsPerRecord, 1));
    limits.fMaxCategories =
        static_cast<std::size_t>(FromEnvironment("MCSIM_MAX_CATEGORIES", limits.fMaxCategories, 1));
    return limits;
}

long LineAt(const std::string& text, std::size_t pos) {
    return 1 + static_cast<long>(
                   std::count(text.begin(), text.begin() + static_cast<std::ptrdiff_t>(pos), '\n'));
}

} // namespace

const InputLimits& InputLimits::Get() {
    static const InputLimits kLimits = MakeLimits();
    return kLimits;
}

std::string RaiseHint(const char* variable) {
    return std::string("; set ") + variable + " to allow more";
}

std::string ReadInputFile(const std::string& path, const char* what, std::uint64_t maxBytes,
                          const char* variable) {
    // Looked at before it is opened: opening a pipe waits for a writer.
    struct stat info {};
    if (::stat(path.c_str(), &info) != 0) {
        throw HostError(LocatedMessage(
            path, 0, std::string("cannot open the ") + what + ": " + std::strerror(errno)));
    }
    if (!S_ISREG(info.st_mode)) {
        throw HostError(LocatedMessage(path, 0,
                                       std::string("the ") + what +
                                           " is not a regular file (a folder, pipe or device); "
                                           "save it to a file first"));
    }
    std::ifstream in(path, std::ios::in | std::ios::binary);
    if (!in.is_open()) {
        throw HostError(LocatedMessage(
            path, 0, std::string("cannot open the ") + what + ": " + std::strerror(errno)));
    }
    const auto size = static_cast<std::uint64_t>(info.st_size);
    if (size > maxBytes) {
        throw HostError(LocatedMessage(
            path, 0,
            std::string("the ") + what + " has " + std::to_string(size >> 20) + " MiB, more than " +
                std::to_string(maxBytes >> 20) + " MiB" + RaiseHint(variable)));
    }
    std::string text(static_cast<std::size_t>(size), '\0');
    in.read(text.data(), static_cast<std::streamsize>(size));
    if (in.bad() || static_cast<std::uint64_t>(in.gcount()) != size) {
        throw HostError(LocatedMessage(path, 0, std::string("reading the ") + what + " failed"));
    }
    return text;
}

void CheckXmlAttributeCounts(const std::string& text, const std::string& path) {
    const std::size_t n = text.size();
    std::size_t i = 0;
    const auto skipPast = [&](const char* end) {
        const std::size_t at = text.find(end, i);
        i = at == std::string::npos ? n : at + std::strlen(end);
    };
    while ((i = text.find('<', i)) != std::string::npos) {
        const std::size_t tag = i;
        if (text.compare(i, 4, "<!--") == 0) {
            skipPast("-->");
        } else if (text.compare(i, 9, "<![CDATA[") == 0) {
            skipPast("]]>");
        } else if (text.compare(i, 2, "<?") == 0) {
            skipPast("?>");
        } else if (text.compare(i, 2, "<!") == 0 || text.compare(i, 2, "</") == 0) {
            skipPast(">");
        } else {
            // A start tag: one '=' outside the quoted values per attribute.
            std::size_t attributes = 0;
            char quote = 0;
            for (++i; i < n && (quote != 0 || text[i] != '>'); ++i) {
                const char c = text[i];
                if (quote != 0) {
                    quote = c == quote ? 0 : quote;
                } else if (c == '"' || c == '\'') {
                    quote = c;
                } else if (c == '=') {
                    ++attributes;
                }
            }
            if (attributes > kMaxAttributesPerElement) {
                throw HostError(LocatedMessage(path, LineAt(text, tag),
                                               "an element has " + std::to_string(attributes) +
                                                   " attributes, more than " +
                                                   std::to_string(kMaxAttributesPerElement)));
            }
        }
    }
}

} // namespace MCHost
