// The words in which the tables of chains are written.
#pragma once

#include <functional>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "support/certificate_builder.h"
#include "unit/trust/scene.h"

namespace pinwell::test {

/// Put into the leaf, the intermediate and the root in turn; chain_faults.h explains the verdicts.
struct CertificateFault {
    const char* name;
    const char* wrong;
    const char* verdicts;
    std::function<void(CertificateFields&, ChainFields&)> fields;
    std::function<void(base::Data&)> der = nullptr;  // changes the certificate in the list
};

const std::vector<CertificateFault>& certificateFaults();

namespace faults {

using base::Data;

inline constexpr const char* kBasicConstraints = "2.5.29.19";
inline constexpr const char* kKeyUsage = "2.5.29.15";
inline constexpr const char* kAlternativeNames = "2.5.29.17";
inline constexpr const char* kPurposes = "2.5.29.37";
inline constexpr const char* kSubjectKeyIdentifier = "2.5.29.14";
inline constexpr const char* kAuthorityKeyIdentifier = "2.5.29.35";
inline constexpr const char* kNameConstraints = "2.5.29.30";
inline constexpr const char* kUnknown = "1.2.3.4.5";

using C = CertificateFields;
using Chain = ChainFields;
using E = CertificateElements;

Data bytes(std::initializer_list<int> values);
Data joined(const Data& first, const Data& second);

/// The contents of an INTEGER: a positive number of that many bytes, all bits set but in the last one.
Data number(std::size_t size, int last);

/// A validity of two times of the short form.
Data dates(std::string_view from, std::string_view until);

/// Adds an extension; a NULL unless another value is given.
void replace(CertificateFields& c, const char* oid, bool critical, Data value = bytes({5, 0}));

void withoutExtensions(CertificateFields& c);
void useKey(CertificateFields& c, KeyKind kind);
void everyKeyRsa(ChainFields& chain);

/// Changes the byte after the first or last place of `pattern`; an error if there is none.
void flipBehind(Data& der, const Data& pattern, std::size_t offset, bool last, std::byte mask);

extern const Data kEcdsaWithSha2;
extern const Data kPointBits;

/// Its length in the form of one byte more than needed.
void lengthenLength(Data& der);

void makeIndefinite(Data& der);

}  // namespace faults
}  // namespace pinwell::test
