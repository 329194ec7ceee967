#include "cli/progress.h"

#include "cli/commandline.h"
#include "common/hosterror.h"

#include <algorithm>
#include <cstdio>
#include <exception>
#include <new>

#include <unistd.h>

namespace MCHost {

namespace {

constexpr int kBarWidth = 30;

} // namespace

ProgressBar::ProgressBar(bool enabled) : fbActive(enabled && ::isatty(STDERR_FILENO) == 1) {}

ProgressBar::~ProgressBar() {
    Clear();
}

void ProgressBar::Show(const std::string& label, std::uint64_t done, std::uint64_t total) {
    if (!fbActive) {
        return;
    }
    const double fraction =
        total == 0 ? 0.0 : std::min(1.0, static_cast<double>(done) / static_cast<double>(total));
    const int percent = static_cast<int>(fraction * 100.0);
    if (percent == fLastPercent && label == fLastLabel) {
        return;
    }
    fLastPercent = percent;
    fLastLabel = label;
    const int filled = static_cast<int>(fraction * kBarWidth);
    std::string bar(static_cast<std::size_t>(filled), '#');
    bar.append(static_cast<std::size_t>(kBarWidth - filled), '.');
    std::fprintf(stderr, "\r%-28.28s [%s] %3d%%", label.c_str(), bar.c_str(), percent);
    std::fflush(stderr);
    fbShown = true;
}

void ProgressBar::Clear() {
    if (!fbActive || !fbShown) {
        return;
    }
    std::fprintf(stderr, "\r%*s\r", 28 + kBarWidth + 8, "");
    std::fflush(stderr);
    fbShown = false;
    fLastPercent = -1;
    fLastLabel.clear();
}

int ReportCommandFailure(ProgressBar& progress, std::ostream& err) {
    progress.Clear();
    try {
        throw;
    } catch (const UsageError& e) {
        err << "mcsim: " << e.what() << "\n";
        return ExitStatus::kUsage;
    } catch (const std::bad_alloc&) {
        err << "mcsim: out of memory\n";
    } catch (const std::exception& e) {
        err << "mcsim: " << e.what() << "\n";
    } catch (...) {
        err << "mcsim: an unexpected failure\n";
    }
    return ExitStatus::kFailed;
}

} // namespace MCHost
