// The diagnostic lines of a parser.
#pragma once

#include <string>
#include <vector>

#include "formats/findings.h"

namespace pinwell::test {

/// Collects the lines that go to its diagnostics(), which must not outlive it.
class CollectedDiagnostics {
  public:
    Diagnostics diagnostics() {
        return Diagnostics([this](std::string line) { lines_.push_back(std::move(line)); });
    }

    const std::vector<std::string>& lines() const noexcept { return lines_; }

    /// The lines, each with a newline.
    std::string text() const {
        std::string text;
        for (const std::string& line : lines_) text += line + '\n';
        return text;
    }

  private:
    std::vector<std::string> lines_;
};

}  // namespace pinwell::test
