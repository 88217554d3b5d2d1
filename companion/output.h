// The output of the companions: whole lines, in colour only on a terminal.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::companion {

enum class ColorWhen { automatic, always, never };

/// "auto", "always" and "never", as --color has them.
ColorWhen colorWhenNamed(std::string_view name) noexcept;

/// Whether to colour the output to this descriptor. --color decides first, then NO_COLOR and CLICOLOR_FORCE
/// (https://no-color.org, https://bixense.com/clicolors/), then whether it is a terminal.
bool wantsColor(ColorWhen when, int descriptor);

/// Standard output. A closed pipe is not an error: the rest of the output is dropped. For one
/// thread.
class Output {
  public:
    explicit Output(int descriptor) : descriptor_(descriptor) {}

    /// Writes the whole text, and waits for a slow reader.
    void write(std::string_view text);

    /// Whether a write failed for another reason than a closed pipe, for example a full disk.
    bool hasFailed() const noexcept { return failed_; }

    /// Whether the reader has closed the pipe.
    bool isClosed() const noexcept { return closed_; }

  private:
    const int descriptor_;
    bool closed_ = false;
    bool failed_ = false;
};

}  // namespace pinwell::companion
