#include "verify/package_trailers.h"

#include <algorithm>

#include "codesign/code_error.h"
#include "foundation/format.h"
#include "src/PWHashedFile/package_trailer_walk.h"
#include "verify/check_names.h"

namespace pinwell::verify {

using codesign::ByteSource;
using codesign::CodeError;
using foundation::ByteView;
using foundation::Data;
using foundation::format;

namespace {

/// The first bytes of a source, as a file for the walk along the trailers.
class StartOfSource final : public files::FileReader {
  public:
    StartOfSource(const ByteSource& source, std::uint64_t end) : source_(source), end_(end) {}

    std::uint64_t seekToEnd() override { return position_ = end_; }
    std::uint64_t seek(std::uint64_t position) override { return position_ = position; }
    std::uint64_t position() override { return position_; }
    Data read(std::uint64_t length) override {
        const std::uint64_t rest = end_ - std::min(position_, end_);
        const auto count = static_cast<std::size_t>(std::min(length, rest));
        try {
            Data bytes = source_.read(position_, count);
            position_ += count;
            return bytes;
        } catch (const CodeError& error) {
            throw files::FileHandleError(error.what());
        }
    }

  private:
    const ByteSource& source_;
    const std::uint64_t end_;
    std::uint64_t position_ = 0;
};

class TrailerCheck {
  public:
    TrailerCheck(const ByteSource& source, Section& section)
        : source_(source), failures_(section, kTrailers), end_(source.size()) {}

    std::uint64_t run() {
        while (walkOnce()) {
        }
        if (end_ != source_.size() && !hasTerminator_)
            fail(end_, "a terminator between archive and trailers", "none");
        return end_;
    }

  private:
    /// The tool's walk stops at the last ticket. Returns whether there may be more.
    bool walkOnce() {
        const std::uint64_t before = end_;
        StartOfSource reader(source_, before);
        const package_trailers walked = walkPackageTrailers(
            reader, {},
            [&](std::uint64_t recordOffset, const trailer_header& record) { visit(recordOffset, record); });
        hasTerminator_ = walked.hasTerminator;
        if (walked.fault) fail(walked.fault->offset, "a chain of trailers", walked.fault->rule);
        return !walked.fault && !hasTerminator_ && end_ != before;
    }

    void visit(std::uint64_t recordOffset, const trailer_header& record) {
        constexpr std::size_t kUpperHalf = 12;
        const ByteView unused = ByteView(record.bytes).subspan(kUpperHalf);
        end_ = recordOffset - std::min<std::uint64_t>(record.length(), recordOffset);
        if (std::any_of(unused.begin(), unused.end(), [](std::byte byte) { return byte != std::byte{0}; }))
            fail(recordOffset + kUpperHalf, "zeros after the length", "other bytes");
        if (record.type() == kTerminatorTrailerType) {
            if (record.length() != 0) fail(recordOffset, "a terminator without data", "one with data");
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
};

}  // namespace

std::uint64_t endOfArchive(const ByteSource& source, Section& section) {
    return TrailerCheck(source, section).run();
}

}  // namespace pinwell::verify
