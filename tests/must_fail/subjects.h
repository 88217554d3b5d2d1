// Artefacts of the three kinds with their hash, and runs of the tool over them in the test's own
// process: real files, real code signing, real trust with the test's anchors. The test replaces the
// network.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "support/test_platform.h"
#include "support/ticket_builder.h"
#include "trust/trust_service.h"

namespace pinwell::test {

using base::Data;

/// One possible artefact, with its ticket.
struct Subject {
    std::string name;      // of the kind, as a part of a test's name
    std::string fileName;  // with the kind's extension
    std::uint8_t algorithm = 0;
    Data hash;
    std::function<void(const std::string& path, const std::optional<Data>& ticket)> write;

    /// A payload that lists the hash.
    TicketPayloadBuilder payload() const { return TicketPayloadBuilder().entry(algorithm, hash); }

    friend void PrintTo(const Subject& subject, std::ostream* out) { *out << subject.name; }
};

/// A bundle, a signed and an unsigned disk image, a flat package.
const std::vector<Subject>& subjects();
const Subject& subjectNamed(const std::string& name);

/// The whole state on disk as one text: a file's bytes, or the bytes of a bundle's ticket.
std::string contentsOf(const std::string& path);

struct SignerAnchors {
    std::vector<Data> roots;
    std::vector<Data> compatibility;
    std::vector<Data> allowed;
    std::vector<Data> denied;
};

/// Ends as the tool ends. Of use for any number of runs.
class ToolRun {
  public:
    explicit ToolRun(const SignerAnchors& anchors);

    /// A path for an artefact.
    std::string path(const std::string& name) const { return platform_.directory / name; }

    int validate(const std::string& path, const std::string& answer);
    /// `meanwhile` runs during the lookup.
    int staple(const std::string& path, const std::string& answer,
               const std::function<void()>& meanwhile = {});

    /// Whether its ticket passes the check before the lookup.
    bool passesOffline(const std::string& path);

  private:
    int run(const std::string& path, const std::string& answer, std::uint8_t operation,
            const std::function<void()>& meanwhile = {});

    TestPlatform platform_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
    std::unique_ptr<trust::TrustService> trust_;
    Platform services_;
};

}  // namespace pinwell::test
