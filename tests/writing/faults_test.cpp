// Every way to write an artefact, with each of its file calls failing in each way: the bytes on the disk
// afterwards, and the tool's messages.
//
// An artefact replaced by a rewritten clone is the old one or the new one. An artefact written in place keeps
// all its data. If its tail is damaged, the files on the disk are enough to repair it.
#include <cerrno>
#include <filesystem>
#include <functional>
#include <iostream>
#include <map>

#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/host_platform.h"
#include "src/platform.h"
#include "stapling.h"
#include "support/environment.h"
#include "support/executable_image_builder.h"
#include "support/failing_calls.h"
#include "support/message_capture.h"
#include "support/package_builder.h"
#include "support/process.h"
#include "support/volume.h"
#include "values/format.h"
#include "values/url.h"

#include <gmock/gmock.h>

namespace pinwell::test {
namespace {

using testing::AnyOf;
using testing::Contains;
using testing::IsEmpty;
using testing::Not;

// A written artefact, as one file.
struct Subject {
    std::string name;
    std::string path;  // the tool's argument
    std::string file;  // the written file: the artefact itself, or a bundle's ticket
    std::string data;  // the part of the file that is not the ticket's; never written
    Data hash;
    std::function<std::optional<std::string>(const std::optional<Data>&)> contentsWith;  // `nullopt`: no file
    bool isBundle = false;
    bool isImage = false;
    /// If the new ticket's result differs from the old one's.
    std::function<std::string(const std::optional<Data>&)> afterWith = {};
};

Subject bundleIn(const std::string& directory) {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    const std::string path = directory + "/Sample.app";
    BundleBuilder()
        .executable(
            ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build())
        .write(path);
    return {.name = "bundle",
            .path = path,
            .file = path + "/Contents/CodeResources",
            .data = {},
            .hash = codeHashOf(2, codeDirectory),
            .contentsWith = [](const std::optional<Data>& ticket) -> std::optional<std::string> {
                if (!ticket) return std::nullopt;
                return base::toString(*ticket);
            },
            .isBundle = true};
}

Subject fileIn(const std::string& directory, const Artefact& artefact, const std::string& name,
               const Data& data) {
    const std::string path = directory + "/" + artefact.name;
    const bool isImage = artefact.name.ends_with(".dmg");
    return {.name = name,
            .path = path,
            .file = path,
            .data = isImage ? base::toString(data) : artefact.contents,
            .hash = artefact.hash,
            .contentsWith = [artefact](const std::optional<Data>& ticket) -> std::optional<std::string> {
                return ticket ? artefact.stapledWith(*ticket) : artefact.contents;
            },
            .isImage = isImage};
}

struct Job {
    std::string name;
    std::optional<Data> before;
    std::optional<Data> after;  // `nullopt`: the ticket is deleted
};

std::vector<Job> jobsFor(const Subject& subject) {
    const Data shorter = unsignedTicket({subject.hash});
    const Data longer = unsignedTicket({hashOf(1), hashOf(2), subject.hash});
    std::vector<Job> jobs{{"staple", std::nullopt, longer},
                          {"restaple shorter", longer, shorter},
                          {"restaple longer", shorter, longer}};
    // A bundle's ticket is deleted in another way: see DeletionFaults.
    if (!subject.isBundle) jobs.push_back({"delete", longer, std::nullopt});
    if (subject.afterWith) jobs.erase(jobs.begin());  // it has a ticket, or nothing is moved
    return jobs;
}

struct Fault {
    std::string name;
    std::function<Trouble(std::size_t)> at;
};

const std::vector<Fault>& faults() {
    static const auto failing = [](const char* name, int reason) {
        return Fault{name, [reason](std::size_t number) { return Trouble::atCall(number, reason); }};
    };
    static const std::vector<Fault> all{
        failing("EIO", EIO),
        failing("ENOSPC", ENOSPC),
        failing("EROFS", EROFS),
        failing("EDQUOT", EDQUOT),
        failing("EACCES", EACCES),
        failing("EINTR", EINTR),
        {"a short count", [](std::size_t number) { return Trouble::shortAtCall(number); }},
        {"ENOSPC from then on", [](std::size_t number) { return Trouble::fromCallOn(number, ENOSPC); }},
        {"EIO from then on", [](std::size_t number) { return Trouble::fromCallOn(number, EIO); }},
    };
    return all;
}

std::optional<std::string> contentsOf(const std::string& path) {
    if (!std::filesystem::exists(std::filesystem::symlink_status(path))) return std::nullopt;
    return readFile(path);
}

std::vector<std::string> pathsIn(const std::string& directory, std::string_view ending) {
    std::vector<std::string> paths;
    for (const auto& entry : std::filesystem::directory_iterator(directory))
        if (entry.path().native().ends_with(ending)) paths.push_back(entry.path());
    return paths;
}

// A failed write is 73, with one of these messages as the reason.
bool saysWhyItWasNotWritten(const Outcome& outcome) {
    for (const char* beginning :
         {"Fatal error while ", "All that work and I can't open ", "Could not create file handle to ",
          "Cannot add a new ticket to ", "Cannot delete an existing ticket in ", "Could not write ticket to ",
          "Although we wrote the ticket, ", "Could not remove existing ticket from ",
          "Could not save ticket to "})
        if (outcome.says(beginning)) return true;
    for (const std::string& line : outcome.lines)
        if (line.ends_with(" has changed since it was read. Nothing was written to it.") ||
            line.find(" will not replace the compatibility symlink at ") != std::string::npos)
            return true;
    return false;
}

constexpr const char* kSwapFailed = "Could not replace ";

struct Tally {
    std::size_t points = 0;  // calls of the runs, each failed in every way
    std::size_t runs = 0;
    std::size_t kept = 0;      // the artefact was the old one afterwards
    std::size_t written = 0;   // the new one
    std::size_t appended = 0;  // the old one with a second chain after it
    std::size_t repaired = 0;  // in between, and repaired
};

class WriteFaults : public testing::TestWithParam<const char*> {
  protected:
    // The file system of the artefacts, which determines the way of writing.
    static std::string fileSystem() { return GetParam(); }
    static bool clones() { return fileSystem() == "xfs"; }

    WriteFaults() {
        if (!clones() && volume_.missing()) place_ = fallback_.path();  // /tmp will do, if slower
        if (!scratch_.missing()) temporary_ = scratch_.path();
    }

    std::optional<std::string> missing() const {
        if (clones() && volume_.missing()) return volume_.missing();
        writeFile(place_ + "/probe", std::string_view("probe"));
        const auto manager = files::makeLocalFileManager(plainTypeNaming);
        const auto answer = manager->volumeSupportsCloning(values::URL::fileURLWithPath(place_ + "/probe"));
        std::filesystem::remove(place_ + "/probe");
        if (!answer || *answer != clones()) return "no volume here to write in place on";
        return std::nullopt;
    }

    Tally failEverything(const Subject& subject) {
        Tally tally;
        for (const Job& job : jobsFor(subject)) {
            for (const Fault& fault : faults()) {
                std::size_t number = 0;
                while (failOnce(subject, job, fault, number, tally)) ++number;
                EXPECT_GT(number, 20U);
                if (&fault == &faults().front()) tally.points += number;
                if (HasFailure()) return tally;
            }
        }
        return tally;
    }

  private:
    // False when the run has fewer calls.
    bool failOnce(const Subject& subject, const Job& job, const Fault& fault, std::size_t number,
                  Tally& tally) {
        prepare(subject, job.before);
        Stapling stapling(temporary_);
        Outcome outcome;
        std::string failed;
        {
            const Trouble trouble = fault.at(number);
            outcome = job.after ? stapling.staple(subject.path, *job.after) : stapling.erase(subject.path);
            failed = trouble.failedCall();
        }
        SCOPED_TRACE(values::format("%@ of a %@, %@ at call %lu, %@\n%@", job.name, subject.name, fault.name,
                                    number, failed, testing::PrintToString(outcome)));
        ++tally.runs;
        check(subject, job, outcome, tally);
        if (outcome.status == kExitOK && !outcome.says(kSwapFailed) && failed != "rmdir" &&
            failed != "unlinkat") {
            EXPECT_THAT(pathsIn(place_, ""), Not(Contains(testing::HasSubstr(".pinwell-"))));
        }
        return !failed.empty();
    }

    void prepare(const Subject& subject, const std::optional<Data>& ticket) const {
        if (!subject.isBundle) {
            for (const auto& entry : std::filesystem::directory_iterator(place_)) remove_all(entry.path());
        }
        if (temporary_ != place_)
            for (const auto& entry : std::filesystem::directory_iterator(temporary_))
                remove_all(entry.path());
        std::filesystem::remove_all(subject.file);
        if (const auto contents = subject.contentsWith(ticket)) writeFile(subject.file, *contents);
    }

    void check(const Subject& subject, const Job& job, const Outcome& outcome, Tally& tally) {
        const auto before = subject.contentsWith(job.before);
        const auto after = afterwards(subject, job);
        const auto now = contentsOf(subject.file);
        if (outcome.status == kExitOK) {
            // A failed swap usually leaves the old file, which may have a valid ticket; an unreadable chain
            // stays, and gets another one after it.
            EXPECT_TRUE(now == after || (now == before && outcome.says(kSwapFailed)) ||
                        isAppended(job, before, now));
        } else {
            EXPECT_THAT(outcome.status, AnyOf(kExitDataError, kExitNoInput, kExitNoHost, kExitCannotCreate));
            EXPECT_TRUE(outcome.status != kExitCannotCreate || saysWhyItWasNotWritten(outcome));
            if (job.after && outcome.says("Downloaded ticket has been stored at")) {
                EXPECT_EQ(outcome.lines.back(),
                          values::format("The staple and validate action failed! Error %d.", outcome.status));
            }
        }
        if (now == after) {
            ++tally.written;
        } else if (now == before) {
            ++tally.kept;
        } else if (outcome.status == kExitOK) {
            ++tally.appended;
        } else {
            EXPECT_EQ(outcome.status, kExitCannotCreate);
            repair(subject, job, now);
            ++tally.repaired;
        }
    }

    static bool isAppended(const Job& job, const std::optional<std::string>& before,
                           const std::optional<std::string>& now) {
        if (!job.before || !job.after || !before || !now) return false;
        const auto chain = PackageBuilder().archive({}).terminator().ticket(base::toString(*job.after));
        return *now == *before + chain.build();
    }

    // An unsigned image keeps its only blob.
    static std::optional<std::string> afterwards(const Subject& subject, const Job& job) {
        if (!job.after && subject.name == "unsigned image") return subject.contentsWith(job.before);
        if (subject.afterWith) return subject.afterWith(job.after);
        auto contents = subject.contentsWith(job.after);
        if (!job.after && !subject.isImage && contents) *contents += terminator();
        return contents;
    }
    static std::string terminator() { return {"t8lr\1\0\1\0\0\0\0\0\0\0\0\0", 16}; }

    void repair(const Subject& subject, const Job& job, const std::optional<std::string>& now) {
        if (subject.isBundle) {
            // Known: between the removal of the old ticket and the copy of the new one there is none.
            EXPECT_EQ(now, std::nullopt);
            return;
        }
        EXPECT_FALSE(clones()) << "neither the old file nor the new one";
        ASSERT_TRUE(now.has_value());
        EXPECT_TRUE(now->starts_with(subject.data));
        if (subject.isImage || subject.afterWith) {
            const auto copies = pathsIn(temporary_, subject.isImage ? ".dmgData" : ".pkgTrailers");
            ASSERT_EQ(copies.size(), 1U);
            const ProcessResult restored = runProcess({.executable = RESTORE_ARTEFACT,
                                                       .arguments = {subject.file, copies.front()},
                                                       .environment = {{"PATH", "/usr/bin:/bin"}}});
            EXPECT_EQ(restored.exitStatus, 0) << restored.errors;
            EXPECT_TRUE(readFile(subject.file) == afterwards(subject, job));
            return;
        }
        // A package's tail is only the ticket, which is saved: the same run, once more.
        if (job.after) {
            EXPECT_EQ(readFile(temporary_ + "/REQUEST.ticket"), base::toString(*job.after));
        }
        const Data ticket = job.after.value_or(unsignedTicket({subject.hash}));
        EXPECT_EQ(Stapling(temporary_).staple(subject.path, ticket).status, kExitOK);
        EXPECT_TRUE(readFile(subject.file).starts_with(subject.data));
    }

  private:
    // Volumes whose backing files are in memory: a flush is immediate.
    std::optional<ScopedVariable> inMemory_ =
        std::filesystem::is_directory("/dev/shm")
            ? std::optional<ScopedVariable>(std::in_place, "TMPDIR", "/dev/shm")
            : std::nullopt;

  protected:
    Volume volume_{fileSystem()};
    Volume scratch_{"tmpfs"};
    TemporaryDirectory fallback_;
    TemporaryDirectory temporaryFallback_;
    std::string place_ = volume_.path();
    std::string temporary_ = temporaryFallback_.path();

    void run(const std::function<Subject(const std::string&)>& make) {
        if (const auto reason = missing()) GTEST_SKIP() << *reason;
        const Tally tally = failEverything(make(place_));
        RecordProperty("FaultPoints", std::to_string(tally.points));
        RecordProperty("Runs", std::to_string(tally.runs));
        std::cout << "fault points: " << tally.points << " calls, " << tally.runs
                  << " runs; the artefact was kept in " << tally.kept << ", written in " << tally.written
                  << ", appended to in " << tally.appended << ", put right in " << tally.repaired << "\n";
    }
};

// A bundle's ticket goes to the trash as a file, without a write.
class DeletionFaults : public testing::Test {
  protected:
    struct Deletion {
        bool done = false;
        Outcome outcome;
        std::string failedCall;
    };

    // `pinwell` has no operation for it: the tool's own services, and the bundle's own way to do it.
    Deletion eraseWith(const std::function<Trouble()>& makeTrouble) const {
        const MessageCapture output(kVerbosityVerbose);
        const HostPlatform host([](int) {});
        Deletion deletion;
        {
            const Trouble trouble = makeTrouble();
            const auto file =
                PWHashedFile::initWithFileURL(URL::fileURLWithPath(bundle_.path), host.services());
            const auto bundle = std::dynamic_pointer_cast<PWHashedBundle>(file);
            deletion.done = bundle != nullptr && bundle->_deleteExistingTicket();
            deletion.outcome.status = file == nullptr ? kExitNoInput : file->appropriateExitCode();
            deletion.failedCall = trouble.failedCall();
        }
        deletion.outcome.lines = output.lines();
        return deletion;
    }

    void prepare() const {
        std::filesystem::remove_all(trash());
        writeFile(bundle_.file, ticket_);
    }

    // The bundle's files except its ticket.
    std::map<std::string, std::string> rest() const {
        std::map<std::string, std::string> files;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(bundle_.path))
            files[entry.path()] = entry.is_regular_file() ? readFile(entry.path()) : std::string();
        files.erase(bundle_.file);
        return files;
    }

    /// Whether it is in the bundle; otherwise it is in the trash.
    bool isKeptWhole() const {
        EXPECT_EQ(rest(), rest_);
        const auto now = contentsOf(bundle_.file);
        EXPECT_EQ(now.value_or(ticket_), ticket_);
        std::vector<std::string> trashed;
        if (std::filesystem::exists(trash() + "/files")) trashed = pathsIn(trash() + "/files", "");
        EXPECT_EQ(trashed.size(), now ? 0U : 1U);
        for (const std::string& path : trashed) EXPECT_EQ(readFile(path), ticket_);
        return now.has_value();
    }

    static std::string trash() { return home() / "data/Trash"; }

    static constexpr const char* kTrashed = "Successfully moved ticket to trash. Find it at file://";
    static constexpr const char* kNotTrashed = "Could not delete ticket file://";

  private:
    // The trash's library reads its directories once in a process.
    static const TemporaryDirectory& home() {
        static const TemporaryDirectory directory;
        return directory;
    }

    ScopedVariable homeVariable_{"HOME", home().path()};
    ScopedVariable dataVariable_{"XDG_DATA_HOME", home() / "data"};
    TemporaryDirectory directory_;

  protected:
    const Subject bundle_ = bundleIn(directory_.path());
    const std::string ticket_ = base::toString(unsignedTicket({bundle_.hash}));
    const std::map<std::string, std::string> rest_ = rest();
};

TEST_F(DeletionFaults, LeaveABundlesTicketWholeInItsPlaceOrInTheTrash) {
    for (const Fault& fault : faults()) {
        std::size_t number = 0;
        for (std::string failed = "first"; !failed.empty(); ++number) {
            prepare();
            const Deletion deletion = eraseWith([&] { return fault.at(number); });
            const Outcome& outcome = deletion.outcome;
            failed = deletion.failedCall;
            SCOPED_TRACE(values::format("%@ at call %lu, %@\n%@", fault.name, number, failed,
                                        testing::PrintToString(outcome)));
            if (isKeptWhole()) {
                EXPECT_FALSE(deletion.done);
                EXPECT_TRUE(outcome.status == kExitNoInput || outcome.says(kNotTrashed));
            } else {
                // The call for its new place comes after the move.
                EXPECT_TRUE(deletion.done || failed == "readlink");
                EXPECT_TRUE(outcome.says(deletion.done ? kTrashed : kNotTrashed));
            }
            EXPECT_THAT(outcome.status, AnyOf(kExitOK, kExitNoInput));
            EXPECT_TRUE(deletion.done || !failed.empty());
            ASSERT_FALSE(HasFailure());
        }
        EXPECT_GT(number, 5U);
    }
}

TEST_F(DeletionFaults, ThatAreTheTrashsOwnLeaveABundlesTicketInItsPlace) {
    prepare();
    writeFile(trash(), std::string_view("no directory"));
    const Deletion deletion = eraseWith(&Trouble::none);
    EXPECT_FALSE(deletion.done);
    EXPECT_EQ(deletion.outcome.status, kExitOK);
    EXPECT_TRUE(deletion.outcome.says(kNotTrashed));
    EXPECT_EQ(readFile(bundle_.file), ticket_);
    EXPECT_EQ(rest(), rest_);
}

const Data& sampleData() {
    static const Data data = irregularData(10'000);
    return data;
}

TEST_P(WriteFaults, LeaveABundlesTicketWholeOrNone) {
    run(bundleIn);
}

TEST_P(WriteFaults, LoseNoSignedImage) {
    run([](const std::string& place) {
        return fileIn(place, signedImage(sampleData()), "signed image", sampleData());
    });
}

TEST_P(WriteFaults, LoseNoUnsignedImage) {
    run([](const std::string& place) {
        return fileIn(place, unsignedImage(sampleData()), "unsigned image", sampleData());
    });
}

TEST_P(WriteFaults, LoseNoPackage) {
    run([](const std::string& place) { return fileIn(place, signedPackage(sampleData()), "package", {}); });
}

// Trailers after the old ticket are moved before the new one.
TEST_P(WriteFaults, LoseNoTrailersOfAPackage) {
    run([](const std::string& place) {
        const std::string archive = signedPackage(sampleData()).contents;
        const auto withChain = [archive](PackageBuilder chain) {
            return archive + chain.archive({}).build();
        };
        Subject package = fileIn(place, signedPackage(sampleData()), "package with trailers", {});
        package.contentsWith = [=](const std::optional<Data>& ticket) {
            return withChain(PackageBuilder().terminator().ticket(base::toString(*ticket)).unknown("KEPT"));
        };
        package.afterWith = [=](const std::optional<Data>& ticket) {
            PackageBuilder chain = PackageBuilder().terminator().unknown("KEPT");
            return withChain(ticket ? chain.ticket(base::toString(*ticket)) : chain);
        };
        return package;
    });
}

INSTANTIATE_TEST_SUITE_P(OnVolumes, WriteFaults, testing::Values("tmpfs", "xfs"), [](const auto& volume) {
    return std::string(volume.param) == "xfs" ? "ByClone" : "InPlace";
});

}  // namespace
}  // namespace pinwell::test
