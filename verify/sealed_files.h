// Checks the files of a bundle against their sealed digests, many at a time.
#pragma once

#include <mutex>
#include <string>
#include <vector>

#include "verify/check.h"
#include "verify/directory.h"
#include "verify/seal.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// Collects files and hashes them in batches on all threads. Memory and open directories are limited to one
/// batch.
class SealedFiles {
  public:
    /// The arguments must outlive the object.
    SealedFiles(Workers& workers, Section& section);

    /// `entry` must live until finish(). `place` is shown to people.
    void add(DirectoryRef directory, std::string name, const SealedEntry& entry, std::string place);

    /// Hashes the remaining files and adds the checks. Call it once, and last.
    void finish();

  private:
    struct Job {
        DirectoryRef directory;
        std::string name;
        const SealedEntry* entry;
        std::string place;
    };
    struct Fault {
        Outcome outcome;
        std::string place;
        std::string expected;
        std::string found;
    };

    void hashBatch();
    void hashOne(const Job& job);
    void report(Outcome outcome, const Job& job, std::string found);

    Workers& workers_;
    Section& section_;
    std::vector<Job> batch_;
    std::size_t hashed_ = 0;
    std::mutex mutex_;
    std::vector<Fault> faults_;
    std::size_t uncounted_ = 0;  // faults that are not kept
};

}  // namespace pinwell::verify
