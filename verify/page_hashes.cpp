#include "page_hashes.h"

#include <algorithm>
#include <mutex>
#include <utility>

#include "base/bytes.h"
#include "base/text.h"
#include "codesign/code_error.h"
#include "values/format.h"
#include "verify/check.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::FileRange;
using values::format;

namespace {

/// Larger pages are hashed piece by piece.
constexpr std::uint8_t kLargestPageShiftInBuffer = 19;
static_assert(std::size_t{1} << kLargestPageShiftInBuffer == kBufferSize);

/// A larger shift has no meaning: no file is that long.
constexpr std::uint8_t kMaximumPageShift = 62;

std::uint64_t pageSize(const Directory& directory, std::uint64_t codeLength) {
    if (directory.pageShift == 0) return std::max<std::uint64_t>(codeLength, 1);
    return std::uint64_t{1} << directory.pageShift;
}

std::uint64_t slotsNeeded(const Directory& directory, std::uint64_t codeLength) {
    const std::uint64_t size = pageSize(directory, codeLength);
    // The whole code as one page has a hash even if it is empty.
    if (directory.pageShift == 0) return 1;
    return codeLength / size + (codeLength % size != 0 ? 1 : 0);
}

std::string directoryPlace(const std::string& place, const Directory& directory) {
    return format("%@, %@ code directory", place, directory.digestName());
}

bool coversCode(const Directory& directory, std::uint64_t codeLength) {
    return !directory.hasScatter && directory.pageShift <= kMaximumPageShift &&
           directory.limit == codeLength && directory.codeSlots == slotsNeeded(directory, codeLength);
}

/// The pages of one run of the check.
class PageCheck {
  public:
    PageCheck(const ByteSource& source, const FileRange& code, const std::string& place)
        : source_(source), code_(code), place_(place) {}

    void checkSmallPages(const std::vector<const Directory*>& directories, Workers& workers) {
        const std::uint64_t parts = code_.length / kBufferSize + (code_.length % kBufferSize != 0 ? 1 : 0);
        workers.forEach(static_cast<std::size_t>(parts), [&](std::size_t part) {
            const std::uint64_t begin = std::uint64_t{part} * kBufferSize;
            const auto length =
                static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, code_.length - begin));
            const std::span<std::byte> buffer = threadBuffer().first(length);
            source_.read(code_.offset + begin, buffer);
            for (const Directory* directory : directories) checkPart(*directory, begin, buffer);
        });
    }

    void checkLargePages(const Directory& directory, Workers& workers) {
        workers.forEach(directory.codeSlots, [&](std::size_t page) {
            const std::uint64_t size = pageSize(directory, code_.length);
            const std::uint64_t begin = page * size;
            const std::uint64_t end = begin + std::min(size, code_.length - begin);
            const ByteView found = digestOf(codesign::algorithmOf(directory.content.digestType()), source_,
                                            {code_.offset + begin, end - begin});
            compare(directory, static_cast<std::uint32_t>(page), begin, end - begin, found);
        });
    }

    void report(const std::vector<const Directory*>& directories, Section& section) {
        std::sort(different_.begin(), different_.end(), [](const Difference& a, const Difference& b) {
            return std::pair(a.directory->slot, a.page) < std::pair(b.directory->slot, b.page);
        });
        for (const Directory* directory : directories) {
            FailureList failures(section, kPageHashes);
            for (const Difference& difference : different_) {
                if (difference.directory != directory) continue;
                failures.add(Outcome::failed,
                             format("%@, page %u (bytes %llu to %llu)", directoryPlace(place_, *directory),
                                    difference.page, code_.offset + difference.begin,
                                    code_.offset + difference.begin + difference.length - 1),
                             base::toHex(directory->codeDigest(difference.page)),
                             base::toHex(difference.found));
            }
            if (failures.count() == 0)
                section.pass(kPageHashes, directoryPlace(place_, *directory),
                             format("%u pages with their hashes", directory->codeSlots));
        }
        if (uncounted_ > 0)
            section.fail(kPageHashes, place_, "pages with their hashes",
                         format("%zu more pages differ", uncounted_));
    }

  private:
    struct Difference {
        const Directory* directory;
        std::uint32_t page;
        std::uint64_t begin;
        std::uint64_t length;
        Data found;
    };

    void checkPart(const Directory& directory, std::uint64_t begin, ByteView bytes) {
        crypto::Hasher& digest = crypto::threadHasher(codesign::algorithmOf(directory.content.digestType()));
        const std::size_t size = std::size_t{1} << directory.pageShift;
        auto page = static_cast<std::uint32_t>(begin >> directory.pageShift);
        for (std::size_t at = 0; at < bytes.size(); at += size, ++page) {
            const ByteView piece = bytes.subspan(at, std::min(size, bytes.size() - at));
            compare(directory, page, begin + at, piece.size(), digest.of(piece));
        }
    }

    void compare(const Directory& directory, std::uint32_t page, std::uint64_t begin, std::uint64_t length,
                 ByteView found) {
        const ByteView expected = directory.codeDigest(page);
        // A stated digest may be cut.
        if (std::equal(expected.begin(), expected.end(), found.begin())) return;
        const std::lock_guard lock(mutex_);
        if (different_.size() >= kMaximumFailuresKept * 4) {
            ++uncounted_;
        } else {
            different_.push_back(
                {&directory, page, begin, length, base::toData(found.first(expected.size()))});
        }
    }

    const ByteSource& source_;
    const FileRange code_;
    const std::string& place_;
    std::mutex mutex_;
    std::vector<Difference> different_;
    std::size_t uncounted_ = 0;
};

}  // namespace

void checkCodeLimit(const SignatureParts& parts, std::uint64_t codeLength, const std::string& what,
                    const std::string& place, Section& section) {
    for (const Directory& directory : parts.directories()) {
        const std::string at = directoryPlace(place, directory);
        const std::string wanted = format("hashes of %llu bytes, up to %@", codeLength, what);
        if (directory.hasScatter) {
            section.fail(kCodeLimit, at, wanted, "a scatter vector, which is not supported");
        } else if (directory.limit != codeLength) {
            section.fail(kCodeLimit, at, wanted, format("a limit of %llu bytes", directory.limit));
        } else if (directory.pageShift > kMaximumPageShift) {
            section.fail(kCodeLimit, at, wanted,
                         format("a page size of two to the power %d", int{directory.pageShift}));
        } else if (directory.codeSlots != slotsNeeded(directory, codeLength)) {
            section.fail(kCodeLimit, at, format("%llu hashes", slotsNeeded(directory, codeLength)),
                         format("%u hashes", directory.codeSlots));
        } else {
            section.pass(kCodeLimit, at, wanted);
        }
    }
}

void checkPageHashes(const ByteSource& source, const FileRange& code, const SignatureParts& parts,
                     const std::string& place, Workers& workers, Section& section) {
    std::vector<const Directory*> small;
    std::vector<const Directory*> large;
    for (const Directory& directory : parts.directories()) {
        if (!coversCode(directory, code.length)) continue;
        const bool isSmall = directory.pageShift != 0 && directory.pageShift <= kLargestPageShiftInBuffer;
        (isSmall ? small : large).push_back(&directory);
    }
    PageCheck check(source, code, place);
    try {
        if (!small.empty()) check.checkSmallPages(small, workers);
        for (const Directory* directory : large) check.checkLargePages(*directory, workers);
    } catch (const std::runtime_error& failure) {
        section.cannotRead(kPageHashes, place, codesign::asCodeError(failure).what());
        return;
    }
    small.insert(small.end(), large.begin(), large.end());
    check.report(small, section);
}

}  // namespace pinwell::verify
