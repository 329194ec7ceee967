// Caps on the sizes of the host's inputs where a larger size has no honest use and would only
// make the command run out of memory or time: the bytes of a plan or model file, the fields of
// a CSV record, the categories of a field, the attributes of an XML element. Each is set well
// above the largest inputs of the benchmarks (bench/README.md); the ones a user may need to
// raise read an environment variable (a number; README, "Limits"):
//   MCSIM_MAX_PLAN_MB     plan file, MiB          default 512  (a 3,000-input matrix: 240 MB)
//   MCSIM_MAX_MODEL_MB    model file, MiB         default 64
//   MCSIM_MAX_FIELDS      fields per CSV record   default 100,000
//   MCSIM_MAX_CATEGORIES  categories per field    default 1,000,000
// Attributes per XML element are capped at kMaxAttributesPerElement: a plan's elements carry
// at most a dozen, and the XML library builds an element's attributes in time quadratic in
// their number.
//
// Input files are read through ReadInputFile, which also refuses what is not a regular file:
// a pipe or a device (/dev/zero) would be read without end or could not be read again.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

namespace MCHost {

//! Attributes one XML element may carry.
inline constexpr std::size_t kMaxAttributesPerElement = 1000;

struct InputLimits {
    std::uint64_t fMaxPlanBytes = std::uint64_t{512} << 20; //!< MCSIM_MAX_PLAN_MB
    std::uint64_t fMaxModelBytes = std::uint64_t{64} << 20; //!< MCSIM_MAX_MODEL_MB
    std::size_t fMaxFieldsPerRecord = 100000;               //!< MCSIM_MAX_FIELDS
    std::size_t fMaxCategories = 1000000;                   //!< MCSIM_MAX_CATEGORIES

    //! The defaults above, each replaced by its environment variable when that holds a whole
    //! number of at least 1 (read once, at the first call).
    static const InputLimits& Get();
};

//! Appended to a message about a cap: how to raise it ("; set MCSIM_MAX_FIELDS to allow more").
std::string RaiseHint(const char* variable);

//! The whole of the regular file `path` (`what`: "plan file", "model file"). Throws HostError
//! naming the file when it cannot be opened or read, is not a regular file, or is larger than
//! `maxBytes` (`variable` is the environment variable that raises the cap).
std::string ReadInputFile(const std::string& path, const char* what, std::uint64_t maxBytes,
                          const char* variable);

//! Throws HostError naming `path` and the line when a start tag of the XML text `text` carries
//! more than kMaxAttributesPerElement attributes. One pass over the text, before it is parsed.
void CheckXmlAttributeCounts(const std::string& text, const std::string& path);

} // namespace MCHost
