// Checks a service before its clients notice a fault: whether keys, certificates, platform directory, access
// list and store fit each other, and when the certificates expire.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

enum class Condition { fine, expiresSoon, wrong };

struct Finding {
    Condition condition = Condition::fine;
    std::string subject;  // the checked item
    std::string text;
};

/// Completes all checks, even after a fault; writes nothing. `warning` is in seconds.
std::vector<Finding> checkService(const ServiceDirectory& directory, foundation::Date now,
                                  std::int64_t warning);

/// 0; 1 if something expires soon; EX_CONFIG if something is wrong.
int exitStatusOf(const std::vector<Finding>& findings);

/// One line a finding, tab-separated: ok, soon or wrong; the subject; the text.
std::string describeFindings(const std::vector<Finding>& findings);

/// "12h", "30d" or "8w" in seconds; `nullopt` for any other text, and for more than a century.
std::optional<std::int64_t> parseDuration(std::string_view text);

}  // namespace pinwell::lumora
