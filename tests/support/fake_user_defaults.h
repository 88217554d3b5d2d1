// User defaults from the test's own hand.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "defaults/user_defaults.h"
#include "values/value.h"

namespace pinwell::test {

/// Returns values from the dictionaries in `domains`, else the registered ones, like the real service.
class FakeUserDefaultsService final : public defaults::UserDefaultsService {
  public:
    std::unique_ptr<defaults::UserDefaults> openDomain(std::string_view domain) override;

    std::map<std::string, values::Dictionary, std::less<>> domains;
    std::vector<std::string> opened;  // the opened domains, in order
};

}  // namespace pinwell::test
