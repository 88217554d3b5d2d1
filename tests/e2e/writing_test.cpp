// Artefacts that other processes change at the same time.
#include <fcntl.h>
#include <sys/file.h>

#include <filesystem>
#include <functional>
#include <memory>
#include <vector>

#include "artefacts.h"
#include "base/handle.h"
#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;

class SharedArtefact : public EndToEndTest, public testing::WithParamInterface<Artefact (*)(const Data&)> {
  protected:
    SharedArtefact() { serveTicket(ticket); }

    /// Changes the file during the lookup.
    void whileTheServiceIsAsked(std::function<void()> change) {
        service().setHandler([this, change = std::move(change)](const RecordedRequest&) {
            change();
            return answer(inlineRecord(ticket));
        });
    }
    void expectRefused() {
        EXPECT_THAT(pinwell({"staple", artefact.path}),
                    Ended(73, ElementsAre("Processing: " + artefact.path,
                                          artefact.path +
                                              " has changed since it was read. Nothing was written to it.",
                                          stapleFailed(73))));
        serveNoMore();
    }

    Artefact artefact = [this] {
        Artefact made = GetParam()(irregularData(100'000));
        return writeArtefact(made, directory / ("builds/" + made.name));
    }();
    const Data ticket = sealed(artefact.payload());
};

TEST_P(SharedArtefact, ThatGrowsBetweenReadingAndWritingIsNotWritten) {
    const std::string changed = artefact.contents + "more";
    whileTheServiceIsAsked([&] { writeFile(artefact.path, changed); });
    expectRefused();
    EXPECT_EQ(readFile(artefact.path), changed);
}

TEST_P(SharedArtefact, ThatIsReplacedBetweenReadingAndWritingIsNotWritten) {
    whileTheServiceIsAsked([&] {
        writeFile(artefact.path + ".new", artefact.contents);
        std::filesystem::rename(artefact.path + ".new", artefact.path);
    });
    expectRefused();
    EXPECT_EQ(readFile(artefact.path), artefact.contents);
}

TEST_P(SharedArtefact, ThatIsGoneBeforeItIsWrittenIsNotMadeAnew) {
    whileTheServiceIsAsked([&] { std::filesystem::remove(artefact.path); });
    expectRefused();
    EXPECT_FALSE(std::filesystem::exists(artefact.path));
}

TEST_P(SharedArtefact, IsStapledByOneAfterTheOther) {
    std::vector<std::unique_ptr<RunningProcess>> staples;
    for (int i = 0; i < 4; ++i)
        staples.push_back(std::make_unique<RunningProcess>(command({"staple", artefact.path})));
    const std::string processing = "Processing: " + artefact.path;
    for (const auto& staple : staples)
        EXPECT_THAT(staple->wait(), Ended(0, ElementsAre(processing, processing, kWorked)));
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
}

TEST_P(SharedArtefact, ThatAnotherHasLockedIsStapledWhenItIsFree) {
    base::FileDescriptor locked(open(artefact.path.c_str(), O_RDONLY | O_CLOEXEC));
    ASSERT_EQ(flock(locked.get(), LOCK_EX), 0);
    RunningProcess staple(command({"staple", artefact.path}));
    // A reader does not wait.
    EXPECT_EQ(pinwell({"validate", artefact.path}).exitStatus, 65);
    EXPECT_EQ(staple.resultSoFar().output, "");
    locked.reset();
    EXPECT_EQ(staple.wait().exitStatus, 0);
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, SharedArtefact,
                         testing::Values(&signedImage, &unsignedImage, &signedPackage),
                         [](const auto& kind) { return kind.param({}).kind(); });

class SharedBundle : public EndToEndTest {};

TEST_F(SharedBundle, IsStapledByOneAfterTheOther) {
    const Data served = ticket();
    serveTicket(served);
    std::vector<std::unique_ptr<RunningProcess>> staples;
    for (int i = 0; i < 4; ++i)
        staples.push_back(std::make_unique<RunningProcess>(command({"staple", bundle})));
    for (const auto& staple : staples) EXPECT_EQ(staple->wait().exitStatus, 0);
    EXPECT_EQ(stapled(), served);
}

}  // namespace
}  // namespace pinwell::test
