// One reason for each refusal: the library, pinwell-inspect and pinwell-gate state the same rule at the same
// offset.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>

#include "artefact_faults.h"
#include "e2e/artefacts.h"
#include "judges.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"
#include "support/package_builder.h"
#include "ticket_faults.h"

namespace pinwell::test {
namespace {

using Payload = TicketPayloadBuilder;
using Offset = std::optional<std::uint64_t>;

constexpr std::size_t kSignature = 72;
constexpr std::size_t kTrailer = 512;
constexpr std::size_t kRecord = 16;
constexpr std::size_t kImageData = 1000;
constexpr std::uint64_t kTooLong = 64ULL * 1024 * 1024 + 1;

constexpr const char* kNotAcceptable = "Its ticket is not acceptable: ";
constexpr const char* kNoneReadable = "No ticket can be read: ";
constexpr const char* kNoneStapled = "No ticket is stapled to it: ";

const IssuedChain& signers() {
    static const IssuedChain chain = TicketChain().issue();
    return chain;
}

/// Writes an artefact below a directory. The signer is trusted.
class Maker {
  public:
    explicit Maker(const Judges& judges) : judges_(judges) {}

    const IssuedChain& chain() const { return signers(); }
    const std::string& path() const { return path_; }
    const Subject& artefact(const std::string& kind) { return use(subjectNamed(kind)); }

    SatchelBuilder around(const Payload& payload) const {
        return SatchelBuilder::of(chain(), payload.build());
    }
    Payload payload() const { return subjectNamed("bundle").payload(); }
    Data good() const { return around(payload()).build(); }

    Offset bundle(const Data& ticket, Offset at) {
        artefact("bundle").write(path_, ticket);
        return at;
    }
    Offset bundle(const SatchelBuilder& ticket, Offset at) { return bundle(ticket.build(), at); }
    /// The offset is one of the payload.
    Offset bundleWithPayload(const Payload& payload, std::uint64_t at) {
        const Data ticket = around(payload).build();
        return bundle(ticket, ticket.size() - kSignature - payload.build().size() + at);
    }
    Offset image(const DiskImageBuilder& builder, Offset at) {
        use(subjectNamed("signedImage"));
        writeFile(path_, base::ByteView(builder.build()));
        return at;
    }
    Offset package(const PackageBuilder& builder, Offset at) {
        use(subjectNamed("package"));
        writeFile(path_, builder.build());
        return at;
    }
    Offset executable() {
        bundle(good(), {});
        const std::string program = path_ + "/Contents/Programs/Sample";
        path_ = judges_.path("program");
        std::filesystem::copy_file(program, path_);
        return {};
    }
    Data goodFor(const std::string& kind) const { return goodTicket(subjectNamed(kind), chain()); }
    std::string ticketPath() const { return path_ + "/Contents/CodeResources"; }

  private:
    const Subject& use(const Subject& subject) {
        path_ = judges_.path(subject.fileName);
        return subject;
    }

    const Judges& judges_;
    std::string path_;
};

struct Row {
    const char* name;
    const char* verdict;
    const char* opening;                 // of the library's sentence, which ends with the rule
    std::string rule;                    // empty: there is none
    std::function<Offset(Maker&)> make;  // returns the rule's offset in the file that holds the ticket
    std::function<void(SignerAnchors&)> anchors = nullptr;

    friend void PrintTo(const Row& row, std::ostream* out) { *out << row.rule; }
};

Data bytes(std::size_t count) {
    return Data(count, std::byte{0x55});
}
Data removedLast(Data data) {
    data.pop_back();
    return data;
}
Data withByteAfter(Data data) {
    data.push_back(std::byte{0});
    return data;
}
void writeAtEnd(const std::string& path, const Data& bytes) {
    std::ofstream file(path, std::ios::binary | std::ios::app);
    file << base::toString(bytes);
}
/// The record of a ticket in which one thing is wrong.
TrailerFields recordWith(const std::function<void(TrailerFields&)>& change) {
    TrailerFields fields;
    fields.type = 2;
    change(fields);
    return fields;
}
PackageBuilder archive() {
    return PackageBuilder().archive(base::toData(base::asBytes(signedPackage(irregularData(1000)).contents)));
}
DiskImageBuilder imageOf(const SuperBlobBuilder& superblob) {
    return DiskImageBuilder().data(irregularData(kImageData)).superblob(superblob);
}
SuperBlobBuilder stapled(const Data& ticket) {
    return DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob(base::toString(ticket)));
}
std::uint64_t trailerOf(const DiskImageBuilder& image) {
    return image.build().size() - kTrailer;
}
/// The trusted chain with a signer in which one thing is wrong.
IssuedChain chainWith(const std::function<void(CertificateFields&)>& change) {
    CertificateFields signer = TicketChain().leaf;
    change(signer);
    IssuedChain chain = signers();
    chain.leaf = issueCertificate(signer, &chain.intermediate);
    return chain;
}

// clang-format off
std::vector<Row> bundleRows() {
    return {
        {"Good", "good", "Its ticket is good.", "", [](Maker& m) { return m.bundle(m.good(), {}); }},
        {"NoTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { m.artefact("bundle").write(m.path(), std::nullopt); return Offset(); }},
        {"EmptyTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.bundle(Data(), {}); }},
        {"DirectoryInItsPlace", "noTicket", kNoneStapled, "Contents/CodeResources is not a regular file", [](Maker& m) { m.artefact("bundle").write(m.path(), std::nullopt); std::filesystem::create_directory(m.ticketPath()); return Offset(); }},
        {"LinkInItsPlace", "noTicket", kNoneStapled, "Contents/CodeResources is not a regular file", [](Maker& m) { m.artefact("bundle").write(m.path(), std::nullopt); std::filesystem::create_symlink("nowhere", m.ticketPath()); return Offset(); }},
        {"ExecutableAlone", "noTicket", kNoneStapled, "an executable outside a bundle has no place for a ticket", [](Maker& m) { return m.executable(); }},
        // The container.
        {"CutInItsHeader", "refused", kNotAcceptable, "the container ends inside its header", [](Maker& m) { return m.bundle(bytes(15), 15); }},
        {"Magic", "refused", kNotAcceptable, "the container does not begin with its magic, \"s8ch\"", [](Maker& m) { return m.bundle(m.around(m.payload()).magic("s8cH"), 0); }},
        {"Version", "refused", kNotAcceptable, "the container's version is not 1", [](Maker& m) { return m.bundle(m.around(m.payload()).version(2), 4); }},
        {"NoPayload", "refused", kNotAcceptable, "the payload's length is 0", [](Maker& m) { return m.bundle(m.around(m.payload()).payloadLength(0), 12); }},
        {"TrailingByte", "refused", kNotAcceptable, "the lengths of the parts do not add up to the container's", [](Maker& m) { return m.bundle(withByteAfter(m.good()), 8); }},
        {"ByteMissing", "refused", kNotAcceptable, "the lengths of the parts do not add up to the container's", [](Maker& m) { return m.bundle(removedLast(m.good()), 8); }},
        {"LengthHighest", "refused", kNotAcceptable, "the lengths of the parts do not add up to the container's", [](Maker& m) { return m.bundle(m.around(m.payload()).certificateBlockLength(0xFFFFFFFF), 8); }},
        // The certificates.
        {"CertificatesAreNoDer", "refused", kNotAcceptable, "the certificate block is no DER element", [](Maker& m) { return m.bundle(m.around(m.payload()).certificateBlock(Data{std::byte{0x30}}), 16); }},
        {"CertificatesAreASet", "refused", kNotAcceptable, "the certificate block is not one SEQUENCE that fills it", [](Maker& m) { return m.bundle(m.around(m.payload()).outerTag(0x31), 16); }},
        {"ByteAfterTheCertificates", "refused", kNotAcceptable, "the certificate block is not one SEQUENCE that fills it", [](Maker& m) { return m.bundle(m.around(m.payload()).afterSequence(Data(1)), 16); }},
        {"NoCertificate", "refused", kNotAcceptable, "there is no certificate", [](Maker& m) { return m.bundle(m.around(m.payload()).certificates({}), 16 + 2); }},
        {"FourCertificates", "refused", kNotAcceptable, "there are more than three certificates", [](Maker& m) { const auto& c = m.chain(); return m.bundle(m.around(m.payload()).certificate(c.root.der), 16 + 4 + c.leaf.der.size() + c.intermediate.der.size() + c.root.der.size()); }},
        {"CertificateTooLong", "refused", kNotAcceptable, "a certificate is too long", [](Maker& m) { return m.bundle(m.around(m.payload()).certificates({derElementOfSize(131'073)}), 16 + 5); }},
        {"CertificateIsNone", "refused", kNotAcceptable, "certificate 2 cannot be read", [](Maker& m) { const auto& c = m.chain(); return m.bundle(m.around(m.payload()).certificates({c.leaf.der, derElementOfSize(200), c.root.der}), 16 + 4 + c.leaf.der.size()); }},
        {"ShortCertificateIsNone", "refused", kNotAcceptable, "certificate 3 cannot be read", [](Maker& m) { const auto& c = m.chain(); return m.bundle(m.around(m.payload()).certificates({c.leaf.der, c.intermediate.der, Data{std::byte{5}, std::byte{0}}}), 16 + 4 + c.leaf.der.size() + c.intermediate.der.size()); }},
        // The chain.
        {"NoRoots", "refused", kNotAcceptable, "the chain is not trusted (Certificate \"Ticket Root\": the root certificate is not trusted for this purpose)", [](Maker& m) { const auto& c = m.chain(); return m.bundle(m.good(), 16 + 4 + c.leaf.der.size() + c.intermediate.der.size()); }, [](SignerAnchors& a) { a.roots.clear(); }},
        {"OnlyTheUserTrustsTheRoot", "refused", kNotAcceptable, "only the user's own settings trust the chain, which is not enough for a ticket", [](Maker& m) { return m.bundle(m.good(), 16); }, [](SignerAnchors& a) { a.roots.swap(a.allowed); }},
        {"TheUserDistrustsTheRoot", "refused", kNotAcceptable, "the chain is not trusted (Certificate \"Ticket Root\": the user has chosen not to trust the certificate)", [](Maker& m) { const auto& c = m.chain(); return m.bundle(m.good(), 16 + 4 + c.leaf.der.size() + c.intermediate.der.size()); }, [](SignerAnchors& a) { a.denied = a.roots; }},
        {"SignerWithoutItsMarker", "refused", kNotAcceptable, "the chain is not trusted (Certificate \"Ticket Signer\": the leaf marker 1.2.840.177245.100.6.1.30 is missing)", [](Maker& m) { return m.bundle(SatchelBuilder::of(chainWith([](CertificateFields& f) { f.markers.clear(); }), m.payload().build()), 16 + 4); }},
        {"CertificatesExpired", "good", "Its ticket is good.", "", [](Maker& m) { return m.bundle(SatchelBuilder::of(chainWith([](CertificateFields& f) { f.notAfter = f.notBefore; }), m.payload().build()), {}); }},
        // The signature.
        {"SignedByAnother", "refused", kNotAcceptable, "the signature does not verify", [](Maker& m) { return m.bundle(m.around(m.payload()).signedBy(SigningKey::cached(KeyKind::p256, "forger")), m.good().size() - kSignature); }},
        {"NotSigned", "refused", kNotAcceptable, "the signature does not verify", [](Maker& m) { return m.bundle(m.around(m.payload()).signature({}), m.good().size() - kSignature); }},
        // The payload.
        {"PayloadCutInItsHeader", "refused", kNotAcceptable, "the payload ends inside its header", [](Maker& m) { const Data ticket = SatchelBuilder::of(m.chain(), bytes(23)).build(); return m.bundle(ticket, ticket.size() - kSignature); }},
        {"PayloadMagic", "refused", kNotAcceptable, "the payload does not begin with its magic, \"m8tk\"", [](Maker& m) { return m.bundleWithPayload(m.payload().magic("m8tl"), 0); }},
        {"PayloadVersion", "refused", kNotAcceptable, "the payload's version is neither 1 nor 2", [](Maker& m) { return m.bundleWithPayload(m.payload().version(3), 4); }},
        {"HashLength", "refused", kNotAcceptable, "the hash length is neither 20 nor 48", [](Maker& m) { return m.bundleWithPayload(m.payload().hashLength(32), 6); }},
        {"CountTooHigh", "refused", kNotAcceptable, "the number of entries does not fit the payload's length", [](Maker& m) { return m.bundleWithPayload(m.payload().count(2), 8); }},
        {"ByteAfterTheEntries", "refused", kNotAcceptable, "the number of entries does not fit the payload's length", [](Maker& m) { return m.bundleWithPayload(m.payload().trailing(Data(1)), 8); }},
        {"PayloadTooLong", "refused", kNotAcceptable, "the payload is longer than 16 MiB", [](Maker& m) { return m.bundleWithPayload(Payload().count(0).trailing(Data(16 * 1024 * 1024)), 0); }},
        // A genuine ticket.
        {"Revoked", "revoked", "Its ticket revokes it: it must not run.", "the ticket marks the software as revoked", [](Maker& m) { return m.bundleWithPayload(m.payload().revoked(), 12); }},
        {"OfAnother", "refused", kNotAcceptable, "the ticket does not list this artefact", [](Maker& m) { return m.bundleWithPayload(Payload().entry(2, hashOf(7)), 24); }},
        {"OfNone", "refused", kNotAcceptable, "the ticket does not list this artefact", [](Maker& m) { return m.bundleWithPayload(Payload(), 24); }},
    };
}

std::vector<Row> imageRows() {
    return {
        {"Good", "good", "Its ticket is good.", "", [](Maker& m) { return m.image(imageOf(stapled(m.goodFor("signedImage"))), {}); }},
        {"NoTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.image(imageOf(DiskImageBuilder::signature()), {}); }},
        {"EmptyTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.image(imageOf(stapled(Data())), {}); }},
        {"TooShort", "unreadable", kNoneReadable, "the file is too small for a disk image's trailer", [](Maker& m) { m.artefact("signedImage"); writeFile(m.path(), std::string_view("short")); return Offset(0); }},
        {"TrailerMagic", "unreadable", kNoneReadable, "the file does not end in a disk image's trailer", [](Maker& m) { const auto i = imageOf(stapled(m.goodFor("signedImage"))).magic("kolz"); return m.image(i, trailerOf(i)); }},
        {"ByteAfterTheTrailer", "unreadable", kNoneReadable, "the file does not end in a disk image's trailer", [](Maker& m) { const auto i = imageOf(stapled(m.goodFor("signedImage"))); m.image(i, {}); writeFile(m.path(), base::ByteView(withByteAfter(i.build()))); return Offset(trailerOf(i) + 1); }},
        {"TrailerVersion", "unreadable", kNoneReadable, "the trailer's version is not 4", [](Maker& m) { const auto i = imageOf(stapled(m.goodFor("signedImage"))).version(5); return m.image(i, trailerOf(i) + 4); }},
        {"SignatureOutOfRange", "unreadable", kNoneReadable, "the signature's offset and length are out of range", [](Maker& m) { const auto i = imageOf(stapled(m.goodFor("signedImage"))).codeSignOffset(~0ULL); return m.image(i, trailerOf(i) + 296); }},
        {"SignatureElsewhere", "unreadable", kNoneReadable, "the signature does not end where the trailer begins", [](Maker& m) { const auto i = imageOf(stapled(m.goodFor("signedImage"))).codeSignOffset(kImageData + 1); return m.image(i, trailerOf(i) + 296); }},
        {"SuperblobMagic", "unreadable", kNoneReadable, "the superblob does not begin with its magic", [](Maker& m) { return m.image(imageOf(stapled(m.goodFor("signedImage")).magic(0xFADE0CC1)), kImageData); }},
        {"SuperblobLength", "unreadable", kNoneReadable, "the superblob's length is not the one in the trailer", [](Maker& m) { return m.image(imageOf(stapled(m.goodFor("signedImage")).length(7)), kImageData + 4); }},
        {"SuperblobCount", "unreadable", kNoneReadable, "the superblob counts more blobs than it has room for", [](Maker& m) { return m.image(imageOf(stapled(m.goodFor("signedImage")).count(0xFFFFFFFF)), kImageData + 8); }},
        {"GapBetweenBlobs", "unreadable", kNoneReadable, "the blobs do not fill the superblob back to back", [](Maker& m) { return m.image(imageOf(DiskImageBuilder::signature().gap(8).blob(kSampleTicketSlot, ticketBlob(base::toString(m.goodFor("signedImage"))))), kImageData + 12); }},
        {"TicketsVersion", "refused", kNotAcceptable, "the container's version is not 1", [](Maker& m) { const auto i = imageOf(stapled(m.around(m.payload()).version(2).build())); return m.image(i, trailerOf(i) - m.good().size() + 4); }},
        {"OfAnother", "refused", kNotAcceptable, "the ticket does not list this artefact", [](Maker& m) { const auto i = imageOf(stapled(m.good())); return m.image(i, trailerOf(i) - kSignature - m.payload().build().size() + 24); }},
    };
}

std::vector<Row> packageRows() {
    const auto record = [](const std::function<void(TrailerFields&)>& change) {
        return [fields = recordWith(change)](Maker& m) {
            const auto package = archive().terminator().trailer(fields, m.goodFor("package"));
            return m.package(package, package.build().size() - kRecord);
        };
    };
    return {
        {"Good", "good", "Its ticket is good.", "", [](Maker& m) { return m.package(archive().terminator().ticket(base::toString(m.goodFor("package"))), {}); }},
        {"NoTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.package(archive(), {}); }},
        {"TerminatorAlone", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.package(archive().terminator(), {}); }},
        {"EmptyTicket", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.package(archive().terminator().ticket(""), {}); }},
        {"ByteAfterTheRecord", "noTicket", "No ticket is stapled to it.", "", [](Maker& m) { return m.package(archive().terminator().ticket(base::toString(m.goodFor("package"))).bytes("x"), {}); }},
        {"RecordVersion", "refused", kNoneReadable, "a trailer's version is not 1", record([](TrailerFields& f) { f.version = 2; })},
        {"RecordMagic", "refused", kNoneReadable, "a trailer does not begin with its magic, \"t8lr\"", record([](TrailerFields& f) { f.magic = "t8ls"; })},
        {"RecordOutOfBounds", "refused", kNoneReadable, "a trailer's data would begin before the file", record([](TrailerFields& f) { f.length = 0xFFFFFFFF; })},
        {"UnknownRecordOutOfBounds", "refused", kNoneReadable, "a trailer's data would begin before the file", record([](TrailerFields& f) { f.type = kUnknownTrailerType; f.length = 0x7FFFFFFF; })},
        {"RecordVersionAfterTheTicket", "refused", kNoneReadable, "a trailer's version is not 1", [](Maker& m) { const auto p = archive().terminator().ticket(base::toString(m.goodFor("package"))).trailer(recordWith([](TrailerFields& f) { f.version = 2; })); return m.package(p, p.build().size() - kRecord); }},
        {"TerminatorVersion", "good", "Its ticket is good.", "", [](Maker& m) { return m.package(archive().trailer(recordWith([](TrailerFields& f) { f.version = 2; f.type = 1; })).ticket(base::toString(m.goodFor("package"))), {}); }},
        {"TooLong", "refused", kNoneReadable, "the ticket is too long to be read", [](Maker& m) { m.package(archive(), {}); const auto start = std::filesystem::file_size(m.path()); const Data end = makeTrailer(recordWith([](TrailerFields& f) { f.length = static_cast<std::uint32_t>(kTooLong); })); std::filesystem::resize_file(m.path(), start + kTooLong); writeAtEnd(m.path(), end); return Offset(start); }},
        {"TicketsVersion", "refused", kNotAcceptable, "the container's version is not 1", [](Maker& m) { const Data ticket = m.around(m.payload()).version(2).build(); const auto p = archive().terminator().ticket(base::toString(ticket)); return m.package(p, p.build().size() - kRecord - ticket.size() + 4); }},
        {"OfAnother", "refused", kNotAcceptable, "the ticket does not list this artefact", [](Maker& m) { const auto p = archive().terminator().ticket(base::toString(m.good())); return m.package(p, p.build().size() - kRecord - kSignature - m.payload().build().size() + 24); }},
    };
}
// clang-format on

class RefusalReason : public testing::TestWithParam<Row> {};

TEST_P(RefusalReason, IsTheSameWhoeverStatesIt) {
    const Row& row = GetParam();
    SignerAnchors anchors{{signers().root.der}, {}, {}, {}};
    if (row.anchors) row.anchors(anchors);
    Judges judges(anchors);
    Maker maker(judges);
    const Offset offset = row.make(maker);

    const Statement library = judges.library(maker.path());
    const Statement inspection = judges.inspection(maker.path());
    const Statement gate = judges.gate(maker.path());
    EXPECT_EQ(library.verdict, row.verdict);
    const bool endsWithTheRule = std::string_view(row.opening).ends_with(": ");
    EXPECT_EQ(library.sentence, endsWithTheRule ? row.opening + row.rule + "." : row.opening);
    if (!library.rule.empty()) {
        EXPECT_EQ(library.rule, row.rule);
        EXPECT_EQ(library.offset, offset);
    }
    EXPECT_EQ(inspection.rule, row.rule);
    EXPECT_EQ(inspection.offset, offset);
    EXPECT_EQ(inspection.verdict, row.verdict) << inspection.sentence;
    // pinwell-gate compares an artefact with what was signed: a broken signature of an image is a difference.
    if (library.verdict != "unreadable") {
        EXPECT_EQ(gate.verdict, row.verdict) << gate.sentence;
    }
    if (!library.rule.empty() && gate.verdict != "unreadable") {
        EXPECT_EQ(gate.rule, row.rule);
    }
}

/// What holds for any artefact.
void expectAgreement(Judges& judges, const std::string& path) {
    const Statement library = judges.library(path);
    const Statement inspection = judges.inspection(path);
    const Statement gate = judges.gate(path);
    EXPECT_EQ(inspection.verdict, library.verdict) << inspection.sentence;
    if (library.verdict == "unreadable") {
        EXPECT_NE(gate.verdict, "good");
        EXPECT_EQ(library.sentence,
                  library.rule.empty() ? "It has no valid signature." : kNoneReadable + library.rule + ".");
        if (library.rule.empty()) {
            EXPECT_EQ(inspection.rule, "the artefact has no valid signature, so no ticket can list it");
        }
    } else {
        EXPECT_EQ(gate.verdict, library.verdict) << gate.sentence;
    }
    if (library.verdict == "refused") {
        EXPECT_TRUE(library.sentence.ends_with(": " + inspection.rule + ".")) << library.sentence;
    }
    if (library.rule.empty()) return;
    EXPECT_EQ(inspection.rule, library.rule);
    EXPECT_EQ(inspection.offset, library.offset);
    if (gate.verdict == "refused") {
        EXPECT_EQ(gate.rule, library.rule);
    }
}

TEST(RefusalReasons, AgreeForEveryTicketThatMustNotBeTaken) {
    for (const TicketFault& fault : ticketFaults()) {
        SignerAnchors anchors{{signers().root.der}, {}, {}, {}};
        if (fault.anchors) fault.anchors(anchors);
        Judges judges(anchors);
        for (const Subject& subject : subjects()) {
            SCOPED_TRACE(std::string(fault.name) + " on " + subject.name);
            const std::string path = judges.path(subject.fileName);
            subject.write(path, fault.ticket(subject, signers()));
            expectAgreement(judges, path);
        }
    }
}

TEST(RefusalReasons, AgreeForEveryArtefactThatMustNotBeTaken) {
    for (const ArtefactFault& fault : artefactFaults()) {
        SCOPED_TRACE(fault.name);
        Judges judges({{signers().root.der}, {}, {}, {}});
        const std::string path = judges.path(subjectNamed(fault.subject).fileName);
        fault.write(path, signers());
        expectAgreement(judges, path);
    }
}

const auto nameOfRow = [](const auto& tested) { return tested.param.name; };
INSTANTIATE_TEST_SUITE_P(Bundle, RefusalReason, testing::ValuesIn(bundleRows()), nameOfRow);
INSTANTIATE_TEST_SUITE_P(DiskImage, RefusalReason, testing::ValuesIn(imageRows()), nameOfRow);
INSTANTIATE_TEST_SUITE_P(Package, RefusalReason, testing::ValuesIn(packageRows()), nameOfRow);

}  // namespace
}  // namespace pinwell::test
