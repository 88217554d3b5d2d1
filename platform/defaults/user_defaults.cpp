#include "defaults/user_defaults.h"

#include <optional>
#include <string>
#include <utility>

#include "base/file_io.h"
#include "runtime/process.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::defaults {
namespace {

using values::Dictionary;
using values::Value;

class Domain final : public UserDefaults {
  public:
    explicit Domain(Dictionary chosen) : chosen_(std::move(chosen)) {}

    void registerDefaults(Dictionary defaults) override {
        for (auto& [key, value] : defaults) registered_.insert_or_assign(key, std::move(value));
    }

    std::string stringForKey(std::string_view key) const override {
        const std::string* text = find(key, &Value::string);
        return text == nullptr ? std::string() : *text;
    }

    bool boolForKey(std::string_view key) const override {
        const bool* flag = find(key, &Value::boolean);
        return flag != nullptr && *flag;
    }

  private:
    // The user's value if it has the right type, otherwise the registered default.
    template <class T>
    const T* find(std::string_view key, const T* (Value::*asKind)() const noexcept) const {
        for (const Dictionary* values : {&chosen_, &registered_}) {
            const auto found = values->find(key);
            if (found == values->end()) continue;
            if (const T* value = (found->second.*asKind)()) return value;
        }
        return nullptr;
    }

    Dictionary chosen_;
    Dictionary registered_;
};

// The directory of the domains; `nullopt` if the environment does not name it, or is not trusted.
std::optional<std::string> configurationDirectory() {
    // A relative path in this variable must be ignored (XDG Base Directory Specification).
    if (auto directory = runtime::secureEnvironment("XDG_CONFIG_HOME");
        directory && directory->starts_with('/'))
        return directory;
    if (auto home = runtime::secureEnvironment("HOME"); home && home->starts_with('/'))
        return *home + "/.config";
    return std::nullopt;
}

Dictionary readDomain(std::string_view domain) {
    const std::optional<std::string> path = domainFile(domain);
    if (!path) return {};
    const auto document = base::readSmallFile(*path, kMaximumDomainFile);
    if (!document) return {};
    const auto values = values::parseJSON(*document);
    if (!values || values->dictionary() == nullptr) return {};
    return *values->dictionary();
}

class Service final : public UserDefaultsService {
  public:
    std::unique_ptr<UserDefaults> openDomain(std::string_view domain) override {
        return std::make_unique<Domain>(readDomain(domain));
    }
};

}  // namespace

std::optional<std::string> domainFile(std::string_view domain) {
    const std::optional<std::string> directory = configurationDirectory();
    if (!directory || !base::isSafeFileName(domain)) return std::nullopt;
    return *directory + "/" + std::string(domain) + ".json";
}

std::unique_ptr<UserDefaultsService> makeUserDefaultsService() {
    return std::make_unique<Service>();
}

}  // namespace pinwell::defaults
