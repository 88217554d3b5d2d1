// The output of the message functions, line by line.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "src/messages.h"

namespace pinwell::test {

/// Captures standard output during its life and sets the verbosity; restores both. One at a time.
class MessageCapture {
  public:
    explicit MessageCapture(std::uint8_t verbosity);
    ~MessageCapture();
    MessageCapture(const MessageCapture&) = delete;
    MessageCapture& operator=(const MessageCapture&) = delete;

    /// Everything written so far.
    std::string text() const;

    /// The same without the newlines.
    std::vector<std::string> lines() const;

    bool contains(const std::string& line) const;

  private:
    int file_;
    int savedOutput_;
    std::uint8_t savedVerbosity_;
};

}  // namespace pinwell::test
