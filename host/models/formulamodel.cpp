#include "models/formulamodel.h"

#include "common/hosterror.h"
#include "data/inputlimits.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <muParser.h>

#include <algorithm>
#include <atomic>
#include <cctype>
#include <cmath>
#include <deque>
#include <fstream>
#include <map>
#include <set>
#include <sstream>
#include <unordered_set>

namespace MCHost {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCXML_800::Value;
using MCXML_800::ValueRecord;

namespace {

// ------------------------------------------------------------------------------------------
// Operators. The parser's own binary operators are switched off and these take their place
// with the same precedence and associativity, so that a division can refuse a zero divisor:
// muParser itself would return an infinity, or hide the fault entirely in 1/(1/x).

//! Thrown by the division operator for a zero divisor; caught around each evaluation.
struct DivisionByZero {};

double OpAdd(double a, double b) {
    return a + b;
}
double OpSub(double a, double b) {
    return a - b;
}
double OpMul(double a, double b) {
    return a * b;
}
double OpDiv(double a, double b) {
    // A missing numerator makes the quotient missing whatever the divisor.
    if (b == 0.0 && !std::isnan(a)) {
        throw DivisionByZero();
    }
    return a / b;
}
double OpPow(double a, double b) {
    return std::pow(a, b);
}
double OpLt(double a, double b) {
    return a < b ? 1.0 : 0.0;
}
double OpGt(double a, double b) {
    return a > b ? 1.0 : 0.0;
}
double OpLe(double a, double b) {
    return a <= b ? 1.0 : 0.0;
}
double OpGe(double a, double b) {
    return a >= b ? 1.0 : 0.0;
}
double OpEq(double a, double b) {
    return a == b ? 1.0 : 0.0;
}
double OpNe(double a, double b) {
    return a != b ? 1.0 : 0.0;
}
double OpAnd(double a, double b) {
    return (a != 0.0 && b != 0.0) ? 1.0 : 0.0;
}
double OpOr(double a, double b) {
    return (a != 0.0 || b != 0.0) ? 1.0 : 0.0;
}

//! A parser with the checked operators. Assignment ("x = 1" inside an expression) is not
//! among them, so an expression cannot change an input.
std::unique_ptr<mu::Parser> MakeParser() {
    auto p = std::make_unique<mu::Parser>();
    p->EnableBuiltInOprt(false);
    p->DefineOprt("+", OpAdd, mu::prADD_SUB, mu::oaLEFT);
    p->DefineOprt("-", OpSub, mu::prADD_SUB, mu::oaLEFT);
    p->DefineOprt("*", OpMul, mu::prMUL_DIV, mu::oaLEFT);
    p->DefineOprt("/", OpDiv, mu::prMUL_DIV, mu::oaLEFT);
    p->DefineOprt("^", OpPow, mu::prPOW, mu::oaRIGHT);
    p->DefineOprt("<=", OpLe, mu::prCMP, mu::oaLEFT);
    p->DefineOprt(">=", OpGe, mu::prCMP, mu::oaLEFT);
    p->DefineOprt("==", OpEq, mu::prCMP, mu::oaLEFT);
    p->DefineOprt("!=", OpNe, mu::prCMP, mu::oaLEFT);
    p->DefineOprt("<", OpLt, mu::prCMP, mu::oaLEFT);
    p->DefineOprt(">", OpGt, mu::prCMP, mu::oaLEFT);
    p->DefineOprt("&&", OpAnd, mu::prLAND, mu::oaLEFT);
    p->DefineOprt("||", OpOr, mu::prLOR, mu::oaLEFT);
    return p;
}

// ------------------------------------------------------------------------------------------
// Reading model lines.

bool IsIdentifier(const std::string& s) {
    if (s.empty() || !(std::isalpha(static_cast<unsigned char>(s[0])) || s[0] == '_')) {
        return false;
    }
    for (char c : s) {
        if (!(std::isalnum(static_cast<unsigned char>(c)) || c == '_')) {
            return false;
        }
    }
    return true;
}

std::string Trim(const std::string& s) {
    std::size_t b = 0;
    std::size_t e = s.size();
    while (b < e && std::isspace(static_cast<unsigned char>(s[b]))) {
        ++b;
    }
    while (e > b && std::isspace(static_cast<unsigned char>(s[e - 1]))) {
        --e;
    }
    return s.substr(b, e - b);
}

//! The line without its comment: '#' outside double quotes starts one.
std::string StripComment(const std::string& line) {
    bool quoted = false;
    for (std::size_t i = 0; i < line.size(); ++i) {
        if (line[i] == '"') {
            quoted = !quoted;
        } else if (line[i] == '#' && !quoted) {
            return line.substr(0, i);
        }
    }
    return line;
}

//! `keyword` followed by blanks at the start of `s`, but not `keyword =` (a target that is
//! simply named like the keyword).
bool StartsWithKeyword(const std::string& s, const std::string& keyword, std::string& rest) {
    if (s.compare(0, keyword.size(), keyword) != 0 || s.size() <= keyword.size() ||
        !std::isspace(static_cast<unsigned char>(s[keyword.size()]))) {
        return false;
    }
    rest = Trim(s.substr(keyword.size()));
    return rest.empty() || rest[0] != '=';
}

//! Reads a list of double-quoted labels ("" inside one stands for a quote) that makes up all
//! of `text`. Throws with `where` for anything else.
std::vector<std::string> ParseLabels(const std::string& text, const std::string& where) {
    std::vector<std::string> labels;
    std::unordered_set<std::string> seen; // a hash keeps the duplicate check linear
    const std::size_t maxLabels = InputLimits::Get().fMaxCategories;
    std::size_t i = 0;
    for (;;) {
        while (i < text.size() && std::isspace(static_cast<unsigned char>(text[i]))) {
            ++i;
        }
        if (i == text.size()) {
            return labels;
        }
        if (text[i] != '"') {
            throw HostError(where + "expected a label in double quotes, found '" + text.substr(i) +
                            "'");
        }
        std::string label;
        ++i;
        for (;;) {
            if (i == text.size()) {
                throw HostError(where + "a label's closing quote is missing");
            }
            if (text[i] == '"') {
                if (i + 1 < text.size() && text[i + 1] == '"') {
                    label.push_back('"');
                    i += 2;
                    continue;
                }
                ++i;
                break;
            }
            label.push_back(text[i++]);
        }
        if (!seen.insert(label).second) {
            throw HostError(where + "the label \"" + label + "\" is listed twice");
        }
        if (labels.size() == maxLabels) {
            throw HostError(where + "more than " + std::to_string(maxLabels) + " labels" +
                            RaiseHint("MCSIM_MAX_CATEGORIES"));
        }
        labels.push_back(std::move(label));
    }
}

//! Position of the word `labels` that introduces the label list of a category line: the last
//! one outside quotes that is followed only by blanks and quoted labels. npos when none.
std::size_t FindLabelsKeyword(const std::string& s) {
    const std::size_t firstQuote = s.find('"');
    const std::string head = s.substr(0, firstQuote);
    const std::string trimmed = Trim(head);
    const std::string kw = "labels";
    if (trimmed.size() < kw.size() ||
        trimmed.compare(trimmed.size() - kw.size(), kw.size(), kw) != 0) {
        return std::string::npos;
    }
    const std::size_t pos = trimmed.size() - kw.size();
    if (pos > 0 &&
        (std::isalnum(static_cast<unsigned char>(trimmed[pos - 1])) || trimmed[pos - 1] == '_')) {
        return std::string::npos;
    }
    // `trimmed` starts where `s` starts (only trailing blanks were cut after the leading ones).
    const std::size_t lead = head.find_first_not_of(" \t");
    return lead + pos;
}

//! Names an expression uses, in first-use order, collected by the parser's variable factory.
struct NameCollector {
    std::deque<double> fStorage;     //!< one value per name, addresses stable
    std::vector<std::string> fNames; //!< names in first-use order
};

double* CollectName(const char* name, void* user) {
    auto* collector = static_cast<NameCollector*>(user);
    collector->fNames.emplace_back(name);
    collector->fStorage.push_back(1.0);
    return &collector->fStorage.back();
}

//! Compiles `expression` once, without evaluating it, to check its syntax, and returns the
//! names it uses. `column` is where the expression starts on its line (from 1).
std::vector<std::string> CheckExpression(const std::string& expression, const std::string& where,
                                         const std::string& target, std::size_t column) {
    NameCollector collector;
    std::unique_ptr<mu::Parser> parser = MakeParser();
    parser->SetVarFactory(CollectName, &collector);
    try {
        parser->SetExpr(expression);
        static_cast<void>(parser->GetUsedVar());
    } catch (const mu::ParserError& e) {
        std::string message = where + "syntax error in the expression of '" + target + "'";
        if (e.GetPos() >= 0) {
            message +=
                " at column " + std::to_string(column + static_cast<std::size_t>(e.GetPos()));
        }
        throw HostError(message + ": " + e.GetMsg());
    }
    return collector.fNames;
}

std::string NumberText(double x) {
    return MCMV::IsMissing(x) ? std::string("missing") : MCCommon_800::FormatDefault(x);
}

} // namespace

// ------------------------------------------------------------------------------------------
// FormulaModel

FormulaModel FormulaModel::Load(const std::string& path) {
    // A regular file of bounded size, read once: a pipe or /dev/zero is refused.
    std::istringstream in(
        ReadInputFile(path, "model file", InputLimits::Get().fMaxModelBytes, "MCSIM_MAX_MODEL_MB"));
    return Parse(in, path);
}

FormulaModel FormulaModel::Parse(std::istream& in, const std::string& fileName) {
    FormulaModel model;
    model.fFileName = fileName;
    std::map<std::string, long> defined; // target and levels names -> line
    std::string raw;
    long lineNo = 0;
    while (std::getline(in, raw)) {
        ++lineNo;
        if (!raw.empty() && raw.back() == '\r') {
            raw.pop_back();
        }
        if (lineNo == 1 && raw.compare(0, 3, "\xEF\xBB\xBF") == 0) {
            raw.erase(0, 3);
        }
        const std::string where = LocatedMessage(fileName, lineNo, "");
        const std::string line = Trim(StripComment(raw));
        if (line.empty()) {
            continue;
        }
        auto claim = [&](const std::string& name) {
            const auto [it, isNew] = defined.emplace(name, lineNo);
            if (!isNew) {
                throw HostError(where + "'" + name + "' is already defined on line " +
                                std::to_string(it->second));
            }
        };

        std::string rest;
        if (StartsWithKeyword(line, "levels", rest)) {
            const std::size_t sp = rest.find_first_of(" \t\"");
            FormulaInputLevels levels;
            levels.fName = Trim(rest.substr(0, sp));
            levels.fLine = lineNo;
            if (!IsIdentifier(levels.fName)) {
                throw HostError(where + "expected 'levels NAME \"text\" ...', the name '" +
                                levels.fName + "' is not a name");
            }
            levels.fvLabels = ParseLabels(sp == std::string::npos ? "" : rest.substr(sp), where);
            if (levels.fvLabels.empty()) {
                throw HostError(where + "'levels " + levels.fName + "' lists no texts");
            }
            claim(levels.fName);
            model.fvLevels.push_back(std::move(levels));
            continue;
        }

        FormulaTarget target;
        target.fLine = lineNo;
        std::string definition = line;
        if (StartsWithKeyword(line, "category", rest)) {
            target.fbCategorical = true;
            definition = rest;
        }
        const std::size_t eq = definition.find('=');
        if (eq == std::string::npos) {
            throw HostError(where + "expected 'target = expression'");
        }
        target.fName = Trim(definition.substr(0, eq));
        if (!IsIdentifier(target.fName)) {
            throw HostError(where + "expected 'target = expression'; '" + target.fName +
                            "' is not a name (letters, digits and _, not starting with a "
                            "digit)");
        }
        std::string expression = definition.substr(eq + 1);
        if (target.fbCategorical) {
            const std::size_t kw = FindLabelsKeyword(expression);
            if (kw == std::string::npos) {
                throw HostError(where + "a category line ends with 'labels \"first\" "
                                        "\"second\" ...'");
            }
            target.fvLabels = ParseLabels(expression.substr(kw + 6), where);
            if (target.fvLabels.size() < 2) {
                throw HostError(where + "category '" + target.fName +
                                "' needs at least two labels");
            }
            expression = expression.substr(0, kw);
        }
        // Column of the expression's first character on the raw line, for messages: the
        // first '=' of a line is the one after the target's name.
        const std::size_t rawEq = raw.find('=');
        const std::size_t exprStart = raw.find_first_not_of(" \t", rawEq + 1);
        target.fExpression = Trim(expression);
        if (target.fExpression.empty()) {
            throw HostError(where + "the expression of '" + target.fName + "' is empty");
        }
        target.fvNames = CheckExpression(target.fExpression, where, target.fName,
                                         exprStart == std::string::npos ? 1 : exprStart + 1);
        claim(target.fName);
        model.fvTargets.push_back(std::move(target));
    }
    if (in.bad()) {
        throw HostError(LocatedMessage(fileName, lineNo, "reading the model file failed"));
    }
    if (model.fvTargets.empty()) {
        throw HostError(LocatedMessage(fileName, 0, "the model defines no target"));
    }
    return model;
}

std::vector<std::string> FormulaModel::GetInputNames() const {
    std::set<std::string> targets;
    std::set<std::string> seen;
    std::vector<std::string> names;
    for (const FormulaTarget& t : fvTargets) {
        for (const std::string& n : t.fvNames) {
            if (targets.count(n) == 0 && seen.insert(n).second) {
                names.push_back(n);
            }
        }
        targets.insert(t.fName);
    }
    return names;
}

std::string FormulaModel::CheckInputs(const std::vector<std::string>& inputs) const {
    const std::set<std::string> known(inputs.begin(), inputs.end());
    std::set<std::string> earlier;
    for (const FormulaTarget& t : fvTargets) {
        if (known.count(t.fName) != 0) {
            return LocatedMessage(fFileName, t.fLine,
                                  "target '" + t.fName + "' has the name of an input field");
        }
        for (const std::string& n : t.fvNames) {
            if (known.count(n) != 0 || earlier.count(n) != 0) {
                continue;
            }
            // A name cannot start with a digit or a point: this is a number the expression
            // reader could not take (1e999 overflows a double).
            if (!n.empty() && (std::isdigit(static_cast<unsigned char>(n[0])) || n[0] == '.')) {
                return LocatedMessage(fFileName, t.fLine,
                                      "the number '" + n + "' in the expression of '" + t.fName +
                                          "' is not a finite double");
            }
            const bool later = std::any_of(fvTargets.begin(), fvTargets.end(),
                                           [&](const FormulaTarget& o) { return o.fName == n; });
            return LocatedMessage(fFileName, t.fLine,
                                  later ? "'" + t.fName + "' uses the target '" + n +
                                              "' before the line that defines it"
                                        : "unknown name '" + n + "' in the expression of '" +
                                              t.fName + "' (not an input field or a target)");
        }
        earlier.insert(t.fName);
    }
    return std::string();
}

// ------------------------------------------------------------------------------------------
// FormulaScoreFactory

struct FormulaScoreFactory::Shared {
    explicit Shared(FormulaModel model) : fModel(std::move(model)) {}

    //! Keeps the first message; counts every failed case.
    void Record(const std::string& message) {
        fNErrors.fetch_add(1, std::memory_order_relaxed);
        std::lock_guard<std::mutex> guard(fMutex);
        if (fFirstError.empty()) {
            fFirstError = message;
        }
    }

    const FormulaModel fModel;             //!< read-only after construction
    mutable std::mutex fMutex;             //!< guards fFirstError
    std::string fFirstError;               //!< first message of any computer
    std::atomic<std::int64_t> fNErrors{0}; //!< failed cases
};

FormulaScoreFactory::FormulaScoreFactory(FormulaModel model)
    : fpShared(std::make_shared<Shared>(std::move(model))) {}

FormulaScoreFactory::~FormulaScoreFactory() = default;

std::unique_ptr<MCXML_800::IMCScoreComputer> FormulaScoreFactory::CreateScoreComputer() {
    return std::make_unique<FormulaScoreComputer>(fpShared);
}

const FormulaModel& FormulaScoreFactory::GetModel() const {
    return fpShared->fModel;
}

std::string FormulaScoreFactory::GetFirstError() const {
    std::lock_guard<std::mutex> guard(fpShared->fMutex);
    return fpShared->fFirstError;
}

std::int64_t FormulaScoreFactory::GetNErrors() const {
    return fpShared->fNErrors.load(std::memory_order_relaxed);
}

// ------------------------------------------------------------------------------------------
// FormulaScoreComputer

struct FormulaScoreComputer::Impl {
    //! One input the expressions read.
    struct InputBinding {
        std::string fName;                            //!< input name
        int fSlot = 0;                                //!< its value slot
        int fPosition = -1;                           //!< its place in the input record
        const FormulaInputLevels* fpLevels = nullptr; //!< texts, for a text input
        long fLine = 0;                               //!< first line using it
    };

    std::vector<double> fvSlots;        //!< one value per name; never resized
    std::vector<char> fvMissing;        //!< slot holds a missing value
    std::vector<InputBinding> fvInputs; //!< inputs in first-use order
    //! The layout id of the input record whose places the bindings hold (0: none checked).
    std::uint64_t fBoundLayout = 0;
    std::vector<int> fvTargetSlots;                     //!< slot of each target
    std::vector<std::vector<int>> fvTargetUses;         //!< slots each target's expression reads
    std::vector<std::unique_ptr<mu::Parser>> fvParsers; //!< one per target
};

FormulaScoreComputer::FormulaScoreComputer(std::shared_ptr<FormulaScoreFactory::Shared> shared)
    : fpShared(std::move(shared)) {
    for (const FormulaTarget& t : fpShared->fModel.GetTargets()) {
        if (t.fbCategorical) {
            fvTargetVars.push_back(std::make_unique<MCXML_800::MCCatVar>(
                t.fName, MCXML_800::MCCatNumEncoder(t.fvLabels), false,
                MCXML_800::IMCVariable::kNominalKind));
        } else {
            fvTargetVars.push_back(std::make_unique<MCXML_800::MCScaleVar>(t.fName));
        }
    }
}

FormulaScoreComputer::~FormulaScoreComputer() = default;

int FormulaScoreComputer::GetNTargets() const {
    return static_cast<int>(fvTargetVars.size());
}

const MCXML_800::IMCVariable* FormulaScoreComputer::GetTargetVariable(int i) const {
    if (i < 0 || i >= GetNTargets()) {
        return nullptr;
    }
    return fvTargetVars[static_cast<std::size_t>(i)].get();
}

MCStatus FormulaScoreComputer::Fail(long code, const std::string& message) {
    fLastError = message;
    fpShared->Record(message);
    return MCStatus(code, false);
}

MCStatus FormulaScoreComputer::PrepareOutputRecord(const ValueRecord& input, ValueRecord& output) {
    fpImpl.reset();
    output.Clear();
    const FormulaModel& model = fpShared->fModel;
    try {
        std::vector<std::string> inputNames;
        for (int i = 0; i < input.Size(); ++i) {
            inputNames.push_back(input.GetName(i));
        }
        const std::string problem = model.CheckInputs(inputNames);
        if (!problem.empty()) {
            return Fail(HostStatus::kScoreInput, problem);
        }

        auto impl = std::make_unique<Impl>();
        // Slots: targets first, then every input some expression reads.
        std::map<std::string, int> slotOf;
        const std::vector<FormulaTarget>& targets = model.GetTargets();
        for (const FormulaTarget& t : targets) {
            slotOf.emplace(t.fName, static_cast<int>(slotOf.size()));
        }
        for (const FormulaTarget& t : targets) {
            for (const std::string& n : t.fvNames) {
                if (slotOf.emplace(n, static_cast<int>(slotOf.size())).second) {
                    Impl::InputBinding b;
                    b.fName = n;
                    b.fSlot = slotOf[n];
                    b.fPosition = input.IndexOf(n);
                    b.fLine = t.fLine;
                    for (const FormulaInputLevels& l : model.GetInputLevels()) {
                        if (l.fName == n) {
                            b.fpLevels = &l;
                        }
                    }
                    impl->fvInputs.push_back(std::move(b));
                }
            }
        }
        impl->fvSlots.assign(slotOf.size(), MCMV::Missing());
        impl->fvMissing.assign(slotOf.size(), 1);

        for (const FormulaTarget& t : targets) {
            std::unique_ptr<mu::Parser> parser = MakeParser();
            std::vector<int> uses;
            for (const std::string& n : t.fvNames) {
                const int slot = slotOf[n];
                uses.push_back(slot);
                parser->DefineVar(n, &impl->fvSlots[static_cast<std::size_t>(slot)]);
            }
            parser->SetExpr(t.fExpression);
            // Compile now, on the preparing thread: the first Eval builds the byte code.
            try {
                parser->Eval();
            } catch (const DivisionByZero&) {
            }
            impl->fvTargetSlots.push_back(slotOf[t.fName]);
            impl->fvTargetUses.push_back(std::move(uses));
            impl->fvParsers.push_back(std::move(parser));
            output.Add(t.fName, Value(MCMV::Missing()));
        }
        fpImpl = std::move(impl);
    } catch (const mu::ParserError& e) {
        return Fail(
            HostStatus::kScoreInput,
            LocatedMessage(model.GetFileName(), 0, "preparing the model failed: " + e.GetMsg()));
    } catch (const std::exception& e) {
        return Fail(HostStatus::kScoreInput,
                    LocatedMessage(model.GetFileName(), 0,
                                   std::string("preparing the model failed: ") + e.what()));
    }
    return MCStatus();
}

MCStatus FormulaScoreComputer::ScoreRecord(const ValueRecord& input, ValueRecord& output) {
    const FormulaModel& model = fpShared->fModel;
    const std::vector<FormulaTarget>& targets = model.GetTargets();
    if (!fpImpl) {
        return Fail(HostStatus::kScoreNotPrepared,
                    LocatedMessage(model.GetFileName(), 0,
                                   "a case was scored before the model was prepared"));
    }
    Impl& impl = *fpImpl;
    if (output.Size() != static_cast<int>(targets.size())) {
        output.Clear();
        for (const FormulaTarget& t : targets) {
            output.Add(t.fName, Value(MCMV::Missing()));
        }
    }
    auto missingFrom = [&](std::size_t first) {
        for (std::size_t k = first; k < targets.size(); ++k) {
            output[static_cast<int>(k)].SetReal(MCMV::Missing());
        }
    };

    // The inputs, by the positions found when preparing, checked by name whenever the record's
    // layout is not the one they were last checked against (a caller may hand in a record of
    // another layout; the simulation hands in the same one case after case).
    const bool placesChecked = input.GetLayoutId() == impl.fBoundLayout;
    for (Impl::InputBinding& b : impl.fvInputs) {
        int pos = b.fPosition;
        if (!placesChecked && (pos < 0 || pos >= input.Size() || input.GetName(pos) != b.fName)) {
            pos = input.IndexOf(b.fName);
            b.fPosition = pos;
        }
        if (pos < 0) {
            missingFrom(0);
            return Fail(HostStatus::kScoreInput,
                        LocatedMessage(model.GetFileName(), b.fLine,
                                       "the case has no input '" + b.fName + "'"));
        }
        const Value& v = input[pos];
        double x = MCMV::Missing();
        if (v.GetType() == Value::kReal) {
            x = v.GetReal();
        } else if (v.GetType() == Value::kString) {
            const std::string& text = v.GetText();
            if (b.fpLevels) {
                const auto& labels = b.fpLevels->fvLabels;
                const auto it = std::find(labels.begin(), labels.end(), text);
                if (it == labels.end() && !text.empty()) {
                    missingFrom(0);
                    return Fail(HostStatus::kScoreInput,
                                LocatedMessage(model.GetFileName(), b.fpLevels->fLine,
                                               "input '" + b.fName + "' holds \"" + text +
                                                   "\", which its levels line does not list"));
                }
                x = it == labels.end() ? MCMV::Missing() : static_cast<double>(it - labels.begin());
            } else if (!text.empty() && !MCCommon_800::ParseDouble(text, x)) {
                missingFrom(0);
                return Fail(HostStatus::kScoreInput,
                            LocatedMessage(model.GetFileName(), b.fLine,
                                           "input '" + b.fName + "' holds the text \"" + text +
                                               "\"; list its texts with 'levels " + b.fName +
                                               " \"...\"' to use it in an expression"));
            }
        } else {
            missingFrom(0);
            return Fail(HostStatus::kScoreInput,
                        LocatedMessage(model.GetFileName(), b.fLine,
                                       "input '" + b.fName + "' holds a list, not a value"));
        }
        const auto slot = static_cast<std::size_t>(b.fSlot);
        impl.fvSlots[slot] = x;
        impl.fvMissing[slot] = MCMV::IsMissing(x) ? 1 : 0;
    }
    impl.fBoundLayout = input.GetLayoutId();

    for (std::size_t k = 0; k < targets.size(); ++k) {
        const FormulaTarget& t = targets[k];
        bool usesMissing = false;
        for (int slot : impl.fvTargetUses[k]) {
            usesMissing = usesMissing || impl.fvMissing[static_cast<std::size_t>(slot)] != 0;
        }
        auto valuesText = [&]() {
            std::string s;
            for (const std::string& n : t.fvNames) {
                const auto it =
                    std::find_if(impl.fvInputs.begin(), impl.fvInputs.end(),
                                 [&](const Impl::InputBinding& b) { return b.fName == n; });
                double x = MCMV::Missing();
                if (it != impl.fvInputs.end()) {
                    x = impl.fvSlots[static_cast<std::size_t>(it->fSlot)];
                } else {
                    for (std::size_t j = 0; j < k; ++j) {
                        if (targets[j].fName == n) {
                            x = impl.fvSlots[static_cast<std::size_t>(impl.fvTargetSlots[j])];
                        }
                    }
                }
                s += (s.empty() ? " (with " : ", ") + n + " = " + NumberText(x);
            }
            return s.empty() ? s : s + ")";
        };
        double r = MCMV::Missing();
        try {
            r = impl.fvParsers[k]->Eval();
        } catch (const DivisionByZero&) {
            missingFrom(k);
            return Fail(HostStatus::kScoreEvaluation,
                        LocatedMessage(model.GetFileName(), t.fLine,
                                       "division by zero in the expression of '" + t.fName + "'" +
                                           valuesText()));
        } catch (const mu::ParserError& e) {
            missingFrom(k);
            return Fail(HostStatus::kScoreEvaluation,
                        LocatedMessage(model.GetFileName(), t.fLine,
                                       "evaluating '" + t.fName + "' failed: " + e.GetMsg()));
        }
        if (!std::isfinite(r)) {
            if (!usesMissing) {
                missingFrom(k);
                return Fail(
                    HostStatus::kScoreEvaluation,
                    LocatedMessage(model.GetFileName(), t.fLine,
                                   "'" + t.fName + "' is not a finite number (" +
                                       (std::isnan(r) ? std::string("NaN") : NumberText(r)) +
                                       "): a value outside a function's domain" + valuesText()));
            }
            r = MCMV::Missing();
        }
        if (t.fbCategorical && !MCMV::IsMissing(r)) {
            const double n = static_cast<double>(t.fvLabels.size());
            if (r != std::floor(r) || r < 0.0 || r >= n) {
                missingFrom(k);
                return Fail(HostStatus::kScoreEvaluation,
                            LocatedMessage(model.GetFileName(), t.fLine,
                                           "category '" + t.fName + "' gives " + NumberText(r) +
                                               ", not an index 0 to " +
                                               std::to_string(t.fvLabels.size() - 1) +
                                               " of its labels" + valuesText()));
            }
        }
        const auto slot = static_cast<std::size_t>(impl.fvTargetSlots[k]);
        impl.fvSlots[slot] = r;
        impl.fvMissing[slot] = MCMV::IsMissing(r) ? 1 : 0;
        output[static_cast<int>(k)].SetReal(r);
    }
    return MCStatus();
}

} // namespace MCHost
