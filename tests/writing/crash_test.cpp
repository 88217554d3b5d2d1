// The real tool, ended at each system call that may change the artefact's volume, on file systems with and
// without clones. The network is real as well: the scripted server of this process, over TLS. Afterwards the
// artefact is the old or the new one; or its data are unchanged, and the files on the disk are enough to
// repair it.
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
#include "support/environment.h"
#include "support/package_builder.h"
#include "support/volume.h"
#include "system_call_trace.h"
#include "values/format.h"

namespace pinwell::test {
namespace {

using testing::AnyOf;

// Volumes whose backing files are in memory: a flush is immediate.
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

    struct Scene {
        std::string path;  // the artefact's
        Data ticket;       // the new ticket
        /// Restores the state before a run.
        std::function<void()> prepare;
        /// The bytes on the disk where the ticket goes; `nullopt` if there is no file.
        std::function<std::optional<std::string>()> look;
        std::string after;
        /// Repairs an artefact that is neither the old nor the new one.
        std::function<void()> repair;
    };

    void interruptEverywhere(const Scene& scene, int signal) {
        const TracedCalls calls{.directory = volume_.path(),
                                .changesOnly = std::getenv("PINWELL_EVERY_CALL") == nullptr};
        Tally tally;
        for (std::size_t number = 0;; ++number) {
            if (number % kRunsPerServer == 0) serveAfresh(scene.ticket);
            empty(volume_ / "tmp");
            scene.prepare();
            const auto before = scene.look();
            const TracedRun run =
                interruptRun(command({"staple", scene.path}), calls, number, sending(signal));
            if (!run.interruptedAt) {
                EXPECT_EQ(run.exitStatus, 0);
                EXPECT_TRUE(scene.look() == scene.after);
                break;
            }
            SCOPED_TRACE(values::format("at call %lu, %@", number, *run.interruptedAt));
            EXPECT_EQ(run.signal, signal);
            ++tally.points;
            tally.calls.insert(*run.interruptedAt);
            const auto now = scene.look();
            if (now == scene.after) {
                ++tally.written;
            } else if (now == before) {
                ++tally.kept;
            } else {
                EXPECT_EQ(signal, SIGKILL) << "a signal that can wait has not waited";
                EXPECT_FALSE(clones() && scene.path.ends_with(".dmg"))
                    << "neither the old file nor the new one";
                scene.repair();
                ++tally.repaired;
            }
            EXPECT_EQ(pinwell({"staple", scene.path}).exitStatus, 0);
            if (scene.look() != scene.after) {
                EXPECT_TRUE(scene.path.ends_with(".pkg")) << "whose chains may stand behind remains";
                EXPECT_EQ(pinwell({"validate", scene.path}).exitStatus, 0);
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
        // One without a ticket, and one with a longer one.
        for (const std::string& before : {artefact.contents, artefact.stapledWith(older)}) {
            interruptEverywhere(
                {.path = artefact.path,
                 .ticket = ticket,
                 .prepare =
                     [&] {
                         clear();
                         writeFile(artefact.path, before);
                     },
                 .look = [&]() -> std::optional<std::string> { return readFile(artefact.path); },
                 .after = artefact.stapledWith(ticket),
                 .repair = [&] { repair(artefact); }},
                signal);
            if (HasFailure()) return;
        }
    }

    void interruptStapleOfBundle(int signal) {
        if (const auto reason = missing()) GTEST_SKIP() << *reason;
        const std::string moved = volume_ / "Sample.app";
        std::filesystem::copy(bundle, moved, std::filesystem::copy_options::recursive);
        bundle = moved;
        const Data fresh = ticket();
        for (const bool wasStapled : {false, true}) {
            interruptEverywhere({.path = bundle,
                                 .ticket = fresh,
                                 .prepare =
                                     [&] {
                                         std::filesystem::remove(ticketPath());
                                         if (wasStapled) stapleByHand(ticketForOthers());
                                     },
                                 .look = [&]() -> std::optional<std::string> {
                                     if (const auto now = stapled()) return base::toString(*now);
                                     return std::nullopt;
                                 },
                                 .after = base::toString(fresh),
                                 .repair = [] {}},
                                signal);
            if (HasFailure()) return;
        }
    }

    // A server takes a limited number of connections.
    static constexpr std::size_t kRunsPerServer = 50;

    void serveAfresh(const Data& ticket) {
        service();
        startService(identityOf(serverChain));
        serveTicket(ticket);
    }

    void repair(const Artefact& artefact) {
        const std::string now = readFile(artefact.path);
        if (artefact.name.ends_with(".pkg")) {
            EXPECT_TRUE(now.starts_with(artefact.contents));
            return;  // the next staple appends a new chain after any bytes
        }
        EXPECT_TRUE(now.starts_with(base::toString(irregularData(100'000))));
        restore(artefact.path, ".dmgData");
    }

    void restore(const std::string& path, std::string_view extension) {
        std::vector<std::string> copies;
        for (const auto& entry : std::filesystem::directory_iterator(volume_ / "tmp"))
            if (entry.path().extension() == extension) copies.push_back(entry.path());
        ASSERT_EQ(copies.size(), 1U);
        const ProcessResult restored = runProcess({.executable = RESTORE_ARTEFACT,
                                                   .arguments = {path, copies.front()},
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

// Trailers after the old ticket are moved before the new one.
TEST_P(Crash, LosesNoTrailersOfAPackage) {
    if (const auto reason = missing()) GTEST_SKIP() << *reason;
    const Artefact package = writeArtefact(signedPackage(), volume_ / "Sample.pkg");
    const auto withChain = [&](PackageBuilder chain) { return package.contents + chain.archive({}).build(); };
    const std::string older = base::toString(sealed(package.payload().entry(2, hashOf(1))));
    const Data ticket = sealed(package.payload());
    const std::string before = withChain(PackageBuilder().terminator().ticket(older).unknown("KEPT"));
    const std::string after =
        withChain(PackageBuilder().terminator().unknown("KEPT").ticket(base::toString(ticket)));
    interruptEverywhere({.path = package.path,
                         .ticket = ticket,
                         .prepare =
                             [&] {
                                 clear();
                                 writeFile(package.path, before);
                             },
                         .look = [&]() -> std::optional<std::string> { return readFile(package.path); },
                         .after = after,
                         .repair =
                             [&] {
                                 EXPECT_TRUE(readFile(package.path).starts_with(package.contents));
                                 restore(package.path, ".pkgTrailers");
                                 EXPECT_TRUE(readFile(package.path) == after);
                             }},
                        SIGKILL);
}

TEST_P(Crash, LeavesABundleThatCanBeStapledAgain) {
    interruptStapleOfBundle(SIGKILL);
}

TEST_P(Crash, OfASignalThatCanWaitComesAfterTheImageIsWritten) {
    interruptStapleOf(signedImage(), SIGTERM);
}

TEST_P(Crash, OfASignalThatCanWaitComesAfterThePackageIsWritten) {
    interruptStapleOf(signedPackage(), SIGINT);
}

TEST_P(Crash, OfASignalThatCanWaitComesAfterTheBundlesTicketIsWritten) {
    interruptStapleOfBundle(SIGHUP);
}

// Not the tool is interrupted, but its file changed under it.
class ChangedWhileRead : public Crash {
  protected:
    using Change = std::function<void(const std::string& path)>;

    // The change was made to the file before it was read, or after it was written.
    void expectOneAfterTheOther(const Artefact& artefact, const Data& ticket, const Change& change) {
        const std::string now = readFile(artefact.path);
        const std::string stapled = artefact.stapledWith(ticket);
        const std::string tail = stapled.substr(std::min(artefact.contents.size(), stapled.size()));
        const auto changed = [&](const std::string& contents) {
            writeFile(artefact.path, contents);
            change(artefact.path);
            return readFile(artefact.path);
        };
        EXPECT_TRUE(now == stapled || now == changed(stapled) ||
                    (artefact.name.ends_with(".pkg") && now == changed(artefact.contents) + tail));
    }

    void changeEverywhere(const Change& change) {
        if (const auto reason = missing()) GTEST_SKIP() << *reason;
        const TracedCalls calls{.directory = volume_.path(), .changesOnly = false};
        const std::size_t step = std::getenv("PINWELL_EVERY_CALL") == nullptr ? 7 : 1;
        for (const Artefact& made : {unsignedImage(), signedImage(), signedPackage()}) {
            const Artefact artefact = writeArtefact(made, volume_ / made.name);
            const Data ticket = sealed(artefact.payload());
            std::size_t changes = 0;
            for (std::size_t number = 0;; number += step) {
                if (changes % kRunsPerServer == 0) serveAfresh(ticket);
                empty(volume_ / "tmp");
                clear();
                writeFile(artefact.path, artefact.contents);
                const TracedRun run = interruptRun(command({"staple", artefact.path}), calls, number,
                                                   [&](int, int) { change(artefact.path); });
                if (!run.interruptedAt) break;
                ++changes;
                SCOPED_TRACE(values::format("%@ at call %lu, %@", made.name, number, *run.interruptedAt));
                ASSERT_TRUE(run.exitStatus.has_value());
                EXPECT_THAT(*run.exitStatus, AnyOf(0, 65, 66, 73));
                if (*run.exitStatus == 0) expectOneAfterTheOther(artefact, ticket, change);
            }
            EXPECT_GT(changes, 10U);
            std::cout << made.name << ": changed at " << changes << " calls\n";
        }
    }
};

TEST_P(ChangedWhileRead, AFileThatIsCutShortIsNotWritten) {
    changeEverywhere([](const std::string& path) {
        std::filesystem::resize_file(path, std::filesystem::file_size(path) / 2);
    });
}

TEST_P(ChangedWhileRead, AFileThatGrowsIsNotWritten) {
    changeEverywhere([](const std::string& path) {
        std::filesystem::resize_file(path, std::filesystem::file_size(path) + 5000);
    });
}

// The write in place does not check again: a change between the check and the write is not noticed.
INSTANTIATE_TEST_SUITE_P(ByClone, ChangedWhileRead, testing::Values("xfs"),
                         [](const auto& volume) { return std::string(volume.param); });

INSTANTIATE_TEST_SUITE_P(OnVolumes, Crash, testing::Values("xfs", "btrfs", "ext4"),
                         [](const auto& volume) { return std::string(volume.param); });

}  // namespace
}  // namespace pinwell::test
