// Runs of the tool in the test's own process and thread: the real file service and code-signing service. The
// test replaces the network, and the trust service accepts any ticket.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "e2e/artefacts.h"
#include "support/controller_run.h"
#include "support/test_platform.h"

namespace pinwell::test {

/// The outcome of a run.
struct Outcome {
    int status = 0;
    std::vector<std::string> lines;  // of a verbose run

    /// Whether one of the lines begins with this text.
    bool says(std::string_view beginning) const;
};
void PrintTo(const Outcome& outcome, std::ostream* stream);

class Stapling {
  public:
    /// `temporary` is the directory of tickets and debug copies.
    explicit Stapling(const std::string& temporary);

    /// `pinwell staple PATH`, from opening the path to the last line.
    Outcome staple(const std::string& path, const Data& ticket);

    /// Removes the ticket of an image or a package.
    Outcome erase(const std::string& path);

  private:
    int run(const URL& path, const Data& ticket);

    TestPlatform platform_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
};

}  // namespace pinwell::test
