// Status values and warning lists: how every fallible operation of mcsim reports its outcome.
//
// An MCStatus is success (code 0), an error (a code, warning flag false) or a warning (a code,
// warning flag true). Code 1 means that the step was cancelled. The texts belonging to codes
// are the host's; the component only carries numbers.
#pragma once

#include <vector>

namespace MCCommon_800 {

class [[nodiscard]] MCStatus {
public:
    //! Success.
    MCStatus() = default;
    //! A status with `code`; `warning` marks a warning rather than an error.
    MCStatus(long code, bool warning) : fCode(code), fbWarning(code != 0 && warning) {}

    //! True when nothing was reported: no error and no warning.
    bool IsOK() const { return fCode == 0; }
    //! True for a non-zero code that is not a warning.
    bool IsError() const { return fCode != 0 && !fbWarning; }
    //! True for a non-zero code marked as a warning.
    bool IsWarning() const { return fCode != 0 && fbWarning; }
    long GetErrorCode() const { return fCode; }

    friend bool operator==(const MCStatus& a, const MCStatus& b) {
        return a.fCode == b.fCode && a.fbWarning == b.fbWarning;
    }
    friend bool operator!=(const MCStatus& a, const MCStatus& b) { return !(a == b); }

private:
    long fCode = 0;       //!< 0 for success, else the reported code
    bool fbWarning = false; //!< true when the code is a warning
};

//! The code of a cancelled step.
inline constexpr long kCancelledCode = 1;

//! A list of statuses, in the order they were added. Copyable.
class MCWarnings {
public:
    //! Appends `status`; `destination` names the host's channel and is kept for the host only.
    void AddWarning(const MCStatus& status, int destination = 0);
    //! Appends every status of `other`, in order.
    void AddWarnings(const MCWarnings& other);
    //! The collected statuses. `all` is accepted for the host's interface; every status is
    //! returned whatever its value.
    const std::vector<MCStatus>& GetWarnings(bool all = true) const;
    void ClearWarnings();
    bool IsEmpty() const { return fStatuses.empty(); }
    //! True when some status in the list has `code`.
    bool HasCode(long code) const;

private:
    std::vector<MCStatus> fStatuses; //!< collected statuses in order
    std::vector<int> fDestinations;  //!< the destination passed with each status
};

} // namespace MCCommon_800
