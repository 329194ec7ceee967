// Errors of the reference host: one exception type whose message is ready for the user, in the
// form compilers use ("sales.csv:12: row has 4 fields, the header has 5"), and the status codes
// the host's own services report to the component.
//
// The exception never crosses into the component: every host object the component calls
// (record iterators, score computers, data sinks) catches it and reports a status, a null
// record or a stored message instead.
#pragma once

#include <stdexcept>
#include <string>

namespace MCHost {

//! A failure of the host whose what() is the complete message for the user.
class HostError : public std::runtime_error {
public:
    explicit HostError(const std::string& message) : std::runtime_error(message) {}
};

//! A command line that cannot be run as given (a bad option value, an output file that would
//! replace an input): the command ends with the usage status, 2, before doing any work.
class UsageError : public HostError {
public:
    explicit UsageError(const std::string& message) : HostError(message) {}
};

//! "file:line: text", or "file: text" when `line` is below 1.
std::string LocatedMessage(const std::string& file, long line, const std::string& text);

//! Status codes of the host's scoring services (their texts are in the command's status table).
namespace HostStatus {
//! An input the model needs is absent from the case or holds an unusable value.
inline constexpr long kScoreInput = 910001;
//! Evaluating an expression failed: division by zero, a value outside a function's domain,
//! a category index outside the target's labels.
inline constexpr long kScoreEvaluation = 910002;
//! ScoreRecord was called before PrepareOutputRecord succeeded.
inline constexpr long kScoreNotPrepared = 910003;
} // namespace HostStatus

} // namespace MCHost
