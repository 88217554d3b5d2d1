// User defaults: one JSON object for each domain, $XDG_CONFIG_HOME (or $HOME/.config)/DOMAIN.json.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "values/value.h"

namespace pinwell::defaults {

/// Longest domain file that is read.
inline constexpr std::size_t kMaximumDomainFile = 1024 * 1024;

/// One opened domain. A value that is missing or of another type comes from the registered
/// defaults; so does every value if the file is missing or malformed. Not for use by two threads at
/// once.
class UserDefaults {
  public:
    virtual ~UserDefaults() = default;
    virtual void registerDefaults(values::Dictionary defaults) = 0;
    virtual std::string stringForKey(std::string_view key) const = 0;  // empty if neither has it
    virtual bool boolForKey(std::string_view key) const = 0;           // false if neither has it
};

class UserDefaultsService {
  public:
    virtual ~UserDefaultsService() = default;
    virtual std::unique_ptr<UserDefaults> openDomain(std::string_view domain) = 0;
};

/// The file of that domain; `nullopt` if the environment does not name its directory, or is not
/// trusted.
std::optional<std::string> domainFile(std::string_view domain);

/// The defaults of the user who runs this process.
std::unique_ptr<UserDefaultsService> makeUserDefaultsService();

}  // namespace pinwell::defaults
