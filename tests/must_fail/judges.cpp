#include "judges.h"

#include <algorithm>

#include "gate/case.h"
#include "inspect/gather.h"
#include "library/assessment.h"
#include "library/c_calls.h"
#include "src/messages.h"
#include "support/certificate_builder.h"
#include "values/date.h"

namespace pinwell::test {
namespace {

constexpr std::int64_t kNow = 1795204500;  // 2026-11-20 19:55:00 UTC

void writeAnchors(const std::string& folder, const std::vector<Data>& certificates) {
    for (std::size_t i = 0; i < certificates.size(); ++i)
        writeFile(folder + "/" + std::to_string(i) + ".pem", toPem("CERTIFICATE", certificates[i]));
}

std::string nameOf(inspect::Outcome outcome) {
    switch (outcome) {
        case inspect::Outcome::good:
            return "good";
        case inspect::Outcome::noTicket:
            return "noTicket";
        case inspect::Outcome::refused:
            return "refused";
        case inspect::Outcome::revoked:
            return "revoked";
        case inspect::Outcome::unreadable:
            break;
    }
    return "unreadable";
}

}  // namespace

void PrintTo(const Statement& statement, std::ostream* out) {
    *out << statement.verdict << ": " << statement.sentence << " [" << statement.rule << "] at ";
    if (statement.offset)
        *out << *statement.offset;
    else
        *out << "no offset";
}

Judges::Judges(const SignerAnchors& anchors) : codeSigning_(codesign::makeCodeSigningService()) {
    verboseLevel = kVerbosityQuiet;
    const std::string directory = platform_.platformDirectory.path();
    writeAnchors(directory + "/roots", anchors.roots);
    writeAnchors(directory + "/compat-roots", anchors.compatibility);
    writeAnchors(directory + "/user-trust/allow", anchors.allowed);
    writeAnchors(directory + "/user-trust/deny", anchors.denied);
    trust_ = trust::makeTrustService(
        platform_.platformDirectory, [](std::string_view) {}, [] { return values::Date{kNow}; });
}

Platform Judges::services() {
    const Platform fakes = platform_.servicesWith(*codeSigning_);
    return {fakes.files,        fakes.types,     fakes.codeSigning, *trust_,          fakes.https,
            fakes.userDefaults, fakes.systemLog, fakes.directory,   fakes.exitProcess};
}

Statement Judges::library(const std::string& path) const {
    const auto roots = ticket::TrustedRoots::fromPlatformDirectory(platform_.platformDirectory.path());
    const library::Assessment found =
        library::assess(path, library::Depth::ticket, roots, {.evaluationTime = kNow, .threads = 1});
    Statement statement{pinwell_verdict_text(found.verdict), found.reason, {}, {}};
    try {
        const library::LocatedTicket ticket = library::findTicket(path);
        const ticket::Validation judged = ticket::validate(ticket.bytes, roots, kNow);
        if (judged.isGenuine) return statement;
        statement.rule = judged.reason;
        statement.offset = ticket.offset + judged.offset;
    } catch (const library::Failure& failure) {
        if (failure.status != PINWELL_ERROR_MALFORMED) return statement;
        statement.rule = failure.message;
        statement.offset = failure.offset;
    }
    return statement;
}

Statement Judges::inspection(const std::string& path) {
    const inspect::Report report = inspect::Inspector(services()).inspect(path);
    Statement statement{nameOf(report.outcome), report.conclusion, {}, {}};
    if (!report.fault) return statement;
    statement.rule = report.fault->rule;
    statement.offset = report.fault->fileOffset;
    return statement;
}

Statement Judges::gate(const std::string& path) {
    const Platform platform = services();
    gate::Options options;
    options.tickets = gate::Options::Tickets::offline;
    options.isShallow = true;
    verify::Workers workers(1);
    const gate::Judgement judgement{platform, options, workers, nullptr, kNow};
    gate::Case one(path, judgement);
    one.examine();
    const gate::Result result = std::move(one).conclude();
    Statement statement{std::string(gate::verdictName(result.verdict)), result.conclusion, {}, {}};
    for (const verify::Check& check : verify::flattened(result.checks)) {
        if (check.outcome != verify::Outcome::failed) continue;
        statement.rule = check.found;
        break;
    }
    return statement;
}

}  // namespace pinwell::test
