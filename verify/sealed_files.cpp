#include "verify/sealed_files.h"

#include <algorithm>
#include <utility>

#include "codesign/code_error.h"
#include "foundation/format.h"
#include "verify/check_names.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

using codesign::CodeError;

namespace {

/// Large enough that no thread waits long for the others. Every job may hold a directory open.
constexpr std::size_t kBatchSize = 256;

}  // namespace

SealedFiles::SealedFiles(Workers& workers, Section& section) : workers_(workers), section_(section) {
    batch_.reserve(kBatchSize);
}

void SealedFiles::add(DirectoryRef directory, std::string name, const SealedEntry& entry, std::string place) {
    batch_.push_back({std::move(directory), std::move(name), &entry, std::move(place)});
    if (batch_.size() == kBatchSize) hashBatch();
}

void SealedFiles::hashBatch() {
    workers_.forEach(batch_.size(), [this](std::size_t i) { hashOne(batch_[i]); });
    hashed_ += batch_.size();
    batch_.clear();
}

void SealedFiles::report(Outcome outcome, const Job& job, std::string found) {
    const std::lock_guard lock(mutex_);
    if (faults_.size() > kMaximumFailuresKept) {
        ++uncounted_;
        return;
    }
    faults_.push_back({outcome, job.place, foundation::toHex(job.entry->digest), std::move(found)});
}

void SealedFiles::hashOne(const Job& job) {
    const bool isSha256 = job.entry->digest.size() == kSha256Length;
    try {
        const auto file = job.directory->file(job.name);
        const ByteView found =
            digestOf(isSha256 ? Algorithm::sha256 : Algorithm::sha1, *file, {0, file->size()});
        const bool isSame =
            std::equal(found.begin(), found.end(), job.entry->digest.begin(), job.entry->digest.end());
        if (!isSame) report(Outcome::failed, job, foundation::toHex(found));
    } catch (const CodeError& error) {
        report(error.status() == codesign::kIOError ? Outcome::unreadable : Outcome::failed, job,
               error.what());
    }
}

void SealedFiles::finish() {
    hashBatch();
    std::sort(faults_.begin(), faults_.end(),
              [](const Fault& a, const Fault& b) { return a.place < b.place; });
    FailureList failures(section_, kSealedFile);
    for (Fault& fault : faults_)
        failures.add(fault.outcome, std::move(fault.place), std::move(fault.expected),
                     std::move(fault.found));
    if (uncounted_ > 0)
        section_.fail(kSealedFile, section_.place, {},
                      foundation::format("%zu more files that are not as sealed", uncounted_));
    if (failures.count() == 0)
        section_.pass(kSealedFile, section_.place,
                      foundation::format("%zu files with their digests", hashed_));
}

}  // namespace pinwell::verify
