#include "trust/name_constraints.h"

#include <algorithm>

#include "trust/general_name.h"

namespace pinwell::trust {
namespace {

using base::ByteView;
using base::Data;
using der::Cursor;
using der::Element;
using der::Malformed;

bool isSubtree(std::string_view name) {
    if (name.starts_with('.'))
        name.remove_prefix(1);
    else if (name.empty())
        return true;
    return isDnsName(name);
}

/// Ones and then zeros.
bool isMask(ByteView mask) {
    bool ended = false;
    for (const std::byte byte : mask) {
        const auto bits = std::to_integer<unsigned>(byte);
        const unsigned ones = ~bits & 0xFFU;  // of a proper mask: 2^n - 1
        if ((ones & (ones + 1)) != 0 || (ended && bits != 0)) return false;
        ended = bits != 0xFFU;
    }
    return true;
}

NameSubtrees::AddressRange readRange(ByteView contents) {
    if (contents.size() != 8 && contents.size() != 32)
        throw Malformed("an address range is of no known length");
    const ByteView address = contents.first(contents.size() / 2);
    const ByteView mask = contents.subspan(contents.size() / 2);
    if (!isMask(mask)) throw Malformed("a mask is not a number of ones and then zeros");
    return {base::toData(address), base::toData(mask)};
}

NameSubtrees readSubtrees(Cursor list, NameConstraints& whole) {
    NameSubtrees subtrees;
    do {  // at least one
        Cursor subtree = list.enter(der::kConstructedSequence);
        const GeneralName base = readGeneralName(subtree.any());
        subtree.expectEnd();
        switch (base.form) {
            case GeneralNameForm::dnsName:
                subtrees.dnsNames.push_back(base::toString(base.contents));
                if (!isSubtree(subtrees.dnsNames.back())) throw Malformed("a subtree is no DNS name");
                break;
            case GeneralNameForm::address:
                subtrees.addresses.push_back(readRange(base.contents));
                break;
            case GeneralNameForm::other:
                whole.hasUnhandledForm = true;
        }
    } while (!list.atEnd());
    return subtrees;
}

bool isBelow(std::string_view name, std::string_view parent) {
    return name.size() > parent.size() && name[name.size() - parent.size() - 1] == '.' &&
           equalNames(name.substr(name.size() - parent.size()), parent);
}

std::string_view withoutDot(std::string_view subtree) {
    return subtree.substr(subtree.starts_with('.') ? 1 : 0);
}

/// A DNS name, or a wildcard's parent.
struct PresentedName {
    std::string_view name;
    bool isWildcard = false;
};

bool isAllWithin(const PresentedName& presented, std::string_view subtree) {
    if (subtree.empty()) return true;
    const std::string_view root = withoutDot(subtree);
    const bool rootCounts = presented.isWildcard || root.size() == subtree.size();
    return isBelow(presented.name, root) || (rootCounts && equalNames(presented.name, root));
}

bool isPartlyWithin(const PresentedName& presented, std::string_view subtree) {
    if (isAllWithin(presented, subtree)) return true;
    if (!presented.isWildcard || subtree.starts_with('.')) return false;
    const std::size_t dot = subtree.find('.');
    return dot != std::string_view::npos && equalNames(subtree.substr(dot + 1), presented.name);
}

bool isWithin(ByteView address, const NameSubtrees::AddressRange& range) {
    if (address.size() != range.address.size()) return false;
    for (std::size_t i = 0; i < address.size(); ++i)
        if (((address[i] ^ range.address[i]) & range.mask[i]) != std::byte{0}) return false;
    return true;
}

bool isPermitted(std::string_view written, const NameConstraints& constraints) {
    const auto& permitted = constraints.permitted.dnsNames;
    const auto& excluded = constraints.excluded.dnsNames;
    if (permitted.empty() && excluded.empty()) return true;
    const bool isWildcard = written.starts_with("*.");
    const PresentedName name{written.substr(isWildcard ? 2 : 0), isWildcard};
    if (!isDnsName(name.name)) return false;
    return (permitted.empty() ||
            std::any_of(permitted.begin(), permitted.end(),
                        [&](const std::string& subtree) { return isAllWithin(name, subtree); })) &&
           std::none_of(excluded.begin(), excluded.end(),
                        [&](const std::string& subtree) { return isPartlyWithin(name, subtree); });
}

bool isPermitted(ByteView address, const NameConstraints& constraints) {
    const auto& permitted = constraints.permitted.addresses;
    const auto holds = [&](const NameSubtrees::AddressRange& range) { return isWithin(address, range); };
    return (permitted.empty() || std::any_of(permitted.begin(), permitted.end(), holds)) &&
           std::none_of(constraints.excluded.addresses.begin(), constraints.excluded.addresses.end(), holds);
}

}  // namespace

NameConstraints readNameConstraints(ByteView value) {
    Cursor outer(value);
    Cursor fields = outer.enter(der::kConstructedSequence);
    outer.expectEnd();
    NameConstraints constraints;
    const std::optional<Element> permitted = fields.takeIf(der::contextTag(0, true));
    const std::optional<Element> excluded = fields.takeIf(der::contextTag(1, true));
    fields.expectEnd();
    if (!permitted && !excluded) throw Malformed("name constraints constrain nothing");
    if (permitted) constraints.permitted = readSubtrees(Cursor(permitted->contents), constraints);
    if (excluded) constraints.excluded = readSubtrees(Cursor(excluded->contents), constraints);
    return constraints;
}

NameJudgement NameConstraintCheck::judge(const NameConstraints& constraints, const AlternativeNames& names) {
    const std::pair pair(&constraints, &names);
    const auto known = judged_.find(pair);
    if (known != judged_.end()) return known->second;
    return judged_.emplace(pair, compare(constraints, names)).first->second;
}

NameJudgement NameConstraintCheck::judgeHost(const NameConstraints& constraints, std::string_view host) {
    const std::pair pair(&constraints, static_cast<const AlternativeNames*>(nullptr));
    const auto known = judged_.find(pair);
    if (known != judged_.end()) return known->second;
    AlternativeNames names;
    if (std::optional<Data> address = parseAddress(host)) {
        names.addresses.push_back(*std::move(address));
    } else {
        names.dnsNames.emplace_back(host.substr(0, host.size() - (host.ends_with('.') ? 1 : 0)));
    }
    return judged_.emplace(pair, compare(constraints, names)).first->second;
}

NameJudgement NameConstraintCheck::compare(const NameConstraints& constraints,
                                           const AlternativeNames& names) {
    if (constraints.hasUnhandledForm) return NameJudgement::unhandled;
    const NameSubtrees& permitted = constraints.permitted;
    const NameSubtrees& excluded = constraints.excluded;
    const std::size_t comparisons =
        names.dnsNames.size() * (permitted.dnsNames.size() + excluded.dnsNames.size()) +
        names.addresses.size() * (permitted.addresses.size() + excluded.addresses.size());
    if (comparisons > left_) return NameJudgement::tooMany;
    left_ -= comparisons;
    const bool allPermitted =
        std::all_of(
            names.dnsNames.begin(), names.dnsNames.end(),
            [&](const std::string& name) { return isPermitted(std::string_view(name), constraints); }) &&
        std::all_of(names.addresses.begin(), names.addresses.end(),
                    [&](const Data& address) { return isPermitted(ByteView(address), constraints); });
    return allPermitted ? NameJudgement::permitted : NameJudgement::excluded;
}

}  // namespace pinwell::trust
