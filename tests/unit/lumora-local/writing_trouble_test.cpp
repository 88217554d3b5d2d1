// Whichever call fails: the file is complete or missing, and no incomplete file prevents the next try.
#include <gmock/gmock.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <set>
#include <string>

#include "fixed_now.h"
#include "kept_rsa_keys.h"
#include "lumora-local/failure.h"
#include "lumora-local/file_writing.h"
#include "lumora-local/samples.h"
#include "support/failing_calls.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::TemporaryDirectory;
using pinwell::test::Trouble;
using testing::IsSupersetOf;

// At least these calls make a new file, and each of them fails once.
const struct {
    std::set<std::string> tried{"open", "write", "fsync"};
    std::set<std::string> storing{"write", "fsync"};  // on a volume without room
} kCallsOfANewFile;

std::set<std::string> namesIn(const std::string& directory) {
    std::set<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(directory))
        names.insert(entry.path().filename().string());
    return names;
}

using MakeTrouble = std::function<Trouble(std::size_t number)>;

/// Writes once for every call that can fail, each time into a new directory. Returns the names of those
/// calls.
std::set<std::string> failEachCall(const MakeTrouble& makeTrouble,
                                   const std::function<void(const std::string& directory)>& write,
                                   const std::set<std::string>& wanted) {
    std::set<std::string> calls;
    for (std::size_t number = 0;; ++number) {
        const TemporaryDirectory directory;
        bool failed = false;
        std::string call;
        {
            const Trouble trouble = makeTrouble(number);
            try {
                write(directory.path());
            } catch (const Failure&) {
                failed = true;
            }
            call = trouble.failedCall();
        }
        const auto names = namesIn(directory.path());
        EXPECT_EQ(names, failed ? std::set<std::string>{} : wanted)
            << "after call " << number << ", " << call;
        if (call.empty()) {
            EXPECT_FALSE(failed) << "failed without a cause";
            return calls;
        }
        calls.insert(call);
    }
}

void writeAllSamples(const std::string& directory) {
    writeSamples(directory, kNow);
}
const std::set<std::string> kAllSamples{"Sample.app", "Sample.dmg", "Sample.pkg", "Unsigned.dmg"};

TEST(Samples, AreAllWrittenOrNoneForEveryFailingCall) {
    const KeptRsaKeys keys;
    EXPECT_THAT(failEachCall([](std::size_t number) { return Trouble::atCall(number, EIO); }, writeAllSamples,
                             kAllSamples),
                IsSupersetOf(kCallsOfANewFile.tried));
}

TEST(Samples, AreWrittenThroughInterruptions) {
    const TemporaryDirectory directory;
    {
        const Trouble trouble = Trouble::interruptions();
        writeAllSamples(directory.path());
    }
    EXPECT_EQ(namesIn(directory.path()), kAllSamples);
}

TEST(NewFile, IsRemovedIfTheWriteFails) {
    const auto write = [](const std::string& directory) {
        writeNewFile(directory + "/file", base::toData("contents"), 0600);
    };
    EXPECT_THAT(
        failEachCall([](std::size_t number) { return Trouble::fromCallOn(number, ENOSPC); }, write, {"file"}),
        IsSupersetOf(kCallsOfANewFile.storing));
}

TEST(NewFile, KeepsAnExistingFile) {
    const TemporaryDirectory directory;
    pinwell::test::writeFile(directory / "file", "mine");
    EXPECT_THROW(writeNewFile(directory / "file", base::toData("contents"), 0600), Failure);
    EXPECT_EQ(pinwell::test::readFile(directory / "file"), "mine");
}

TEST(PendingDirectory, IsRemovedIfItCannotBePublished) {
    const auto write = [](const std::string& directory) {
        PendingDirectory pending(directory + "/new", 0700);
        writeNewFile(pending.path() + "/file", base::toData("contents"), 0600);
        pending.publish();
    };
    EXPECT_THAT(failEachCall([](std::size_t number) { return Trouble::atCall(number, EIO); }, write, {"new"}),
                IsSupersetOf(kCallsOfANewFile.tried));
}

}  // namespace
}  // namespace pinwell::lumora
