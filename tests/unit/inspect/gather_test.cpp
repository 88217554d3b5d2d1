// The findings about artefacts of every kind with intact tickets.
#include <algorithm>
#include <cerrno>

#include "base/bytes.h"
#include "base/text.h"
#include "inspect_fixture.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "support/disk_image_builder.h"
#include "support/file_properties.h"
#include "support/package_builder.h"

namespace pinwell::test {
namespace {

using base::toHex;
using inspect::FilePlace;
using inspect::Range;
using inspect::Signature;
using inspect::SuperblobPlace;
using inspect::TrailerPlace;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

class Inspection : public InspectTest {
  protected:
    TicketPayloadBuilder bundlePayload() const { return TicketPayloadBuilder().entry(2, bundleHash); }
};

TEST_F(Inspection, OfAStapledBundleFindsAllOfIt) {
    const std::string path = bundle(sealed(bundlePayload().entry(1, hashOf(9))));
    const Report report = inspect(path);
    EXPECT_EQ(report.kind, Kind::bundle);
    EXPECT_EQ(report.item->typeIdentifier, "com.ostrel.application-bundle");
    EXPECT_EQ(report.codeHash, (inspect::Hash{2, bundleHash}));
    EXPECT_EQ(report.recordName, "2/2/" + toHex(bundleHash));
    EXPECT_EQ(std::get<FilePlace>(report.place).path, ticketFileOf(path));

    const auto& signature = *report.code->preferredSlice()->signature;
    EXPECT_EQ(signature.validity, codesign::kSuccess);
    ASSERT_THAT(signature.directories, SizeIs(1));
    EXPECT_TRUE(signature.directories[0].chosen);
    EXPECT_EQ(signature.directories[0].identifier, "com.example.sample");
    EXPECT_EQ(signature.directories[0].teamIdentifier, "TEAM42");
    EXPECT_EQ(signature.directories[0].flags, codesign::kFlagAdHoc);

    const inspect::Ticket& ticket = *report.ticket;
    EXPECT_EQ(ticket.fileOffset, 0U);
    ASSERT_THAT(ticket.certificates, SizeIs(3));
    EXPECT_EQ(ticket.certificates[0].range.length, chain.leaf.der.size());
    EXPECT_EQ(ticket.certificates[0].description.issuer, ticket.certificates[1].description.subject);
    EXPECT_TRUE(ticket.certificates[2].description.isSelfIssued);
    EXPECT_TRUE(ticket.chain.trusted);
    EXPECT_EQ(ticket.signature, Signature::verifies);
    ASSERT_THAT(ticket.payload->entries, SizeIs(2));
    EXPECT_TRUE(ticket.payload->entries[0].matches);
    EXPECT_FALSE(ticket.payload->entries[1].matches);
    EXPECT_EQ(report.outcome, Outcome::good);
    EXPECT_EQ(report.conclusion, "The ticket is genuine, lists this file, and is not marked revoked.");
    EXPECT_EQ(report.fault, std::nullopt);
}

TEST_F(Inspection, OfAnUnstapledBundleReportsIt) {
    const Report report = inspect(bundle());
    EXPECT_EQ(report.outcome, Outcome::noTicket);
    EXPECT_EQ(report.conclusion, "No ticket is stapled to this file.");
    EXPECT_FALSE(report.ticket);
    EXPECT_EQ(report.recordName, "2/2/" + toHex(bundleHash));
}

TEST_F(Inspection, OfARevokedTicketReportsIt) {
    const Report report = inspect(bundle(sealed(bundlePayload().revoked())));
    EXPECT_EQ(report.outcome, Outcome::revoked);
    EXPECT_TRUE(report.ticket->payload->isRevoked);
    EXPECT_EQ(report.conclusion, "The ticket is genuine, and it marks the software as revoked.");
}

TEST_F(Inspection, OfATicketForOthersReportsThatThisFileIsNotListed) {
    const Report report = inspect(bundle(sealed(TicketPayloadBuilder().entry(2, hashOf(1)))));
    EXPECT_EQ(report.outcome, Outcome::refused);
    EXPECT_EQ(report.conclusion, "The ticket is genuine, but it does not list this file.");
    EXPECT_EQ(report.fault->offset, report.ticket->payload->range.offset + 24);
}

TEST_F(Inspection, OfABundleWithALinkForATicketFileReadsNoTicket) {
    const std::string path = bundle();
    makeLink("/nowhere", ticketFileOf(path));
    const Report report = inspect(path);
    EXPECT_EQ(report.outcome, Outcome::noTicket);
    EXPECT_EQ(report.fault->rule, "Contents/CodeResources is not a regular file");
    EXPECT_EQ(report.conclusion,
              "No ticket is stapled to this file: Contents/CodeResources is not a regular file.");
}

TEST_F(Inspection, OfAnUnsignedBundleSaysThatNoTicketCanListIt) {
    const std::string path = platform.directory / "Bare.app";
    BundleBuilder().executable(ExecutableImageBuilder().withoutSignature().build()).write(path);
    const Report bare = inspect(path);
    EXPECT_EQ(bare.outcome, Outcome::unreadable);
    EXPECT_EQ(bare.conclusion, "No ticket is stapled to this file, and it has no valid signature.");
    writeFile(ticketFileOf(path), sealed(bundlePayload()));
    const Report report = inspect(path);
    EXPECT_FALSE(report.codeHash);
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_EQ(inspect::exitStatusOf(report.outcome), 66);
    EXPECT_EQ(report.fault->rule, "the artefact has no valid signature, so no ticket can list it");
}

TEST_F(Inspection, OfAnArtefactWithoutAValidSignatureEndsAsTheTool) {
    BundleBuilder()
        .executable(ExecutableImageBuilder().withoutSignature().build())
        .write(platform.directory / "Bare.app");
    for (const std::string& path :
         {platform.directory / "Bare.app", write("Bare.pkg", std::string(1000, 'x'))}) {
        const auto file = PWHashedFile::initWithFileURL(values::URL::fileURLWithPath(path), services());
        EXPECT_FALSE(codeHashOf(*file)) << path;
        EXPECT_EQ(inspect::exitStatusOf(inspect(path).outcome), 66) << path;
    }
}

TEST_F(Inspection, OfSeveralSlicesShowsEachAndMarksTheMainOne) {
    const Data x86 = CodeDirectoryBuilder().identifier("x86").covers(2, emptyRequirements()).build();
    const Data arm = CodeDirectoryBuilder().identifier("arm").covers(2, emptyRequirements()).build();
    const auto image = [](const Data& directory, std::uint32_t type) {
        return ExecutableImageBuilder()
            .cpuType(type)
            .signature(SuperBlobBuilder::adHoc(directory).build())
            .build();
    };
    const std::string path = platform.directory / "Fat.app";
    BundleBuilder()
        .executable(UniversalImageBuilder()
                        .slice(kSampleX86, image(x86, kSampleX86))
                        .slice(7, ExecutableImageBuilder().cpuType(7).withoutSignature().build())
                        .slice(kSampleArm, image(arm, kSampleArm))
                        .build())
        .write(path);
    const Report report = inspect(path);
    ASSERT_THAT(report.code->slices, SizeIs(3));
    EXPECT_EQ(report.code->slices[0].signature->directories[0].identifier, "x86");
    EXPECT_FALSE(report.code->slices[1].signature);
    EXPECT_TRUE(report.code->slices[2].preferred);
    EXPECT_FALSE(report.code->slices[0].preferred);
    EXPECT_EQ(report.codeHash->bytes, codeHashOf(2, arm));
}

TEST_F(Inspection, OfSeveralCodeDirectoriesMarksTheStrongest) {
    const Data sha1 = CodeDirectoryBuilder().digestType(1).covers(2, emptyRequirements()).build();
    const Data sha384 = CodeDirectoryBuilder().digestType(4).covers(2, emptyRequirements()).build();
    const Data signature = SuperBlobBuilder::adHoc(sha1).blob(0x1000, sha384).build();
    const std::string path = platform.directory / "Two.app";
    BundleBuilder().executable(ExecutableImageBuilder().signature(signature).build()).write(path);
    const Report report = inspect(path);
    const auto& directories = report.code->preferredSlice()->signature->directories;
    ASSERT_THAT(directories, SizeIs(2));
    EXPECT_FALSE(directories[0].chosen);
    EXPECT_TRUE(directories[1].chosen);
    EXPECT_EQ(report.codeHash, (inspect::Hash{4, codeHashOf(4, sha384)}));
}

TEST_F(Inspection, OfASignedImageShowsTheTableOfItsSuperblob) {
    const Artefact image = signedImage();
    const Data ticket = ticketFor(image);
    const Report report = inspect(stapled(image, ticket));
    EXPECT_EQ(report.kind, Kind::diskImage);
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_FALSE(report.isMadeUpHash);
    EXPECT_EQ(report.codeHash->bytes, image.hash);
    const auto& place = std::get<SuperblobPlace>(report.place);
    EXPECT_EQ(place.superblob->offset, 100'000U);
    EXPECT_EQ(place.superblob->offset + place.superblob->length, place.trailerOffset);
    ASSERT_THAT(place.blobs, SizeIs(4));
    EXPECT_EQ(place.blobs[3].slot, kSampleTicketSlot);
    EXPECT_EQ(place.blobs[3].length, ticket.size() + 8);
    EXPECT_EQ(report.ticket->fileOffset, place.superblob->offset + place.blobs[3].offset + 8);
    EXPECT_EQ(report.ticket->size, ticket.size());
}

TEST_F(Inspection, OfAnUnsignedImageReportsThatItsHashIsSynthetic) {
    const Artefact image = unsignedImage();
    const Report before = inspect(write(image.name, image.contents));
    EXPECT_EQ(before.outcome, Outcome::noTicket);
    EXPECT_TRUE(before.isMadeUpHash);
    EXPECT_EQ(before.codeHash->bytes, image.hash);
    const Report after = inspect(stapled(image, ticketFor(image)));
    EXPECT_EQ(after.outcome, Outcome::good) << after.conclusion;
    EXPECT_TRUE(after.isMadeUpHash);
    EXPECT_EQ(after.codeHash, before.codeHash);
}

TEST_F(Inspection, OfAPackageShowsItsChainOfTrailers) {
    const Artefact package = signedPackage();
    const Data ticket = ticketFor(package);
    const std::string contents = package.contents;
    const std::string path = write("Sample.pkg", contents + PackageBuilder()
                                                                .archive({})
                                                                .terminator()
                                                                .unknown("before")
                                                                .ticket(base::toString(ticket))
                                                                .unknown("behind")
                                                                .build());
    const Report report = inspect(path);
    EXPECT_EQ(report.kind, Kind::package);
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_EQ(report.recordName, "2/1/" + toHex(package.hash));
    const auto& place = std::get<TrailerPlace>(report.place);
    std::vector<unsigned> types;
    for (const auto& trailer : place.trailers) types.push_back(trailer.type);
    EXPECT_THAT(types, ElementsAre(kUnknownTrailerType, 2, kUnknownTrailerType, 1));
    EXPECT_TRUE(place.hasTerminator);
    EXPECT_EQ(report.ticket->fileOffset, contents.size() + 16 + 6 + 16);
}

TEST_F(Inspection, OfAnUnstapledPackageFindsNoTrailers) {
    const Artefact package = signedPackage();
    const Report report = inspect(write(package.name, package.contents));
    EXPECT_EQ(report.outcome, Outcome::noTicket);
    EXPECT_THAT(std::get<TrailerPlace>(report.place).trailers, IsEmpty());
}

TEST_F(Inspection, OfABareTicketNeedsNoFile) {
    const std::string ticket = base::toString(sealed(bundlePayload()));
    for (const char* name : {"downloaded.ticket", "CodeResources", "any.name"}) {
        const Report report = inspect(write(name, ticket));
        EXPECT_EQ(report.kind, Kind::ticket) << name;
        EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
        EXPECT_EQ(report.conclusion, "The ticket is genuine and is not marked revoked.");
        EXPECT_EQ(report.recordName, "");
    }
}

TEST_F(Inspection, OfAnExecutableTicketFileStillShowsATicket) {
    const std::string path = write("ticket", base::toString(sealed(bundlePayload())));
    setMode(path, 0755);
    EXPECT_EQ(inspect(path).kind, Kind::ticket);
}

TEST_F(Inspection, OfAnExecutableSaysThatItHasNoPlaceForATicket) {
    const std::string path = write("tool", base::toString(ExecutableImageBuilder().build()));
    setMode(path, 0755);
    const Report report = inspect(path);
    EXPECT_EQ(report.kind, Kind::executable);
    EXPECT_EQ(report.outcome, Outcome::noTicket);
    EXPECT_TRUE(report.codeHash);
    EXPECT_EQ(report.conclusion, "An executable outside a bundle has no place for a ticket.");
}

TEST_F(Inspection, OfAnArtefactWithoutATicketReportsIt) {
    const Report text = inspect(write("notes.txt", "hello"));
    EXPECT_EQ(text.outcome, Outcome::unreadable);
    EXPECT_EQ(text.conclusion, "This is nothing that carries a ticket.");
    const Report missing = inspect(platform.directory / "missing.dmg");
    EXPECT_EQ(missing.outcome, Outcome::unreadable);
    EXPECT_THAT(missing.conclusion, HasSubstr("The path cannot be read"));
    makeDirectory(platform.directory / "folder");
    EXPECT_EQ(inspect(platform.directory / "folder").outcome, Outcome::unreadable);
}

TEST_F(Inspection, OfAFileThatCannotBeOpenedSaysWhyNot) {
    const Artefact package = signedPackage();
    const std::string path = write(package.name, package.contents);
    platform.files.fail("openForReading", EACCES);
    const Report report = inspect(path);
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_EQ(report.conclusion, "The file cannot be read: Permission denied.");
}

TEST_F(Inspection, OfAPackageThatCannotBeOpenedTwiceSaysWhyNot) {
    const Artefact package = signedPackage();
    const std::string path = stapled(package, ticketFor(package));
    inspect(path);
    const std::vector<std::string> names = platform.files.names();
    const auto last = std::find(names.rbegin(), names.rend(), "openForReading");
    platform.files.failOperation(names.size() + static_cast<std::size_t>(names.rend() - last) - 1, EMFILE);
    const Report report = inspect(path);
    EXPECT_FALSE(report.ticket);
    EXPECT_EQ(report.fault->rule, "the package cannot be read: Too many open files");
    EXPECT_NE(report.outcome, Outcome::good);
}

TEST_F(Inspection, OfAPackageThatIsADirectoryReportsIt) {
    makeDirectory(platform.directory / "Old.pkg");
    const Report report = inspect(platform.directory / "Old.pkg");
    EXPECT_EQ(report.outcome, Outcome::unreadable);
    EXPECT_EQ(report.conclusion, "A package that is a directory carries no ticket.");
}

TEST_F(Inspection, OfAnImageFindsTheTicketAfterMoreBlobsThanItDescribes) {
    const Artefact image = unsignedImage();
    SuperBlobBuilder superblob;
    for (std::uint32_t i = 0; i < codesign::kMaximumBlobsDescribed + 1; ++i)
        superblob.blob(0x20000 + i, makeBlob(1, {}));
    superblob.blob(kSampleTicketSlot, ticketBlob(base::toString(ticketFor(image))));
    const auto builder = DiskImageBuilder().data(irregularData(100'000)).superblob(superblob);
    const Report report = inspect(write(image.name, base::toString(builder.build())));
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_THAT(std::get<SuperblobPlace>(report.place).blobs, SizeIs(codesign::kMaximumBlobsDescribed));
    EXPECT_EQ(std::get<SuperblobPlace>(report.place).blobCount, codesign::kMaximumBlobsDescribed + 2);
}

TEST_F(Inspection, OfAPackageGoesPastAsManyTrailersAsTheToolDoes) {
    const Artefact package = signedPackage();
    const std::string stapledPackage = package.stapledWith(ticketFor(package));
    std::string trailers;
    const std::string one = base::toString(makeTrailer({}));
    for (std::size_t i = 0; i < 2000; ++i) trailers += one;
    const Report report = inspect(write(package.name, stapledPackage + trailers));
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_THAT(std::get<TrailerPlace>(report.place).trailers, SizeIs(inspect::kMaximumTrailersKept));
    EXPECT_EQ(std::get<TrailerPlace>(report.place).trailerCount, 2002U);

    const std::string large(std::size_t{20} * 1024 * 1024, '\0');
    const Report beyond =
        inspect(write(package.name, stapledPackage + base::toString(makeTrailer({}, base::toData(large)))));
    EXPECT_EQ(beyond.outcome, Outcome::good) << beyond.conclusion;
}

TEST_F(Inspection, OfAChainWithAnotherRootNamesTheCertificateAtFault) {
    TicketChain fields;
    fields.root.subject = {{"CN", "Another Root"}};
    fields.root.key = SigningKey::cached(KeyKind::p256, "another root");
    const IssuedChain other = fields.issue();
    const Data ticket = SatchelBuilder::of(other, bundlePayload().build()).build();
    const Report report = inspect(bundle(ticket));
    EXPECT_EQ(report.outcome, Outcome::refused);
    EXPECT_FALSE(report.ticket->chain.trusted);
    EXPECT_EQ(report.ticket->signature, Signature::verifies);
    EXPECT_THAT(report.fault->rule, HasSubstr("\"Another Root\": the root certificate is not trusted"));
    EXPECT_EQ(report.fault->offset, report.ticket->certificates[2].range.offset);
}

TEST_F(Inspection, OfALeafWithoutItsMarkerNamesTheLeaf) {
    TicketChain fields;
    fields.root.key = chain.root.key;
    fields.leaf.markers.clear();
    const IssuedChain unmarked = fields.issue();
    writeFile(platform.platformDirectory.path() + "/roots/second.pem", unmarked.root.pem());
    const Report report = inspect(bundle(SatchelBuilder::of(unmarked, bundlePayload().build()).build()));
    EXPECT_THAT(report.ticket->chain.reason,
                HasSubstr("the leaf marker 1.2.840.177245.100.6.1.30 is missing"));
    EXPECT_EQ(report.fault->offset, report.ticket->certificates[0].range.offset);
}

TEST_F(Inspection, KeepsALimitedNumberOfEntriesAndTheMatchingOne) {
    TicketPayloadBuilder payload;
    for (std::size_t i = 0; i < inspect::kMaximumEntriesKept + 5; ++i) payload.entry(2, hashOf(3));
    const Report report = inspect(bundle(sealed(payload.entry(2, bundleHash))));
    EXPECT_EQ(report.outcome, Outcome::good) << report.conclusion;
    EXPECT_THAT(report.ticket->payload->entries, SizeIs(inspect::kMaximumEntriesKept));
    EXPECT_EQ(report.ticket->payload->entryCount, inspect::kMaximumEntriesKept + 6);
    EXPECT_EQ(report.ticket->payload->matchingEntry->index, inspect::kMaximumEntriesKept + 5);
}

TEST_F(Inspection, ChangesNothingAndSendsNoRequest) {
    const Artefact image = signedImage();
    const Artefact package = signedPackage();
    inspect(bundle(sealed(bundlePayload())));
    inspect(stapled(image, ticketFor(image)));
    inspect(stapled(package, ticketFor(package)));
    EXPECT_THAT(platform.files.changes(), IsEmpty());
    EXPECT_EQ(platform.files.count("lockItem"), 0U);
}

}  // namespace
}  // namespace pinwell::test
