#include "trust/general_name.h"

#include <algorithm>

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

}  // namespace pinwell::trust
