// What the companions print, and how: whole lines, in colour only where somebody sees it.
#pragma once

#include <string>
#include <string_view>

namespace pinwell::companion {

enum class ColorWhen { automatic, always, never };

/// "auto", "always" and "never", as --color has them.
ColorWhen colorWhenNamed(std::string_view name) noexcept;

/// Whether to colour what goes to this descriptor. --color has the first word, NO_COLOR and CLICOLOR_FORCE
/// the next (https://no-color.org, https://bixense.com/clicolors/), then it is a matter of the terminal.
bool wantsColor(ColorWhen when, int descriptor);

/// Standard output. A reader that has gone away is no error: what is left to say goes nowhere. For one
/// thread.
class Output {
  public:
    explicit Output(int descriptor) : descriptor_(descriptor) {}

    /// Writes all of the text, and waits for a reader that lags.
    void write(std::string_view text);

    /// Something could not be written though somebody was there to read it: a full disk, for instance.
    bool hasFailed() const noexcept { return failed_; }

    /// The reader has gone away.
    bool isClosed() const noexcept { return closed_; }

  private:
    const int descriptor_;
    bool closed_ = false;
    bool failed_ = false;
};

}  // namespace pinwell::companion
