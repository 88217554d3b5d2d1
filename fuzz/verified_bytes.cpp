#include "verified_bytes.h"

#include <algorithm>
#include <cstdint>
#include <string>
#include <tuple>

#include "verify/check.h"

namespace pinwell::fuzz {
namespace {

using verify::Check;
using verify::Outcome;
using verify::Section;
using verify::VerifiedCode;

/// The number of changed bytes, and so of verifications, for each artefact.
constexpr std::size_t kTrials = 8;

struct Verified {
    VerifiedCode code;
    std::vector<Check> checks;

    bool has(Outcome outcome) const {
        return std::any_of(checks.begin(), checks.end(),
                           [&](const Check& check) { return check.outcome == outcome; });
    }
    std::size_t count(Outcome outcome) const {
        return static_cast<std::size_t>(std::count_if(
            checks.begin(), checks.end(), [&](const Check& check) { return check.outcome == outcome; }));
    }
    bool isWithoutFault() const { return !has(Outcome::failed) && !has(Outcome::unreadable); }

    /// Without a signer's message: nothing covers parts of a certificate without its issuer.
    bool isAdHoc() const {
        std::size_t signers = 0;
        for (const Check& check : checks) {
            if (check.name != verify::kSigner) continue;
            if (check.expected != "no signer: ad hoc") return false;
            ++signers;
        }
        return signers > 0;
    }
    std::vector<Data> codeHashes() const {
        std::vector<Data> all;
        for (const verify::CodeIdentity& identity : code.identities)
            all.insert(all.end(), identity.codeHashes.begin(), identity.codeHashes.end());
        return all;
    }
};

Verified verified(Data bytes, const Verification& verification) {
    static verify::Workers workers(1);
    Verified result;
    Section section;
    result.code = verification(base::MemorySource(std::move(bytes)), workers, section);
    result.checks = verify::flattened(section);
    return result;
}

void examineChecks(const std::vector<Check>& checks) {
    require(!checks.empty(), "something is asked of every artefact");
    for (const Check& check : checks) {
        require(!check.name.empty(), "a check has a name");
        const bool isFault = check.outcome == Outcome::failed;
        require(!isFault || !check.expected.empty(), "a fault says what was expected");
        require(check.outcome == Outcome::passed || !check.found.empty(), "what is no pass says why");
        require(check.outcome != Outcome::unreadable, "memory can be read");
    }
}

auto asTuple(const Check& check) {
    return std::tie(check.name, check.place, check.outcome, check.expected, check.found);
}

bool isSame(const std::vector<Check>& a, const std::vector<Check>& b) {
    return std::equal(a.begin(), a.end(), b.begin(), b.end(),
                      [](const Check& x, const Check& y) { return asTuple(x) == asTuple(y); });
}

/// FNV-1a: the same places for the same input.
std::uint64_t numberOf(ByteView input) {
    std::uint64_t number = 0xCBF29CE484222325U;
    for (const std::byte byte : input)
        number = (number ^ std::to_integer<std::uint64_t>(byte)) * 0x100000001B3U;
    return number;
}

void changeBytes(ByteView input, const Verified& before, const Verification& verification) {
    std::uint64_t number = numberOf(input);
    Data bytes(input.begin(), input.end());
    for (std::size_t i = 0; i < kTrials; ++i, number = number * 0x5851F42D4C957F2DU + 1) {
        const auto at = static_cast<std::size_t>((number >> 8U) % bytes.size());
        const std::byte mask = std::byte{1} << (number & 7U);
        bytes[at] ^= mask;
        const Verified after = verified(bytes, verification);
        require(!after.isWithoutFault() || after.codeHashes() != before.codeHashes() ||
                    after.count(Outcome::noted) > before.count(Outcome::noted),
                "no byte may change without being missed");
        bytes[at] ^= mask;
    }
}

}  // namespace

void examineVerified(ByteView input, const Verification& verification, Coverage coverage) {
    const Data bytes(input.begin(), input.end());
    const Verified result = verified(bytes, verification);
    examineChecks(result.checks);
    require(isSame(result.checks, verified(bytes, verification).checks), "a second run says the same");
    if (coverage == Coverage::whole && result.isWithoutFault() && result.isAdHoc() &&
        !result.has(Outcome::noted))
        changeBytes(input, result, verification);
}

}  // namespace pinwell::fuzz
