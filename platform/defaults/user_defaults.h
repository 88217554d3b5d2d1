// User defaults: one JSON object a domain, $XDG_CONFIG_HOME (or $HOME/.config)/DOMAIN.json.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "foundation/value_fwd.h"

namespace pinwell::defaults {

/// Longest domain file that is read.
inline constexpr std::size_t kMaximumDomainFile = 1024 * 1024;

/// One opened domain. A value that is missing or of another type is answered from the registered defaults,
/// value by value; so is every value when the file is missing or malformed. Not for use by two threads at
/// once.
class UserDefaults {
  public:
    virtual ~UserDefaults() = default;
    virtual void registerDefaults(foundation::Dictionary defaults) = 0;
    virtual std::string stringForKey(std::string_view key) = 0;  // empty when neither has it
    virtual bool boolForKey(std::string_view key) = 0;           // false when neither has it
};

class UserDefaultsService {
  public:
    virtual ~UserDefaultsService() = default;
    virtual std::unique_ptr<UserDefaults> openDomain(std::string_view domain) = 0;
};

/// The file of that domain; `nullopt` when the environment does not tell where it is, or is not to be
/// trusted.
std::optional<std::string> domainFile(std::string_view domain);

/// The defaults of the user who runs this process.
std::unique_ptr<UserDefaultsService> makeUserDefaultsService();

}  // namespace pinwell::defaults
