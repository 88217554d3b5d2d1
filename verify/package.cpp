#include "verify/code.h"

#include <algorithm>
#include <mutex>
#include <optional>
#include <set>
#include <string_view>
#include <utility>

#include "archive_table.h"
#include "base/byte_io.h"
#include "base/bytes.h"
#include "base/text.h"
#include "codesign/code_error.h"
#include "formats/package_trailers.h"
#include "values/format.h"
#include "verify/check.h"
#include "verify/signature_parts.h"
#include "xar/header.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::CodeError;
using codesign::FileRange;
using codesign::refuse;
using values::format;

namespace {

constexpr std::string_view kCmsStyle = "CMS";

/// Longest signature that is held whole; a real one takes some 10 KiB.
constexpr std::uint64_t kMaximumSignature = std::uint64_t{16} * 1024 * 1024;

/// A range of the heap as a range of the file; `nullopt` if it is outside.
std::optional<FileRange> inFile(const Archive& archive, const FileRange& range, std::uint64_t end) {
    const std::uint64_t heap = end - archive.heapStart;
    if (range.offset > heap || range.length > heap - range.offset) return std::nullopt;
    return FileRange{archive.heapStart + range.offset, range.length};
}

/// Checks the bytes after the archive (formats/package_trailers.h): none, or a terminator and one
/// ticket.
///
/// The tool skips trailers of other types and keeps them. Here they are faults, because nothing covers them.
/// A second ticket, a chain without its terminator, and records with non-zero unused bytes are faults too.
class TrailerCheck {
  public:
    TrailerCheck(const ByteSource& source, Section& section)
        : source_(source), failures_(section, kTrailers), end_(source.size()) {}

    /// The end of the archive, where the trailers begin.
    std::uint64_t run() {
        try {
            const PackageTrailerSurvey survey =
                surveyPackageTrailers(source_, [&](const SurveyedTrailer& trailer) { visit(trailer); });
            hasTerminator_ = survey.hasTerminator && !isBroken_;
        } catch (const base::ReadFailure&) {
            if (!isBroken_) fail(end_, kChain, "the trailers cannot be read");
        }
        if (end_ != source_.size() && !hasTerminator_)
            fail(end_, "a terminator between archive and trailers", "none");
        return end_;
    }

  private:
    static constexpr const char* kChain = "a chain of trailers";

    void visit(const SurveyedTrailer& trailer) {
        if (isBroken_) return;
        if (trailer_data_is_valid(trailer.record.bytes, nullptr)) check(trailer);
        if (trailer.fault) fail(trailer.fault->offset, kChain, trailer.fault->rule);
        isBroken_ = trailer.fault.has_value();
    }

    void check(const SurveyedTrailer& trailer) {
        constexpr std::size_t kUpperHalf = 12;
        const trailer_header& record = trailer.record;
        const ByteView unused = ByteView(record.bytes).subspan(kUpperHalf);
        end_ = trailer.dataOffset.value_or(0);
        if (std::any_of(unused.begin(), unused.end(), [](std::byte byte) { return byte != std::byte{0}; }))
            fail(trailer.recordOffset + kUpperHalf, "zeros after the length", "other bytes");
        if (record.type() == kTerminatorTrailerType) {
            if (record.length() != 0)
                fail(trailer.recordOffset, "a terminator without data", "one with data");
        } else if (record.type() != kTicketTrailerType) {
            fail(end_, "a ticket", format("a trailer of type %u, which nothing covers", record.type()));
        } else if (++tickets_ > 1) {
            fail(end_, "one ticket", "an earlier one");
        }
    }

    void fail(std::uint64_t offset, const char* expected, std::string found) {
        failures_.add(Outcome::failed, format("trailer (from byte %llu on)", offset), expected,
                      std::move(found));
    }

    const ByteSource& source_;
    FailureList failures_;
    std::uint64_t end_;
    std::size_t tickets_ = 0;
    bool hasTerminator_ = false;
    bool isBroken_ = false;
};

/// Whether the header looks like an archive's, possibly a damaged one.
bool beginsAsArchive(const ByteSource& source) {
    constexpr std::uint32_t kMagic = 0x78617221;
    constexpr std::uint16_t kVersion = 1;
    if (source.size() < xar::kFixedHeaderSize) return false;
    const Data start = source.read(0, xar::kFixedHeaderSize);
    base::ByteReader reader(start);
    if (reader.be32("magic") == kMagic) return true;
    return reader.be16("header size") == xar::kFixedHeaderSize && reader.be16("version") == kVersion;
}

class PackageCheck {
  public:
    PackageCheck(const ByteSource& source, Workers& workers, Section& section)
        : source_(source), workers_(workers), section_(section) {}

    VerifiedCode run() {
        end_ = TrailerCheck(source_, section_).run();
        archive_ = readArchive(source_, end_);
        section_.pass(kArchive, "archive",
                      format("a table of contents with %zu files", archive_.table.files.size()));
        VerifiedCode code;
        code.isSigned = !archive_.table.signatures.empty();
        checkTable();
        checkSignatures(code);
        checkFiles();
        checkHeap();
        return code;
    }

  private:
    void checkTable() {
        constexpr const char* kPlace = "table of contents";
        const auto range =
            archive_.table.checksum ? inFile(archive_, *archive_.table.checksum, end_) : std::nullopt;
        if (!archive_.algorithm || !range || range->length != crypto::digestSize(*archive_.algorithm) ||
            xar::digestNamed(archive_.table.checksumStyle) != archive_.algorithm) {
            section_.fail(kTableChecksum, kPlace, "a checksum of the header's kind", "none");
            return;
        }
        stored_ = source_.read(range->offset, static_cast<std::size_t>(range->length));
        const std::string stored = base::toHex(stored_);
        if (stored_ == archive_.computed) {
            section_.pass(kTableChecksum, kPlace, stored);
        } else {
            section_.fail(kTableChecksum, kPlace, stored, base::toHex(archive_.computed));
        }
    }

    void checkSignatures(VerifiedCode& code) {
        constexpr const char* kWanted = "a signature over the checksum of the table of contents";
        std::size_t number = 0;
        for (const ArchiveSignature& signature : archive_.table.signatures) {
            const std::string place = format("signature %zu (%@)", ++number, signature.style);
            if (signature.style != kCmsStyle) {
                section_.note(kArchiveSignature, place, "a signature of the style CMS",
                              "one of another style, whose bytes nothing covers");
                continue;
            }
            const auto range = signature.range ? inFile(archive_, *signature.range, end_) : std::nullopt;
            if (!range || range->length > kMaximumSignature) {
                section_.fail(kArchiveSignature, place, kWanted, "it lies outside the archive");
                continue;
            }
            const Data bytes = source_.read(range->offset, static_cast<std::size_t>(range->length));
            const ByteView message = withoutPadding(bytes);
            try {
                if (stored_.empty()) refuse("there is no checksum that it could be over");
                const SignerMessage signer = requireSignerMessage(message, stored_);
                section_.pass(kArchiveSignature, place, kWanted);
                noteCertificates(signer, place, section_);
                addIdentity(signer, code);
            } catch (const CodeError& error) {
                section_.fail(kArchiveSignature, place, kWanted, error.what());
            }
        }
    }

    void addIdentity(const SignerMessage& signer, VerifiedCode& code) const {
        if (!code.identities.empty()) return;
        CodeIdentity identity;
        identity.place = "package";
        identity.codeHashes = {stored_};
        identity.hasSecureTimestamp = signer.hasTimestamp;
        code.identities.push_back(std::move(identity));
    }

    /// The bytes up to the length that a message states, without the zeros that fill its reserved space.
    static ByteView withoutPadding(ByteView bytes) {
        try {
            base::ByteReader reader(bytes);
            reader.skip(1, "tag");
            std::uint64_t length = reader.u8("length");
            constexpr std::uint64_t kLongForm = 0x80;
            if (length > kLongForm) {
                const std::uint64_t count = length - kLongForm;
                if (count > 4) return bytes;
                length = 0;
                for (std::uint64_t i = 0; i < count; ++i) length = length << 8U | reader.u8("length");
            } else if (length == kLongForm) {
                return bytes;  // an indefinite length: its contents end it
            }
            if (length > reader.remaining()) return bytes;
            const std::size_t end = reader.position() + static_cast<std::size_t>(length);
            const ByteView rest = bytes.subspan(end);
            const bool isZeros =
                std::all_of(rest.begin(), rest.end(), [](std::byte byte) { return byte == std::byte{0}; });
            return isZeros ? bytes.first(end) : bytes;
        } catch (const base::ShortRead&) {
            return bytes;
        }
    }

    std::string placeOf(const ArchivedData& data) const {
        const std::string path = archive_.table.pathOf(data.file);
        return data.isAttribute ? path + ", extended attribute" : path;
    }

    static std::string wantedOf(const ArchivedData& data) {
        return data.checksum.empty() ? "an archived checksum" : base::toHex(data.checksum);
    }

    struct Fault {
        const ArchivedData* data;
        Outcome outcome;
        std::string found;
    };

    void checkFiles() {
        const std::vector<ArchivedData>& all = archive_.table.data;
        std::vector<Fault> faults;
        std::mutex mutex;
        workers_.forEach(all.size(), [&](std::size_t i) {
            std::optional<Fault> fault = faultOf(all[i]);
            if (!fault) return;
            const std::lock_guard lock(mutex);
            faults.push_back(*std::move(fault));
        });
        std::sort(faults.begin(), faults.end(),
                  [](const Fault& a, const Fault& b) { return a.data < b.data; });
        FailureList failures(section_, kArchivedFile);
        checkNames(failures);
        for (Fault& fault : faults)
            failures.add(fault.outcome, placeOf(*fault.data), wantedOf(*fault.data), std::move(fault.found));
        if (failures.count() == 0)
            section_.pass(kArchivedFile, "heap", format("%zu entries with their checksums", all.size()));
    }

    /// Programs that unpack the archive make paths of the names.
    void checkNames(FailureList& failures) const {
        using Child = std::pair<std::optional<std::size_t>, std::string_view>;
        std::set<Child> seen;
        for (std::size_t i = 0; i < archive_.table.files.size(); ++i) {
            const ArchiveTable::File& file = archive_.table.files[i];
            const bool isName = !file.name.empty() && file.name != "." && file.name != ".." &&
                                file.name.find('/') == std::string::npos;
            if (!isName) {
                failures.add(Outcome::failed, archive_.table.pathOf(i), "the name of a file",
                             "a path, or none");
            } else if (!seen.emplace(file.parent, file.name).second) {
                failures.add(Outcome::failed, archive_.table.pathOf(i), "one entry of that name",
                             "another one");
            }
        }
    }

    /// `nullopt` if the bytes match the table.
    std::optional<Fault> faultOf(const ArchivedData& data) const {
        if (!data.problem.empty()) return Fault{&data, Outcome::failed, data.problem};
        const auto range = inFile(archive_, data.range, end_);
        if (!range) return Fault{&data, Outcome::failed, "it lies outside the archive"};
        try {
            const ByteView found = digestOf(*data.algorithm, source_, *range);
            const bool isSame =
                std::equal(found.begin(), found.end(), data.checksum.begin(), data.checksum.end());
            if (isSame) return std::nullopt;
            return Fault{&data, Outcome::failed, base::toHex(found)};
        } catch (const std::runtime_error& failure) {
            return Fault{&data, Outcome::unreadable, codesign::asCodeError(failure).what()};
        }
    }

    struct Claim {
        FileRange range;
        std::string what;
    };

    std::vector<Claim> claims() const {
        std::vector<Claim> all;
        if (archive_.table.checksum) all.push_back({*archive_.table.checksum, "the checksum"});
        for (const ArchiveSignature& signature : archive_.table.signatures)
            if (signature.range) all.push_back({*signature.range, "a signature"});
        for (const ArchivedData& data : archive_.table.data)
            if (data.problem.empty() && data.range.length > 0) all.push_back({data.range, placeOf(data)});
        std::sort(all.begin(), all.end(), [](const Claim& a, const Claim& b) {
            return std::pair(a.range.offset, a.range.length) < std::pair(b.range.offset, b.range.length);
        });
        return all;
    }

    // Two files with the same contents may share their bytes; other overlaps are faults.
    void checkHeap() {
        FailureList overlaps(section_, kHeap);
        FailureList gaps(section_, kHeap);
        const std::uint64_t heap = end_ - archive_.heapStart;
        std::uint64_t claimed = 0;  // all bytes before it are claimed or reported
        const Claim* last = nullptr;
        const std::vector<Claim> all = claims();
        for (const Claim& claim : all) {
            if (claim.range.offset > heap || claim.range.length > heap - claim.range.offset) continue;
            const bool isShared = last != nullptr && last->range == claim.range;
            if (isShared) continue;
            if (claim.range.offset < claimed)
                overlaps.add(Outcome::failed, claim.what, "bytes of its own",
                             "bytes of " + last->what + " too");
            else
                reportGap(claimed, claim.range.offset, gaps);
            if (claim.range.offset + claim.range.length > claimed) {
                claimed = claim.range.offset + claim.range.length;
                last = &claim;
            }
        }
        reportGap(claimed, heap, gaps);
        if (overlaps.count() == 0) section_.pass(kHeap, "heap", "entries that do not overlap");
    }

    // The signed table of contents gives the place of a gap, but nothing covers its bytes.
    void reportGap(std::uint64_t begin, std::uint64_t end, FailureList& gaps) const {
        if (begin >= end) return;
        const bool isInside = end < end_ - archive_.heapStart;
        const bool isHarmless = isInside && isZero(source_, {archive_.heapStart + begin, end - begin});
        gaps.add(
            isHarmless ? Outcome::noted : Outcome::failed,
            format("heap (bytes %llu to %llu)", archive_.heapStart + begin, archive_.heapStart + end - 1),
            "bytes that an entry claims", format("%llu bytes that nothing claims", end - begin));
    }

    const ByteSource& source_;
    Workers& workers_;
    Section& section_;
    std::uint64_t end_ = 0;
    Archive archive_;
    Data stored_;  // the signed checksum in the heap
};

}  // namespace

VerifiedCode verifyPackage(const ByteSource& source, Workers& workers, Section& section) {
    try {
        return PackageCheck(source, workers, section).run();
    } catch (const std::runtime_error& failure) {
        section.failWith(failure, kArchive, "archive", "a well-formed archive");
    }
    return {.isSigned = beginsAsArchive(source), .identities = {}};
}

}  // namespace pinwell::verify
