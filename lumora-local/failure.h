// A failed operation of the record service: one line for a person, and the exit status.
#pragma once

#include <sysexits.h>

#include <stdexcept>
#include <string>

namespace pinwell::lumora {

/// Leaves an operation that cannot be carried out; caught once, in main. The text is one line, already
/// escaped for a terminal (values::format does that). The exit status is one of <sysexits.h>.
class Failure : public std::runtime_error {
  public:
    Failure(int exitStatus, const std::string& text) : std::runtime_error(text), exitStatus_(exitStatus) {}

    int exitStatus() const noexcept { return exitStatus_; }

  private:
    int exitStatus_;
};

}  // namespace pinwell::lumora
