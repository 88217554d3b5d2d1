#include "trust/trust_service.h"

#include <dlfcn.h>

#include <cstring>
#include <memory>
#include <optional>

#include "pinwell/ostrel_security.h"
#include "values/value.h"

namespace pinwell::trust {
namespace {

using values::Value;

struct LibraryCloser {
    void operator()(void* library) const noexcept { dlclose(library); }
};
using LibraryHandle = std::unique_ptr<void, LibraryCloser>;

struct PolicyReleaser {
    void operator()(const ostrel_policy* object) const noexcept {
        // The version determines the place of `release`.
        if (object->version == OSTREL_POLICY_VERSION && object->release != nullptr) object->release(object);
    }
};
using PolicyHandle = std::unique_ptr<const ostrel_policy, PolicyReleaser>;

std::optional<std::string> ownedString(const char* text) {
    if (text == nullptr) return std::nullopt;
    const std::size_t length = strnlen(text, OSTREL_MAXIMUM_STRING + 1);
    if (length > OSTREL_MAXIMUM_STRING) return std::nullopt;
    return std::string(text, length);
}

std::optional<Value> ownedList(const ostrel_policy_option& option) {
    if (option.value.strings == nullptr && option.count != 0) return std::nullopt;
    Array list;
    for (std::uint32_t i = 0; i < option.count; ++i) {
        std::optional<std::string> text = ownedString(option.value.strings[i]);
        if (!text) return std::nullopt;
        list.emplace_back(std::move(*text));
    }
    return Value(std::move(list));
}

std::optional<Value> ownedDictionary(const ostrel_policy_option& option) {
    if (option.value.numbers == nullptr && option.count != 0) return std::nullopt;
    Dictionary dictionary;
    for (std::uint32_t i = 0; i < option.count; ++i) {
        const ostrel_named_number& entry = option.value.numbers[i];
        std::optional<std::string> name = ownedString(entry.name);
        if (!name || !dictionary.emplace(std::move(*name), entry.number).second) return std::nullopt;
    }
    return Value(std::move(dictionary));
}

std::optional<Value> ownedValue(const ostrel_policy_option& option) {
    if (option.count > OSTREL_MAXIMUM_ENTRIES) return std::nullopt;
    switch (option.type) {
        case OSTREL_OPTION_BOOLEAN:
            if (option.value.number != 0 && option.value.number != 1) return std::nullopt;
            return Value(option.value.number == 1);
        case OSTREL_OPTION_NUMBER:
            return Value(option.value.number);
        case OSTREL_OPTION_STRING: {
            std::optional<std::string> text = ownedString(option.value.string);
            if (!text) return std::nullopt;
            return Value(std::move(*text));
        }
        case OSTREL_OPTION_STRING_LIST:
            return ownedList(option);
        case OSTREL_OPTION_NUMBER_DICTIONARY:
            return ownedDictionary(option);
        default:
            return std::nullopt;
    }
}

}  // namespace

PolicyRef convertPolicy(const ostrel_policy& object) {
    if (object.version != OSTREL_POLICY_VERSION || object.option_count > OSTREL_MAXIMUM_OPTIONS)
        return nullptr;
    if (object.options == nullptr && object.option_count != 0) return nullptr;
    std::optional<std::string> oid = ownedString(object.oid);
    if (!oid) return nullptr;
    Policy policy{std::move(*oid), std::nullopt, {}};
    if (object.name != nullptr) {
        policy.name = ownedString(object.name);
        if (!policy.name) return nullptr;
    }
    for (std::uint32_t i = 0; i < object.option_count; ++i) {
        std::optional<std::string> key = ownedString(object.options[i].key);
        if (!key) return nullptr;
        std::optional<Value> value = ownedValue(object.options[i]);
        if (!value || !policy.options.emplace(std::move(*key), std::move(*value)).second) return nullptr;
    }
    return std::make_shared<const Policy>(std::move(policy));
}

std::optional<PolicyRef> namedPolicy(const std::string& library, const std::string& constructorName) {
    const LibraryHandle handle(dlopen(library.c_str(), RTLD_LAZY | RTLD_LOCAL));
    if (!handle) return std::nullopt;
    // POSIX promises that an object pointer from dlsym can hold a function's address.
    const auto constructor =
        reinterpret_cast<ostrel_policy_constructor>(dlsym(handle.get(), constructorName.c_str()));
    if (constructor == nullptr) return std::nullopt;
    const PolicyHandle object(constructor());
    return object ? convertPolicy(*object) : nullptr;
}

}  // namespace pinwell::trust
