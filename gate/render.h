// The results of a run as text for a person, and as documents for programs. Texts from artefacts are escaped
// for the format, and in UTF-8.
#pragma once

#include <string>
#include <vector>

#include "run.h"

namespace pinwell::gate {

std::string render(Format format, const std::vector<Result>& results);

/// The conclusion first, then only failures and notes.
std::string renderText(const std::vector<Result>& results);

/// docs/gate.schema.json.
std::string renderJson(const std::vector<Result>& results);

/// SARIF 2.1.0: a result for each check that did not pass. The rules are the checks' names.
std::string renderSarif(const std::vector<Result>& results);

/// JUnit XML: a test suite for each path, a test case for each check.
std::string renderJUnit(const std::vector<Result>& results);

/// One self-contained page without scripts.
std::string renderHtml(const std::vector<Result>& results);

/// An in-toto statement with a verification summary (https://slsa.dev/verification_summary/v1), not signed:
/// one subject for each artefact whose bytes have a digest. `time`: seconds since 1970-01-01 00:00:00 UTC.
std::string renderAttestation(const std::vector<Result>& results, const Options& options, std::int64_t time);

}  // namespace pinwell::gate
