// Runs of the tool in the test's own process and thread: the real file service and code-signing service, the
// test in the place of the network, and a trust service that accepts any ticket.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "e2e/artefacts.h"
#include "support/controller_run.h"
#include "support/test_platform.h"

namespace pinwell::test {

/// What came of a run.
struct Outcome {
    int status = 0;
    std::vector<std::string> lines;  // of a verbose run

    /// Whether one of the lines begins so.
    bool says(std::string_view beginning) const;
};
void PrintTo(const Outcome& outcome, std::ostream* stream);

class Stapling {
  public:
    /// `temporary` is where tickets and debug copies go.
    explicit Stapling(const std::string& temporary);

    /// `pinwell staple PATH`, from the first look at the path to the last line.
    Outcome staple(const std::string& path, const Data& ticket);

    /// Removes the ticket of an image or a package.
    Outcome erase(const std::string& path);

  private:
    int run(const URL& path, const Data& ticket);

    TestPlatform platform_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
};

}  // namespace pinwell::test
