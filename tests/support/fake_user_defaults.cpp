#include "support/fake_user_defaults.h"

#include <utility>

namespace pinwell::test {
namespace {

using values::Dictionary;
using values::Value;

class FakeUserDefaults final : public defaults::UserDefaults {
  public:
    explicit FakeUserDefaults(Dictionary chosen) : chosen_(std::move(chosen)) {}

    void registerDefaults(Dictionary defaults) override {
        defaults.merge(registered_);
        registered_ = std::move(defaults);
    }

    std::string stringForKey(std::string_view key) const override {
        if (const auto found = chosen_.find(key); found != chosen_.end() && found->second.string() != nullptr)
            return *found->second.string();
        const auto found = registered_.find(key);
        return found != registered_.end() && found->second.string() != nullptr ? *found->second.string() : "";
    }

    bool boolForKey(std::string_view key) const override {
        if (const auto found = chosen_.find(key);
            found != chosen_.end() && found->second.boolean() != nullptr)
            return *found->second.boolean();
        const auto found = registered_.find(key);
        return found != registered_.end() && found->second.boolean() != nullptr && *found->second.boolean();
    }

  private:
    Dictionary chosen_;
    Dictionary registered_;
};

}  // namespace

std::unique_ptr<defaults::UserDefaults> FakeUserDefaultsService::openDomain(std::string_view domain) {
    opened.emplace_back(domain);
    const auto found = domains.find(domain);
    return std::make_unique<FakeUserDefaults>(found == domains.end() ? Dictionary() : found->second);
}

}  // namespace pinwell::test
