// User defaults that the test sets, domain by domain.
#pragma once

#include <map>
#include <memory>
#include <string>

#include "defaults/user_defaults.h"

namespace pinwell::test {

class FakeUserDefaultsService : public defaults::UserDefaultsService {
  public:
    std::map<std::string, foundation::Dictionary, std::less<>> domains;

    std::unique_ptr<defaults::UserDefaults> openDomain(std::string_view domain) override {
        const auto found = domains.find(domain);
        return std::make_unique<Opened>(found == domains.end() ? foundation::Dictionary{} : found->second);
    }

  private:
    class Opened : public defaults::UserDefaults {
      public:
        explicit Opened(foundation::Value stored) : stored_(std::move(stored)) {}
        void registerDefaults(foundation::Dictionary defaults) override { registered_ = std::move(defaults); }
        std::string stringForKey(std::string_view key) override {
            const std::string* text = (stored_[key].isNil() ? registered_ : stored_)[key].string();
            return text == nullptr ? std::string() : *text;
        }
        bool boolForKey(std::string_view key) override {
            return (stored_[key].isNil() ? registered_ : stored_)[key].boolValue();
        }

      private:
        foundation::Value stored_;
        foundation::Value registered_;
    };
};

}  // namespace pinwell::test
