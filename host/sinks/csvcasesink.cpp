#include "sinks/csvcasesink.h"

#include "common/hosterror.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <cmath>

namespace MCHost {

using MCCommon_800::MCMV;

CsvCaseSink::CsvCaseSink(std::string path, std::vector<SinkColumn> inputs, char delimiter)
    : fPath(std::move(path)), fvInputs(std::move(inputs)), fDelimiter(delimiter) {}

CsvCaseSink::~CsvCaseSink() {
    Abort();
}

void CsvCaseSink::SetTargetLabels(const std::string& target, std::vector<std::string> labels) {
    std::lock_guard<std::mutex> guard(fMutex);
    fvTargetLabels.emplace_back(target, std::move(labels));
}

void CsvCaseSink::WriteText(const std::string& text) {
    std::ostream& os = fpWriter->GetStream();
    const bool quote =
        text.find_first_of(std::string("\"\r\n") + fDelimiter) != std::string::npos ||
        (!text.empty() && (text.front() == ' ' || text.back() == ' '));
    if (!quote) {
        os << text;
        return;
    }
    os << '"';
    for (char c : text) {
        if (c == '"') {
            os << '"';
        }
        os << c;
    }
    os << '"';
}

void CsvCaseSink::WriteValue(double value, const std::vector<std::string>& labels) {
    if (MCMV::IsMissing(value)) {
        return;
    }
    if (!labels.empty() && value == std::floor(value) && value >= 0.0 &&
        value < static_cast<double>(labels.size())) {
        WriteText(labels[static_cast<std::size_t>(value)]);
        return;
    }
    fpWriter->GetStream() << MCCommon_800::FormatRoundTrip(value);
}

void CsvCaseSink::BeginData(const std::vector<std::string>& targetNames, int nProbabilities,
                            int nIterations) {
    // Lock order: the process's commit lock, then the sink's (a command commits its outputs
    // under the commit lock, and the writer takes it when it is created, committed or aborted).
    const OutputCommitScope commitScope;
    std::lock_guard<std::mutex> guard(fMutex);
    if (fpWriter || !fError.empty()) {
        return;
    }
    fvTargets.clear();
    for (const std::string& name : targetNames) {
        SinkColumn column{name, {}};
        for (const auto& given : fvTargetLabels) {
            if (given.first == name) {
                column.fvLabels = given.second;
            }
        }
        fvTargets.push_back(std::move(column));
    }
    for (int k = 1; k <= nProbabilities; ++k) {
        fvTargets.push_back(SinkColumn{"probability_" + std::to_string(k), {}});
    }
    fbIterations = nIterations > 1;

    fpWriter = std::make_unique<AtomicFileWriter>(fPath);
    if (!fpWriter->IsOpen()) {
        fError = fpWriter->GetError();
        return;
    }
    bool first = true;
    auto next = [&]() {
        if (!first) {
            fpWriter->GetStream() << fDelimiter;
        }
        first = false;
    };
    for (const SinkColumn& c : fvInputs) {
        next();
        WriteText(c.fName);
    }
    for (const SinkColumn& c : fvTargets) {
        next();
        WriteText(c.fName);
    }
    if (fbIterations) {
        next();
        WriteText("iteration");
    }
    fpWriter->GetStream() << '\n';
}

void CsvCaseSink::AddCase(const std::vector<double>& inputs, const std::vector<double>& targets,
                          int iteration) {
    std::lock_guard<std::mutex> guard(fMutex);
    if (!fError.empty()) {
        return;
    }
    if (!fpWriter) {
        fError = LocatedMessage(fPath, 0, "a case arrived before the column names");
        return;
    }
    if (inputs.size() != fvInputs.size() || targets.size() != fvTargets.size()) {
        fError = LocatedMessage(
            fPath, 0,
            "case " + std::to_string(fNCases + 1) + " has " + std::to_string(inputs.size()) +
                " inputs and " + std::to_string(targets.size()) + " targets; the file has " +
                std::to_string(fvInputs.size()) + " and " + std::to_string(fvTargets.size()));
        return;
    }
    std::ostream& os = fpWriter->GetStream();
    for (std::size_t i = 0; i < inputs.size(); ++i) {
        if (i > 0) {
            os << fDelimiter;
        }
        WriteValue(inputs[i], fvInputs[i].fvLabels);
    }
    for (std::size_t i = 0; i < targets.size(); ++i) {
        if (i > 0 || !inputs.empty()) {
            os << fDelimiter;
        }
        WriteValue(targets[i], fvTargets[i].fvLabels);
    }
    if (fbIterations) {
        if (!inputs.empty() || !targets.empty()) {
            os << fDelimiter;
        }
        os << iteration;
    }
    os << '\n';
    ++fNCases;
}

bool CsvCaseSink::Commit() {
    // Lock order: the process's commit lock, then the sink's (a command commits its outputs
    // under the commit lock, and the writer takes it when it is created, committed or aborted).
    const OutputCommitScope commitScope;
    std::lock_guard<std::mutex> guard(fMutex);
    if (!fError.empty()) {
        if (fpWriter) {
            fpWriter->Abort();
        }
        return false;
    }
    if (!fpWriter) {
        fError = LocatedMessage(fPath, 0, "the simulation delivered no cases");
        return false;
    }
    if (!fpWriter->Commit()) {
        fError = fpWriter->GetError();
        return false;
    }
    return true;
}

void CsvCaseSink::Abort() {
    // Lock order: the process's commit lock, then the sink's (a command commits its outputs
    // under the commit lock, and the writer takes it when it is created, committed or aborted).
    const OutputCommitScope commitScope;
    std::lock_guard<std::mutex> guard(fMutex);
    if (fpWriter) {
        fpWriter->Abort();
    }
}

} // namespace MCHost
