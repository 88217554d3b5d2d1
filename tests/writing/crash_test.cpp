// The real tool, ended at each system call with which it may change something on the artefact's volume, on
// file systems that clone and on one that does not. The network is real as well: the scripted server of this
// process, over TLS. Afterwards the artefact is the old one or the new one; or its data are as they were, and
// it can be put right with what lies on the disk.
//
// With PINWELL_EVERY_CALL in the environment, a run is ended at its reading calls too.
#include <gmock/gmock.h>

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <iostream>
#include <set>

#include "e2e/artefacts.h"
#include "e2e/fixture.h"
#include "foundation/format.h"
#include "support/environment.h"
#include "support/volume.h"
#include "system_call_trace.h"

namespace pinwell::test {
namespace {

// Volumes whose backing files are in memory: what is flushed is flushed at once.
class InMemory {
  private:
    std::optional<ScopedVariable> temporary_ =
        std::filesystem::is_directory("/dev/shm")
            ? std::optional<ScopedVariable>(std::in_place, "TMPDIR", "/dev/shm")
            : std::nullopt;
};

struct Tally {
    std::size_t points = 0;
    std::size_t kept = 0;
    std::size_t written = 0;
    std::size_t repaired = 0;
    std::set<std::string> calls;
};

class Crash : InMemory, public EndToEndTest, public testing::WithParamInterface<const char*> {
  protected:
    Crash() : volume_(GetParam()) {
        if (volume_.missing()) return;
        std::filesystem::create_directory(volume_ / "tmp");
        environment["TMPDIR"] = volume_ / "tmp";
    }

    static bool clones() { return std::string_view(GetParam()) != "ext4"; }

    std::optional<std::string> missing() const {
        return volume_.missing() ? volume_.missing() : tracingMissing();
    }

    /// Puts everything as it was before a run.
    using Preparation = std::function<void()>;
    /// What is on the disk where the artefact is; nothing when there is no file.
    using Look = std::function<std::optional<std::string>()>;
    /// Puts right what is neither the old one nor the new one.
    using Repair = std::function<void()>;

    void interruptEverywhere(const std::string& path, const Preparation& prepare, const Look& look,
                             const std::optional<std::string>& after, const Repair& repair, int signal) {
        const TracedCalls calls{.directory = volume_.path(),
                                .changesOnly = std::getenv("PINWELL_EVERY_CALL") == nullptr};
        Tally tally;
        for (std::size_t number = 0;; ++number) {
            empty(volume_ / "tmp");
            prepare();
            const auto before = look();
            const TracedRun run = interruptRun(command({"staple", path}), calls, number, signal);
            if (!run.interruptedAt) {
                EXPECT_EQ(run.exitStatus, 0);
                EXPECT_TRUE(look() == after);
                break;
            }
            SCOPED_TRACE(foundation::format("at call %lu, %@", number, *run.interruptedAt));
            EXPECT_EQ(run.signal, signal);
            ++tally.points;
            tally.calls.insert(*run.interruptedAt);
            const auto now = look();
            if (now == after) {
                ++tally.written;
            } else if (now == before) {
                ++tally.kept;
            } else {
                EXPECT_EQ(signal, SIGKILL) << "a signal that can wait has not waited";
                EXPECT_FALSE(clones() && path.ends_with(".dmg")) << "neither the old file nor the new one";
                repair();
                ++tally.repaired;
            }
            EXPECT_EQ(pinwell({"staple", path}).exitStatus, 0);
            EXPECT_TRUE(look() == after || path.ends_with(".pkg"));
            if (look() != after) {
                EXPECT_EQ(pinwell({"validate", path}).exitStatus, 0);
            }
            if (HasFailure()) break;
        }
        EXPECT_GT(tally.points, 8U);
        RecordProperty("CrashPoints", std::to_string(tally.points));
        std::cout << "crash points: " << tally.points << "; the artefact was kept in " << tally.kept
                  << ", written in " << tally.written << ", put right in " << tally.repaired << " ("
                  << testing::PrintToString(tally.calls) << ")\n";
    }

    void interruptStapleOf(const Artefact& made, int signal = SIGKILL) {
        if (const auto reason = missing()) GTEST_SKIP() << *reason;
        const Artefact artefact = writeArtefact(made, volume_ / made.name);
        const Data ticket = sealed(artefact.payload());
        const Data older = sealed(artefact.payload().entry(2, hashOf(1)).entry(2, hashOf(2)));
        serveTicket(ticket);
        // One without a ticket, and one with a longer one.
        for (const std::string& before : {artefact.contents, artefact.stapledWith(older)}) {
            interruptEverywhere(
                artefact.path,
                [&] {
                    clear();
                    writeFile(artefact.path, before);
                },
                [&]() -> std::optional<std::string> { return readFile(artefact.path); },
                artefact.stapledWith(ticket), [&] { repair(artefact); }, signal);
            if (HasFailure()) return;
        }
    }

    void repair(const Artefact& artefact) {
        const std::string now = readFile(artefact.path);
        if (artefact.name.ends_with(".pkg")) {
            EXPECT_TRUE(now.starts_with(artefact.contents));
            return;  // the next staple puts a chain of its own behind whatever is there
        }
        EXPECT_TRUE(now.starts_with(foundation::toString(irregularData(100'000))));
        std::vector<std::string> copies;
        for (const auto& entry : std::filesystem::directory_iterator(volume_ / "tmp"))
            if (entry.path().extension() == ".dmgData") copies.push_back(entry.path());
        ASSERT_EQ(copies.size(), 1U);
        const ProcessResult restored = runProcess({.executable = RESTORE_IMAGE,
                                                   .arguments = {artefact.path, copies.front()},
                                                   .environment = {{"PATH", "/usr/bin:/bin"}}});
        EXPECT_EQ(restored.exitStatus, 0) << restored.errors;
    }

    void clear() {
        for (const auto& entry : std::filesystem::directory_iterator(volume_.path()))
            if (entry.path().filename().native().starts_with(".pinwell-")) remove_all(entry.path());
    }
    static void empty(const std::string& directory) {
        for (const auto& entry : std::filesystem::directory_iterator(directory)) remove_all(entry.path());
    }

    Volume volume_;
};

TEST_P(Crash, LosesNoSignedImage) {
    interruptStapleOf(signedImage());
}

TEST_P(Crash, LosesNoUnsignedImage) {
    interruptStapleOf(unsignedImage());
}

TEST_P(Crash, LosesNoPackage) {
    interruptStapleOf(signedPackage());
}

TEST_P(Crash, LeavesABundleThatCanBeStapledAgain) {
    if (const auto reason = missing()) GTEST_SKIP() << *reason;
    const std::string moved = volume_ / "Sample.app";
    std::filesystem::copy(bundle, moved, std::filesystem::copy_options::recursive);
    bundle = moved;
    const Data fresh = ticket();
    serveTicket(fresh);
    for (const bool wasStapled : {false, true}) {
        interruptEverywhere(
            bundle,
            [&] {
                std::filesystem::remove(ticketPath());
                if (wasStapled) stapleByHand(ticketForOthers());
            },
            [&]() -> std::optional<std::string> {
                if (const auto now = stapled()) return foundation::toString(*now);
                return std::nullopt;
            },
            foundation::toString(fresh), [] {}, SIGKILL);
        if (HasFailure()) return;
    }
}

TEST_P(Crash, OfASignalThatCanWaitComesAfterTheImageIsWritten) {
    interruptStapleOf(signedImage(), SIGTERM);
}

TEST_P(Crash, OfASignalThatCanWaitComesAfterThePackageIsWritten) {
    interruptStapleOf(signedPackage(), SIGINT);
}

INSTANTIATE_TEST_SUITE_P(OnVolumes, Crash, testing::Values("xfs", "btrfs", "ext4"),
                         [](const auto& volume) { return std::string(volume.param); });

}  // namespace
}  // namespace pinwell::test
