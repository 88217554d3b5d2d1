// User defaults from the test's own hand.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "defaults/user_defaults.h"
#include "foundation/value.h"

namespace pinwell::test {

/// Answers from the dictionaries in `domains`, else from what was registered, as the real service does.
class FakeUserDefaultsService final : public defaults::UserDefaultsService {
  public:
    std::unique_ptr<defaults::UserDefaults> openDomain(std::string_view domain) override;

    std::map<std::string, foundation::Dictionary, std::less<>> domains;
    std::vector<std::string> opened;  // the domains asked for, in order
};

}  // namespace pinwell::test
