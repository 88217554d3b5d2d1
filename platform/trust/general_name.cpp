#include "trust/general_name.h"

#include <arpa/inet.h>

#include <algorithm>
#include <array>
#include <optional>
#include <span>
#include <string>

namespace pinwell::trust {

namespace {

enum NameTag : std::uint32_t {
    kOtherName = 0,
    kMailAddress = 1,
    kDnsName = 2,
    kX400Address = 3,
    kDirectoryName = 4,
    kEdiPartyName = 5,
    kUri = 6,
    kAddress = 7,
    kRegisteredIdentifier = 8,
};

bool isConstructed(std::uint32_t number) {
    return number == kOtherName || number == kX400Address || number == kDirectoryName ||
           number == kEdiPartyName;
}

bool isText(std::uint32_t number) {
    return number == kMailAddress || number == kDnsName || number == kUri;
}

}  // namespace

GeneralName readGeneralName(const der::Element& element) {
    const der::Tag& tag = element.tag;
    if (tag.tagClass != der::TagClass::contextSpecific || tag.number > kRegisteredIdentifier ||
        tag.constructed != isConstructed(tag.number)) {
        throw der::Malformed("a name is of no known form");
    }
    const bool isAscii = std::all_of(element.contents.begin(), element.contents.end(),
                                     [](std::byte byte) { return byte < std::byte{0x80}; });
    if (isText(tag.number) && !isAscii) throw der::Malformed("a name is not of 7-bit characters");
    GeneralName name{GeneralNameForm::other, element.contents};
    if (tag.number == kDnsName) name.form = GeneralNameForm::dnsName;
    if (tag.number == kAddress) name.form = GeneralNameForm::address;
    return name;
}

namespace {

using base::Data;

constexpr std::size_t kMaximumName = 253;
constexpr std::size_t kMaximumLabel = 63;

std::optional<Data> parseAddress(int family, std::size_t size, const std::string& text) {
    std::array<std::byte, 16> address{};
    if (inet_pton(family, text.c_str(), address.data()) != 1) return std::nullopt;
    return base::toData(base::ByteView(address).first(size));
}

/// Unlike the C library's function, independent of the locale.
char lowered(char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
}

bool coversName(std::string_view presented, std::string_view host) {
    if (!presented.starts_with("*.")) return isDnsName(presented) && equalNames(presented, host);
    const std::string_view parent = presented.substr(1);  // with its dot
    if (!isDnsName(parent.substr(1)) || parent.find('.', 1) == std::string_view::npos) return false;
    const std::size_t dot = host.find('.');
    return dot != std::string_view::npos && equalNames(parent, host.substr(dot));
}

}  // namespace

std::optional<Data> parseAddress(std::string_view host) {
    if (host.find('\0') != std::string_view::npos) return std::nullopt;
    if (host.size() > 2 && host.front() == '[' && host.back() == ']') {
        return parseAddress(AF_INET6, 16, std::string(host.substr(1, host.size() - 2)));
    }
    std::optional<Data> address = parseAddress(AF_INET, 4, std::string(host));
    return address ? address : parseAddress(AF_INET6, 16, std::string(host));
}

bool equalNames(std::string_view a, std::string_view b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](char x, char y) { return lowered(x) == lowered(y); });
}

bool isDnsName(std::string_view name) {
    if (name.empty() || name.size() > kMaximumName) return false;
    std::size_t label = 0;
    for (const char c : name) {
        if (c == '.') {
            if (label == 0) return false;
            label = 0;
            continue;
        }
        const char lower = lowered(c);
        const bool allowed = (lower >= 'a' && lower <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '_';
        if (!allowed || ++label > kMaximumLabel) return false;
    }
    return label != 0;
}

bool coversHost(const AlternativeNames& names, std::string_view host) {
    if (const std::optional<Data> address = parseAddress(host)) {
        return std::find(names.addresses.begin(), names.addresses.end(), *address) != names.addresses.end();
    }
    if (host.ends_with('.')) host.remove_suffix(1);
    if (!isDnsName(host)) return false;
    return std::any_of(names.dnsNames.begin(), names.dnsNames.end(),
                       [&](const std::string& name) { return coversName(name, host); });
}

}  // namespace pinwell::trust
