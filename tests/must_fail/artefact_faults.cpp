#include "artefact_faults.h"

#include <filesystem>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "e2e/artefacts.h"
#include "support/archive_builder.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"
#include "support/package_builder.h"
#include "ticket_faults.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using I = IssuedChain;
using Path = const std::string&;

constexpr int kAccepted = 0;
constexpr int kRefused = 65;
constexpr int kUnusable = 66;
constexpr std::uint32_t kMaximum = 0xFFFFFFFF;
constexpr std::size_t kOwnData = 1000;

// Images.

std::string imageTicket(const I& i) {
    return base::toString(goodTicket(subjectNamed("signedImage"), i));
}
std::string forgedTicket() {
    return base::toString(goodTicket(subjectNamed("package"), TicketChain().issue()));
}
Data blobOf(const I& i) {
    return ticketBlob(imageTicket(i));
}
SuperBlobBuilder stapled(const I& i) {
    return DiskImageBuilder::signature().blob(kSampleTicketSlot, blobOf(i));
}
DiskImageBuilder imageOf(const SuperBlobBuilder& superblob) {
    return DiskImageBuilder().data(irregularData(kOwnData)).superblob(superblob);
}
/// The offset of the ticket's blob in stapled().
std::uint32_t ticketOffset(const I& i) {
    return static_cast<std::uint32_t>(stapled(i).build().size() - blobOf(i).size());
}

struct ImageFault {
    const char* name;
    const char* wrong;
    int exit;
    std::function<Data(const I&)> make;
};

Data inserted(Data data, std::size_t at) {
    data.insert(data.begin() + static_cast<std::ptrdiff_t>(at), std::byte{0});
    return data;
}
Data removed(Data data, std::size_t at) {
    data.erase(data.begin() + static_cast<std::ptrdiff_t>(at));
    return data;
}
Data changed(Data data, std::size_t at) {
    data.at(at) ^= std::byte{1};
    return data;
}
Data withLength(Data blob, int by) {
    blob.at(7) = static_cast<std::byte>(std::to_integer<int>(blob.at(7)) + by);
    return blob;
}
std::uint64_t superblobSize(const I& i) {
    return stapled(i).build().size();
}

// clang-format off
std::vector<ImageFault> imageFaults() {
    return {
        {"NoTicket", "no ticket is stapled to it", kRefused, [](const I&) { return imageOf(DiskImageBuilder::signature()).build(); }},
        {"TwoTicketsTheEarlierForged", "nothing: of two tickets the later one counts, and it is good", kAccepted, [](const I& i) { return imageOf(DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob(forgedTicket())).blob(kSampleTicketSlot, blobOf(i))).build(); }},
        {"TicketInAnotherSlot", "the ticket stands in another slot", kRefused, [](const I& i) { return imageOf(DiskImageBuilder::signature().blob(0x10003, blobOf(i))).build(); }},
        {"TicketOfAnotherMagic", "nothing: the slot says what the blob is, its magic is not looked at", kAccepted, [](const I& i) { return imageOf(DiskImageBuilder::signature().blob(kSampleTicketSlot, makeBlob(0xFADE0C01, base::asBytes(imageTicket(i))))).build(); }},
        {"TwoTicketsTheLaterForged", "two tickets, and the later one counts: it is another signer's", kRefused, [](const I& i) { return imageOf(stapled(i).blob(kSampleTicketSlot, ticketBlob(forgedTicket()))).build(); }},
        {"TicketEmpty", "a ticket of no byte", kRefused, [](const I&) { return imageOf(DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob(""))).build(); }},
        {"TicketShared", "two index entries, one blob", kUnusable, [](const I& i) { return imageOf(stapled(i).blob(0x10003, makeBlob(0xFADE0B01, {})).offsetOf(0x10003, ticketOffset(i) + 8)).build(); }},
        {"TicketOverTheDirectory", "the ticket's entry leads to the code directory", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, 12 + 4 * 8)).build(); }},
        {"TicketOverTheIndex", "the ticket's entry leads into the index", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, 12)).build(); }},
        {"TicketOverTheHeader", "the ticket's entry leads to the superblob's header", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, 0)).build(); }},
        {"TicketOneLater", "the ticket's entry leads one byte too far", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, ticketOffset(i) + 1)).build(); }},
        {"TicketOneEarlier", "the ticket's entry leads one byte too near", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, ticketOffset(i) - 1)).build(); }},
        {"TicketAtTheEnd", "the ticket's entry leads to the superblob's end", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, static_cast<std::uint32_t>(superblobSize(i)))).build(); }},
        {"TicketBehindTheEnd", "the ticket's entry leads as far as it can", kUnusable, [](const I& i) { return imageOf(stapled(i).offsetOf(kSampleTicketSlot, kMaximum)).build(); }},
        {"TicketLengthOneTooHigh", "the ticket's blob says one byte more", kUnusable, [](const I& i) { return imageOf(DiskImageBuilder::signature().blob(kSampleTicketSlot, withLength(blobOf(i), 1))).build(); }},
        {"TicketLengthOneTooLow", "the ticket's blob says one byte less", kUnusable, [](const I& i) { return imageOf(DiskImageBuilder::signature().blob(kSampleTicketSlot, withLength(blobOf(i), -1))).build(); }},
        {"GapBeforeTheTicket", "eight bytes between two blobs", kUnusable, [](const I& i) { return imageOf(DiskImageBuilder::signature().gap(8).blob(kSampleTicketSlot, blobOf(i))).build(); }},
        {"IndexReversed", "the index lists the blobs last to first", kUnusable, [](const I& i) { return imageOf(stapled(i).reverseIndex()).build(); }},
        {"CountOneTooHigh", "one blob more than there is", kUnusable, [](const I& i) { return imageOf(stapled(i).count(5)).build(); }},
        {"CountOneTooLow", "one blob less than there is", kUnusable, [](const I& i) { return imageOf(stapled(i).count(3)).build(); }},
        {"CountHighest", "as many blobs as can be said", kUnusable, [](const I& i) { return imageOf(stapled(i).count(kMaximum)).build(); }},
        {"SuperblobMagic", "the superblob has another magic", kUnusable, [](const I& i) { return imageOf(stapled(i).magic(0xFADE0CC1)).build(); }},
        {"SuperblobLengthOneTooHigh", "the superblob says one byte more", kUnusable, [](const I& i) { return imageOf(stapled(i).length(static_cast<std::uint32_t>(superblobSize(i) + 1))).build(); }},
        {"SuperblobLengthOneTooLow", "the superblob says one byte less", kUnusable, [](const I& i) { return imageOf(stapled(i).length(static_cast<std::uint32_t>(superblobSize(i) - 1))).build(); }},
        {"SuperblobLengthZero", "the superblob says no byte", kUnusable, [](const I& i) { return imageOf(stapled(i).length(0)).build(); }},
        {"ByteBehindTheSuperblob", "a byte between superblob and trailer", kUnusable, [](const I& i) { const Data image = imageOf(stapled(i)).build(); return inserted(image, image.size() - 512); }},
        {"ByteBehindTheSuperblobCounted", "a byte behind the blobs, which the trailer counts in", kUnusable, [](const I& i) { return DiskImageBuilder().data(irregularData(kOwnData)).superblob(inserted(stapled(i).build(), superblobSize(i))).build(); }},
        {"ByteBeforeTheSuperblob", "a byte between data and superblob", kUnusable, [](const I& i) { return inserted(imageOf(stapled(i)).build(), kOwnData); }},
        {"ByteBeforeIt", "a byte in front of the image", kUnusable, [](const I& i) { return inserted(imageOf(stapled(i)).build(), 0); }},
        {"ByteBehindIt", "a byte behind the trailer", kUnusable, [](const I& i) { const Data image = imageOf(stapled(i)).build(); return inserted(image, image.size()); }},
        {"FirstByteMissing", "the image's first byte is missing", kUnusable, [](const I& i) { return removed(imageOf(stapled(i)).build(), 0); }},
        {"LastByteMissing", "the trailer's last byte is missing", kUnusable, [](const I& i) { const Data image = imageOf(stapled(i)).build(); return removed(image, image.size() - 1); }},
        {"TrailerAlone", "nothing but the trailer", kUnusable, [](const I& i) { return imageOf(stapled(i)).trailer(); }},
        {"TrailerTwice", "the trailer twice", kUnusable, [](const I& i) { Data image = imageOf(stapled(i)).build(); base::append(image, imageOf(stapled(i)).trailer()); return image; }},
        {"TrailerMagic", "the trailer has another magic", kUnusable, [](const I& i) { return imageOf(stapled(i)).magic("kolz").build(); }},
        {"TrailerVersion3", "a trailer of version 3", kUnusable, [](const I& i) { return imageOf(stapled(i)).version(3).build(); }},
        {"TrailerVersion5", "a trailer of version 5", kUnusable, [](const I& i) { return imageOf(stapled(i)).version(5).build(); }},
        {"SignatureOffsetOneMore", "the trailer leads one byte too far", kUnusable, [](const I& i) { return imageOf(stapled(i)).codeSignOffset(kOwnData + 1).build(); }},
        {"SignatureOffsetOneLess", "the trailer leads one byte too near", kUnusable, [](const I& i) { return imageOf(stapled(i)).codeSignOffset(kOwnData - 1).build(); }},
        {"SignatureOffsetHighest", "offset and length wrap around", kUnusable, [](const I& i) { return imageOf(stapled(i)).codeSignOffset(~std::uint64_t{0}).build(); }},
        {"SignatureOffsetZero", "the trailer knows no signature's offset: an unsigned image of another hash", kRefused, [](const I& i) { return imageOf(stapled(i)).codeSignOffset(0).build(); }},
        {"SignatureLengthZero", "the trailer knows no signature's length: an unsigned image of another hash", kRefused, [](const I& i) { return imageOf(stapled(i)).codeSignLength(0).build(); }},
        {"SignatureLengthOneMore", "the signature reaches into the trailer", kUnusable, [](const I& i) { return imageOf(stapled(i)).codeSignLength(superblobSize(i) + 1).build(); }},
        {"SignatureLengthOneLess", "the signature ends before the trailer", kUnusable, [](const I& i) { return imageOf(stapled(i)).codeSignLength(superblobSize(i) - 1).build(); }},
        {"AnotherDirectory", "another image's code directory", kRefused, [](const I& i) { return imageOf(SuperBlobBuilder::adHoc(CodeDirectoryBuilder().identifier("com.example.other").covers(2, emptyRequirements()).covers(6, DiskImageBuilder().trailer()).build()).blob(kSampleTicketSlot, blobOf(i))).build(); }},
        {"SignatureTakenOut", "the ticket alone in the superblob", kRefused, [](const I& i) { return imageOf(SuperBlobBuilder().blob(kSampleTicketSlot, blobOf(i))).build(); }},
    };
}

struct PackageFault {
    const char* name;
    const char* wrong;
    int exit;
    std::function<std::string(const std::string& ticket)> make;
};

ArchiveBuilder archive() {
    return ArchiveBuilder().signature("CMS").afterChecksum(irregularData(kOwnData));
}
PackageBuilder package() {
    return PackageBuilder().archive(archive().build());
}
TrailerFields ticketRecord() {
    TrailerFields fields;
    fields.type = 2;
    return fields;
}
/// Terminator, ticket, and a record with that length.
std::string withRecordLength(const std::string& ticket, std::uint32_t length) {
    TrailerFields fields = ticketRecord();
    fields.length = length;
    return package().terminator().trailer(fields, base::toData(ticket)).build();
}
std::uint32_t sizeOf(const std::string& ticket) {
    return static_cast<std::uint32_t>(ticket.size());
}
std::string withRecord(const std::string& ticket, const std::function<void(TrailerFields&)>& change) {
    TrailerFields fields = ticketRecord();
    change(fields);
    return package().terminator().trailer(fields, base::toData(ticket)).build();
}
std::string good(const std::string& ticket) {
    return package().terminator().ticket(ticket).build();
}

std::vector<PackageFault> packageFaults() {
    using T = const std::string&;
    return {
        {"NoTicket", "no ticket is stapled to it", kRefused, [](T) { return package().build(); }},
        {"TerminatorAlone", "a terminator and no ticket", kRefused, [](T) { return package().terminator().build(); }},
        {"TwoTicketsTheLaterForged", "two tickets, and the later one counts: it is another signer's", kRefused, [](T t) { std::string other = t; other.back() = '\1'; return package().terminator().ticket(t).ticket(other).build(); }},
        {"TwoTicketsTheEarlierForged", "nothing: of two tickets the later one counts, and it is good", kAccepted, [](T t) { std::string other = t; other.back() = '\1'; return package().terminator().ticket(other).ticket(t).build(); }},
        {"NoTerminator", "nothing: the walk from the end is over at the ticket", kAccepted, [](T t) { return package().ticket(t).build(); }},
        {"UpperLength", "nothing: the upper half of the length is not looked at", kAccepted, [](T t) { return withRecord(t, [](TrailerFields& f) { f.upperLength = kMaximum; }); }},
        {"UnknownBehind", "nothing: a trailer of an unknown type is passed over", kAccepted, [](T t) { return package().terminator().ticket(t).unknown("data").build(); }},
        {"TerminatorBehindTheTicket", "the chain ends before the ticket", kRefused, [](T t) { return package().ticket(t).terminator().build(); }},
        {"ByteBehindIt", "a byte behind the last record", kRefused, [](T t) { return good(t) + '\0'; }},
        {"ByteBehindTheTicket", "a byte between ticket and record", kRefused, [](T t) { std::string p = good(t); p.insert(p.size() - 16, 1, '\0'); return p; }},
        {"ByteBeforeIt", "a byte in front of the archive", kUnusable, [](T t) { return '\0' + good(t); }},
        {"LastByteMissing", "the record's last byte is missing", kRefused, [](T t) { std::string p = good(t); p.pop_back(); return p; }},
        {"FirstByteMissing", "the archive's first byte is missing", kUnusable, [](T t) { return good(t).substr(1); }},
        {"RecordTwice", "the ticket's record twice", kRefused, [](T t) { const std::string p = good(t); return p + p.substr(p.size() - 16); }},
        {"RecordMagic", "the record has another magic", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.magic = "t8ls"; }); }},
        {"RecordVersion0", "a record of version 0", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.version = 0; }); }},
        {"RecordVersion2", "a record of version 2", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.version = 2; }); }},
        {"RecordType0", "a record of type 0", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.type = 0; }); }},
        {"RecordType1", "the ticket's record has the terminator's type", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.type = 1; }); }},
        {"RecordType3", "a record of type 3", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.type = 3; }); }},
        {"RecordType512", "the record's type in the wrong byte order", kRefused, [](T t) { return withRecord(t, [](TrailerFields& f) { f.type = 0x0200; }); }},
        {"LengthOneTooHigh", "the record takes a byte of the terminator in", kRefused, [](T t) { return withRecordLength(t, sizeOf(t) + 1); }},
        {"LengthOneTooLow", "the record leaves the ticket's first byte out", kRefused, [](T t) { return withRecordLength(t, sizeOf(t) - 1); }},
        {"LengthWithTheTerminator", "the record takes the whole terminator in", kRefused, [](T t) { return withRecordLength(t, sizeOf(t) + 16); }},
        {"LengthOverTheArchive", "the record takes a part of the archive in", kRefused, [](T t) { return withRecordLength(t, sizeOf(t) + 100); }},
        {"LengthZero", "the record says no byte", kRefused, [](T t) { return withRecordLength(t, 0); }},
        {"LengthHighest", "the record says as much as it can", kRefused, [](T t) { return withRecordLength(t, kMaximum); }},
        {"UnknownBehindTooLong", "an unknown trailer behind the ticket reaches over it", kRefused, [](T t) { TrailerFields f; f.length = sizeOf(t) + 16; return package().terminator().ticket(t).trailer(f).build(); }},
        {"UnknownBehindHalfWay", "an unknown trailer ends in the middle of the ticket", kRefused, [](T t) { TrailerFields f; f.length = 100; return package().terminator().ticket(t).trailer(f).build(); }},
        {"TicketEmpty", "a ticket of no byte", kRefused, [](T) { return package().terminator().ticket("").build(); }},
        {"AnotherArchive", "another archive before the ticket", kRefused, [](T t) { return PackageBuilder().archive(archive().element("<extra/>").build()).terminator().ticket(t).build(); }},
        {"ContentsChanged", "a byte of the table of contents is another", kUnusable, [](T t) { return PackageBuilder().archive(changed(archive().build(), 40)).terminator().ticket(t).build(); }},
        {"ChecksumChanged", "the checksum in the heap is another", kUnusable, [](T t) { return PackageBuilder().archive(archive().checksum(hashOf(9)).build()).terminator().ticket(t).build(); }},
        {"Unsigned", "the archive carries no signature", kUnusable, [](T t) { return PackageBuilder().archive(ArchiveBuilder().build()).terminator().ticket(t).build(); }},
        {"SignedOtherwise", "the archive carries a signature of another sort only", kUnusable, [](T t) { return PackageBuilder().archive(ArchiveBuilder().signature("RSA").build()).terminator().ticket(t).build(); }},
    };
}

// Archives with other contents that claim the valid archive's checksum, or leave unclear what their signature
// signs.

/// The checksum that the ticket lists, in an archive with other contents; and its place in the heap.
constexpr const char* kPlace = "<offset>0</offset><size>20</size>";
ArchiveBuilder otherArchive() {
    return ArchiveBuilder().element("<extra/>").afterChecksum(irregularData(kOwnData));
}
ArchiveBuilder forged() {
    return otherArchive().checksum(archive().rightChecksum());
}
/// First the other archive's own, correct checksum; after it the checksum that the ticket lists.
ArchiveBuilder withBoth(const std::string& element) {
    return otherArchive().afterChecksum(archive().rightChecksum()).checksumElement(element).signature("CMS");
}
std::string checksum(const std::string& style, const std::string& inside) {
    return "<checksum style='" + style + "'>" + inside + "</checksum>";
}
std::string table(const std::string& children) {
    return "<xar><toc>" + checksum("sha1", kPlace) + "<signature style='CMS'/>" + children + "</toc></xar>";
}

struct ArchiveFault {
    const char* name;
    const char* wrong;
    std::function<ArchiveBuilder()> make;
};

std::vector<ArchiveFault> archiveFaults() {
    const std::string right = kPlace;
    const std::string other = "<offset>20</offset><size>20</size>";
    return {
        {"ChecksumForged", "another archive with the checksum that the ticket is for", [] { return forged().signature("CMS"); }},
        {"NoAlgorithm", "the header names no algorithm, and the heap holds the checksum that the ticket is for", [] { return forged().algorithm(0).checksumElement(checksum("none", kPlace)).signature("CMS"); }},
        {"NoAlgorithmButAStyle", "the header names no algorithm, the table does", [] { return forged().algorithm(0).signature("CMS"); }},
        {"NoAlgorithmAndNoElement", "neither header nor table speak of a checksum", [] { return forged().algorithm(0).checksumElement("").signature("CMS"); }},
        {"NoAlgorithmAndTheOtherSignature", "the header names no algorithm, the signature is of the newer element", [] { return forged().algorithm(0).checksumElement(checksum("none", kPlace)).element("<x-signature style='CMS'/>"); }},
        {"NoAlgorithmAndAnEmptyStyle", "the header names no algorithm, the style is empty", [] { return forged().algorithm(0).checksumElement(checksum("", kPlace)).signature("CMS"); }},
        {"AlgorithmCalledNone", "the header has the name of an algorithm, and it is none", [] { return forged().algorithm(3).headerTail(base::toData(std::string_view("none\0\0\0", 8))).checksumElement(checksum("none", kPlace)).signature("CMS"); }},
        {"AlgorithmWithoutAName", "the header has an empty name for its algorithm", [] { return forged().algorithm(3).headerTail(Data(8)).checksumElement(checksum("", kPlace)).signature("CMS"); }},
        {"AlgorithmInCapitals", "the name of the header's algorithm is in capitals", [] { return otherArchive().digest("sha256").algorithm(3).headerTail(base::toData(std::string_view("SHA256\0\0", 8))).signature("CMS"); }},
        {"AlgorithmUnknown", "the header's algorithm is one that nobody knows", [] { return forged().algorithm(77).signature("CMS"); }},
        {"StyleInCapitals", "the checksum's style is in capitals", [] { return otherArchive().checksumStyle("SHA1").signature("CMS"); }},
        {"StyleOfAnother", "the checksum's style is not the header's", [] { return otherArchive().checksumStyle("sha256").signature("CMS"); }},
        {"StyleNone", "the checksum's style says that there is none", [] { return forged().checksumStyle("none").signature("CMS"); }},
        {"StyleMissing", "the checksum has no style", [] { return otherArchive().checksumElement(std::string("<checksum>") + kPlace + "</checksum>").signature("CMS"); }},
        {"StyleOfAnotherNameSpace", "the style is another name space's", [] { return otherArchive().checksumElement(std::string("<checksum x:style='sha1'>") + kPlace + "</checksum>").signature("CMS"); }},
        {"TwoChecksums", "two checksums: the first is right, the second the one that the ticket is for", [=] { return withBoth(checksum("sha1", right) + checksum("sha1", other)); }},
        {"TwoChecksumsTheFirstForged", "two checksums: the first is the one that the ticket is for, the second right", [=] { return withBoth(checksum("sha1", other) + checksum("sha1", right)); }},
        {"TwoChecksumsOfTwoNameSpaces", "two checksums, one of them of a name space of its own", [=] { return withBoth(checksum("sha1", right) + "<x:checksum style='sha1'>" + other + "</x:checksum>"); }},
        {"TwoOffsets", "two offsets: the second leads to the checksum that the ticket is for", [] { return withBoth(checksum("sha1", std::string(kPlace) + "<offset>20</offset>")); }},
        {"TwoOffsetsTheFirstForged", "two offsets: the first leads to the checksum that the ticket is for", [] { return withBoth(checksum("sha1", std::string("<offset>20</offset>") + kPlace)); }},
        {"TwoSizes", "two sizes", [] { return withBoth(checksum("sha1", std::string(kPlace) + "<size>20</size>")); }},
        {"TwoOffsetsOfTwoNameSpaces", "two offsets, one of them of a name space of its own", [] { return withBoth(checksum("sha1", std::string(kPlace) + "<x:offset>20</x:offset>")); }},
        {"OffsetForged", "the offset leads to the checksum that the ticket is for", [=] { return withBoth(checksum("sha1", other)); }},
        {"OffsetMissing", "a signature, and nothing that says where the checksum is", [] { return otherArchive().checksumElement(checksum("sha1", "<size>20</size>")).signature("CMS"); }},
        {"SizeMissing", "a signature, and nothing that says how long the checksum is", [] { return otherArchive().checksumElement(checksum("sha1", "<offset>0</offset>")).signature("CMS"); }},
        {"SizeOfAnother", "the size is another algorithm's", [] { return otherArchive().checksumSize("32").signature("CMS"); }},
        {"SizeEmpty", "the size is empty", [] { return otherArchive().checksumElement(checksum("sha1", "<offset>0</offset><size/>")).signature("CMS"); }},
        {"OffsetNegative", "a negative offset", [] { return otherArchive().checksumOffset("-20").signature("CMS"); }},
        {"OffsetHighest", "offset and heap together wrap around", [] { return otherArchive().checksumOffset("18446744073709551615").signature("CMS"); }},
        {"TwoTables", "two tables of contents", [] { return ArchiveBuilder().toc("<xar><toc>" + checksum("sha1", kPlace) + "<signature style='CMS'/></toc><toc/></xar>"); }},
        {"DocumentType", "a document type before the table", [] { return ArchiveBuilder().toc("<!DOCTYPE xar SYSTEM 'xar.dtd'>" + table("")); }},
        {"EntityForTheSize", "the size is an entity", [] { return ArchiveBuilder().toc("<!DOCTYPE xar [<!ENTITY s '20'>]><xar><toc>" + checksum("sha1", "<offset>0</offset><size>&s;</size>") + "<signature style='CMS'/></toc></xar>"); }},
        {"AnotherEncoding", "a table in an encoding that hides its markup", [] { return ArchiveBuilder().toc("<?xml version='1.0' encoding='UTF-7'?>" + table("")); }},
        {"TwoEncodings", "a mark of one encoding before the declaration of another", [] { return ArchiveBuilder().toc("\xEF\xBB\xBF<?xml version='1.0' encoding='ISO-8859-1'?>" + table("")); }},
        {"TableOneLonger", "the header takes a byte of the heap into the table", [] { const ArchiveBuilder a = otherArchive().signature("CMS"); return ArchiveBuilder(a).compressedLength(a.heapStart() - 28 + 1); }},
        {"TableOneShorter", "the header leaves the table's last byte to the heap", [] { const ArchiveBuilder a = otherArchive().signature("CMS"); return ArchiveBuilder(a).compressedLength(a.heapStart() - 28 - 1); }},
        {"SignatureInCapitals", "an element that is called like a signature, in capitals", [] { return otherArchive().element("<SIGNATURE style='CMS'/>"); }},
        {"SignatureOfAFile", "the only signature is inside a file", [] { return otherArchive().element("<file><signature style='CMS'/></file>"); }},
        {"SignatureTypeInLowerCase", "the only signature is of the type \"cms\"", [] { return otherArchive().signature("cms"); }},
    };
}

// Bundles.

/// The subject's own unless another identifier is given.
Data directoryOf(const char* identifier = "com.example.sample") {
    return CodeDirectoryBuilder().identifier(identifier).covers(2, emptyRequirements()).build();
}
Data program(const Data& directory) {
    return ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(directory).build()).build();
}
void writeBundle(Path path, const Data& executable, const I& i) {
    BundleBuilder().executable(executable).write(path);
    writeFile(path + "/Contents/CodeResources", ByteView(goodTicket(subjectNamed("bundle"), i)));
}
void writeGood(Path path, const I& i) {
    subjectNamed("bundle").write(path, goodTicket(subjectNamed("bundle"), i));
}

std::vector<ArtefactFault> bundleFaults() {
    const std::string bundle = "bundle";
    return {
        {"NoTicket", "no ticket is stapled to it", bundle, kRefused, [](Path p, const I&) { subjectNamed("bundle").write(p, std::nullopt); }},
        {"TicketIsADirectory", "a directory in the place of the ticket", bundle, kRefused, [](Path p, const I&) { subjectNamed("bundle").write(p, std::nullopt); std::filesystem::create_directory(p + "/Contents/CodeResources"); }},
        {"TicketLeadsNowhere", "a symbolic link to nothing in the place of the ticket", bundle, kRefused, [](Path p, const I&) { subjectNamed("bundle").write(p, std::nullopt); std::filesystem::create_symlink("nowhere", p + "/Contents/CodeResources"); }},
        {"TicketIsALink", "a symbolic link to the good ticket in its place", bundle, kRefused, [](Path p, const I& i) { writeGood(p, i); std::filesystem::rename(p + "/Contents/CodeResources", p + "/Contents/ticket"); std::filesystem::create_symlink("ticket", p + "/Contents/CodeResources"); }},
        {"TicketElsewhere", "the good ticket stands one directory deeper", bundle, kRefused, [](Path p, const I& i) { writeGood(p, i); std::filesystem::create_directory(p + "/Contents/_CodeSignature"); std::filesystem::rename(p + "/Contents/CodeResources", p + "/Contents/_CodeSignature/CodeResources"); }},
        {"TicketOnTheTop", "the good ticket stands in the bundle itself", bundle, kRefused, [](Path p, const I& i) { writeGood(p, i); std::filesystem::rename(p + "/Contents/CodeResources", p + "/CodeResources"); }},
        {"AnotherProgram", "another signed program around the ticket", bundle, kRefused, [](Path p, const I& i) { writeBundle(p, program(directoryOf("com.example.other")), i); }},
        {"AnotherSlice", "the ticket is for the slice of the other processor", bundle, kRefused, [](Path p, const I& i) { writeBundle(p, UniversalImageBuilder().slice(kSampleX86, program(directoryOf())).slice(kSampleArm, program(directoryOf("com.example.other"))).build(), i); }},
        {"TheSlice", "nothing: the ticket is for the slice that is looked at", bundle, kAccepted, [](Path p, const I& i) { writeBundle(p, UniversalImageBuilder().slice(kSampleX86, program(directoryOf("com.example.other"))).slice(kSampleArm, program(directoryOf())).build(), i); }},
        {"DirectoryChanged", "a byte of the code directory is another", bundle, kRefused, [](Path p, const I& i) { Data d = CodeDirectoryBuilder().covers(2, emptyRequirements()).build(); writeBundle(p, program(changed(d, d.size() - 1)), i); }},
        {"Unsigned", "the program carries no signature", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, ExecutableImageBuilder().withoutSignature().build(), i); }},
        {"NoProgram", "no program is there", bundle, kUnusable, [](Path p, const I& i) { writeGood(p, i); std::filesystem::remove(p + "/Contents/Programs/Sample"); }},
        {"ProgramEmpty", "a program of no byte", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, {}, i); }},
        {"ProgramIsAText", "a script in the place of the program", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, base::toData("#!/bin/sh\n"), i); }},
        {"SignatureMagic", "the signature has another magic", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc().magic(0xFADE0CC1).build()).build(), i); }},
        {"SignatureBehindTheEnd", "the signature is said to lie behind the program's end", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, ExecutableImageBuilder().signatureOffset(kMaximum - 16).build(), i); }},
        {"SignatureLengthZero", "a signature of no length", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, ExecutableImageBuilder().signatureLength(0).build(), i); }},
        {"DirectoriesOverlap", "code directory and requirements overlap", bundle, kUnusable, [](Path p, const I& i) { writeBundle(p, ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(CodeDirectoryBuilder().covers(2, emptyRequirements()).build()).offsetOf(2, 40).build()).build(), i); }},
    };
}
// clang-format on

}  // namespace

std::vector<ArtefactFault> artefactFaults() {
    std::vector<ArtefactFault> faults;
    for (const ArtefactFault& fault : bundleFaults()) {
        faults.push_back(fault);
        faults.back().name = "Bundle" + fault.name;
    }
    for (const ImageFault& fault : imageFaults()) {
        faults.push_back(
            {std::string("Image") + fault.name, fault.wrong, "signedImage", fault.exit,
             [make = fault.make](Path path, const I& i) { writeFile(path, ByteView(make(i))); }});
    }
    for (const ArchiveFault& fault : archiveFaults()) {
        faults.push_back({std::string("Archive") + fault.name, fault.wrong, "package", kUnusable,
                          [make = fault.make](Path path, const I& i) {
                              const Data ticket = goodTicket(subjectNamed("package"), i);
                              writeFile(path, PackageBuilder()
                                                  .archive(make().build())
                                                  .terminator()
                                                  .ticket(base::toString(ticket))
                                                  .build());
                          }});
    }
    for (const PackageFault& fault : packageFaults()) {
        faults.push_back({std::string("Package") + fault.name, fault.wrong, "package", fault.exit,
                          [make = fault.make](Path path, const I& i) {
                              const Data ticket = goodTicket(subjectNamed("package"), i);
                              writeFile(path, make(base::toString(ticket)));
                          }});
    }
    return faults;
}

std::vector<AnswerFault> answerFaults(const std::string& goodTicket) {
    constexpr int kNoAnswer = 68;
    const std::string value = "{\"fields\":{\"signedTicket\":{\"value\":\"" + goodTicket + "\"}}}";
    const auto record = [](const std::string& fields) {
        return "{\"records\":[{\"fields\":" + fields + "}]}";
    };
    const auto ticket = [&](const std::string& json) {
        return record("{\"signedTicket\":{\"value\":" + json + "}}");
    };
    return {
        {"Nothing", "no byte", kNoAnswer, ""},
        {"Null", "a JSON null", kRefused, "null"},
        {"NoJson", "no JSON", kRefused, "<html></html>"},
        {"JsonCutShort", "the answer's last character is missing", kRefused,
         ticket("\"" + goodTicket + "\"").substr(0, goodTicket.size() + 40)},
        {"EmptyObject", "an empty object", kRefused, "{}"},
        {"NoRecords", "no records", kRefused, "{\"records\":[]}"},
        {"RecordsOfAnotherType", "records that are no list", kRefused, "{\"records\":" + value + "}"},
        {"SecondRecord", "the ticket is the second record's", kRefused, "{\"records\":[{}," + value + "]}"},
        {"NoFields", "a record without fields", kRefused, "{\"records\":[{}]}"},
        {"Reason", "a record that gives a reason", kRefused, "{\"records\":[{\"reason\":\"NOT_FOUND\"}]}"},
        {"TicketBare", "the ticket stands where its object should", kRefused,
         record("{\"signedTicket\":\"" + goodTicket + "\"}")},
        {"TicketNull", "a null for a ticket", kRefused, ticket("null")},
        {"TicketNumber", "a number for a ticket", kRefused, ticket("1")},
        {"TicketList", "a list for a ticket", kRefused, ticket("[\"" + goodTicket + "\"]")},
        {"TicketEmpty", "an empty ticket", kRefused, ticket("\"\"")},
        {"TicketNoBase64", "a ticket that is no base64", kRefused, ticket("\"****\"")},
        {"TicketCutShort", "the ticket lacks its last four characters", kRefused,
         ticket("\"" + goodTicket.substr(0, goodTicket.size() - 4) + "\"")},
        {"TicketTwice", "the ticket twice", kRefused, ticket("\"" + goodTicket + goodTicket + "\"")},
    };
}

}  // namespace pinwell::test
