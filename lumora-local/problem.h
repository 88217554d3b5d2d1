// Refusals as programs read them: application/problem+json (RFC 9457).
#pragma once

#include <stdexcept>
#include <string>
#include <string_view>

#include "lumora-local/http_service.h"

namespace pinwell::lumora {

/// {"type": "about:blank", "title": the status in words, "status", "detail"}. `detail` is UTF-8 text.
Answer problem(int status, std::string_view detail);

/// The same with Retry-After.
Answer problemForNow(int status, std::string_view detail, std::int64_t seconds);

/// Leaves the work on a request that is refused. The text is the detail.
class Refused : public std::runtime_error {
  public:
    Refused(int status, const std::string& detail) : std::runtime_error(detail), status_(status) {}

    int status() const noexcept { return status_; }

  private:
    int status_;
};

/// A status in words, as RFC 9110 and RFC 6585 name it.
std::string_view titleOf(int status);

}  // namespace pinwell::lumora
