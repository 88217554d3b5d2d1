// The everyday run over each kind of file.
#include "artefacts.h"

#include "fixture.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::EndsWith;
using testing::IsEmpty;

constexpr std::size_t kDataSize = 100'000;

class FileArtefact : public EndToEndTest, public testing::WithParamInterface<Artefact (*)(const Data&)> {
  protected:
    Artefact artefact = [this] {
        Artefact made = GetParam()(irregularData(kDataSize));
        return writeArtefact(made, directory / ("work/" + made.name));
    }();
};

TEST_P(FileArtefact, IsStapledAndValidated) {
    const Data ticket = sealed(artefact.payload());
    serveTicket(ticket);
    const std::string processing = "Processing: " + artefact.path;
    EXPECT_THAT(pinwell({"staple", artefact.path}),
                Ended(0, ElementsAre(processing, processing, "The staple and validate action worked!")));
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
    EXPECT_THAT(pinwell({"validate", artefact.path}),
                Ended(0, ElementsAre(processing, "The validate action worked!")));
}

TEST_P(FileArtefact, StapledByHandIsValid) {
    const Data ticket = sealed(artefact.payload());
    serveTicket(ticket);
    writeFile(artefact.path, artefact.stapledWith(ticket));
    EXPECT_THAT(pinwell({"validate", artefact.path}),
                Ended(0, ElementsAre("Processing: " + artefact.path, "The validate action worked!")));
}

TEST_P(FileArtefact, LeavesTheTicketAmongTheTemporaryFilesAndWhatAnImageCanBeRepairedWith) {
    serveTicket(sealed(artefact.payload()));
    ASSERT_EQ(pinwell({"staple", artefact.path}).exitStatus, 0);
    std::vector<std::string> left = temporaryFiles();
    ASSERT_THAT(left, Contains("REQUEST.ticket"));
    std::erase(left, "REQUEST.ticket");
    if (artefact.name == "Signed.pkg") {
        EXPECT_THAT(left, IsEmpty());
        return;
    }
    ASSERT_THAT(left, ElementsAre(EndsWith(".dmgData")));
    EXPECT_EQ(readFile(temporaryPath(left.front())), readFile(artefact.path).substr(kDataSize));
    EXPECT_EQ(permissionsOf(temporaryPath(left.front())), 0600U);
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, FileArtefact,
                         testing::Values(&signedImage, &unsignedImage, &signedPackage), [](const auto& kind) {
                             const std::string name = kind.param({}).name;  // "Signed.dmg"
                             return name.substr(0, name.find('.')) +
                                    (name.ends_with("dmg") ? "Image" : "Package");
                         });

}  // namespace
}  // namespace pinwell::test
