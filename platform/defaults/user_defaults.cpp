#include "defaults/user_defaults.h"

#include <cstdlib>
#include <optional>

#include "foundation/file_io.h"
#include "foundation/json.h"

namespace pinwell::defaults {
namespace {

using foundation::Dictionary;
using foundation::Value;

// The directory of the domain files (XDG Base Directory Specification: a relative path there is ignored).
std::optional<std::string> configurationDirectory() {
    if (const char* directory = std::getenv("XDG_CONFIG_HOME"); directory != nullptr && *directory == '/')
        return std::string(directory);
    if (const char* home = std::getenv("HOME"); home != nullptr && *home == '/') return std::string(home) + "/.config";
    return std::nullopt;
}

// What the domain's file holds; nil when there is none, or it is no JSON object.
Value readDomain(std::string_view domain) {
    const auto directory = configurationDirectory();
    if (!directory) return {};
    const auto document =
        foundation::readSmallFile(*directory + "/" + std::string(domain) + ".json", kMaximumDomainFile);
    if (!document) return {};
    auto parsed = foundation::parseJSON(*document);
    return parsed && parsed->dictionary() != nullptr ? *std::move(parsed) : Value();
}

class FileUserDefaults final : public UserDefaults {
  public:
    explicit FileUserDefaults(Value stored) : stored_(std::move(stored)) {}

    void registerDefaults(Dictionary defaults) override { registered_ = std::move(defaults); }

    std::string stringForKey(std::string_view key) override {
        if (const std::string* text = stored_[key].string()) return *text;
        const std::string* text = registered_[key].string();
        return text == nullptr ? std::string() : *text;
    }

    bool boolForKey(std::string_view key) override {
        const Value& value = stored_[key];
        return value.isNumber() ? value.boolValue() : registered_[key].boolValue();
    }

  private:
    Value stored_;
    Value registered_;
};

class FileUserDefaultsService final : public UserDefaultsService {
  public:
    std::unique_ptr<UserDefaults> openDomain(std::string_view domain) override {
        return std::make_unique<FileUserDefaults>(readDomain(domain));
    }
};

}  // namespace

std::unique_ptr<UserDefaultsService> makeUserDefaultsService() { return std::make_unique<FileUserDefaultsService>(); }

}  // namespace pinwell::defaults
