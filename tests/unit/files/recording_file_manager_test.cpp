// Tests the fake that other tests use: it must record every call, fail on demand, and pass on all other
// calls.
#include "fixture.h"
#include "support/fake_file_manager.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using files::FileManager;
using testing::ElementsAre;
using testing::IsEmpty;

class Recording : public FilesTest {
  protected:
    Recording() { writeFile(path("file"), "contents"); }

    RecordingFileManager recording;
};

TEST_F(Recording, KeepsTheOrder) {
    ASSERT_THAT(recording.copyItem(url("file"), url("copy")), Succeeds());
    ASSERT_THAT(recording.replaceItem(url("file"), url("copy")), Succeeds());
    ASSERT_THAT(recording.removeItem(url("file")), Succeeds());
    EXPECT_THAT(recording.operations(), ElementsAre(FileOperation{"copyItem", path("file"), path("copy")},
                                                    FileOperation{"replaceItem", path("file"), path("copy")},
                                                    FileOperation{"removeItem", path("file"), ""}));
    EXPECT_FALSE(exists(path("file")));
}

TEST_F(Recording, ShowsThatNothingWasWritten) {
    ASSERT_THAT(recording.resourceProperties(url("file")), Succeeds());
    ASSERT_THAT(recording.isRegularFile(url("file")), Succeeds());
    ASSERT_THAT(recording.contentsOfFile(url("file")), Succeeds());
    const auto handle = recording.openForReading(url("file"));
    ASSERT_THAT(handle, Succeeds());
    EXPECT_EQ((*handle)->size(), 8U);
    EXPECT_EQ((*handle)->readUpTo(0, 1).size(), 1U);
    (*handle)->seekToEnd();
    (*handle)->seek(0);
    EXPECT_THAT(recording.changes(), IsEmpty());
    EXPECT_THAT(recording.names(),
                ElementsAre("resourceProperties", "isRegularFile", "contentsOfFile", "openForReading",
                            "handle.size", "handle.read", "handle.seekToEnd", "handle.seek"));
}

TEST_F(Recording, ShowsTheWrittenBytes) {
    ASSERT_THAT(recording.writeFile(asBytes("x"), url("new"), FileManager::Writing::plain), Succeeds());
    const auto handle = recording.openForUpdating(url("file"));
    ASSERT_THAT(handle, Succeeds());
    (*handle)->write(asBytes("C"));
    (*handle)->truncate(3);
    (*handle)->close();
    EXPECT_THAT(recording.changes(), ElementsAre(FileOperation{"writeFile", path("new"), ""},
                                                 FileOperation{"handle.write", path("file"), ""},
                                                 FileOperation{"handle.truncate", path("file"), ""}));
    EXPECT_EQ(readFile(path("file")), "Con");
}

TEST_F(Recording, FailsTheNamedOperationAndDoesNothing) {
    recording.fail("copyItem", ENOSPC);
    EXPECT_THAT(recording.copyItem(url("file"), url("copy")), FailsWith(ENOSPC, path("file")));
    EXPECT_FALSE(exists(path("copy")));
    recording.fail("copyItem", 0);
    EXPECT_THAT(recording.copyItem(url("file"), url("copy")), Succeeds());
}

TEST_F(Recording, FailsTheOperationOfThatNumber) {
    recording.failOperation(1, EIO);
    EXPECT_THAT(recording.isRegularFile(url("file")), Succeeds());
    EXPECT_THAT(recording.isRegularFile(url("file")), FailsWith(EIO, path("file")));
    EXPECT_THAT(recording.isRegularFile(url("file")), Succeeds());
}

TEST_F(Recording, FailsAHandlesOperationAsAHandleDoes) {
    recording.fail("handle.write", ENOSPC);
    const auto handle = recording.openForUpdating(url("file"));
    ASSERT_THAT(handle, Succeeds());
    EXPECT_THROW((*handle)->write(asBytes("x")), base::FileFailure);
    EXPECT_EQ(readFile(path("file")), "contents");
}

TEST_F(Recording, ReportsCloningAsConfigured) {
    for (const bool answer : {true, false}) {
        recording.answerCloning(answer);
        const auto answered = recording.volumeSupportsCloning(url("file"));
        ASSERT_THAT(answered, Succeeds());
        EXPECT_EQ(*answered, answer);
    }
}

TEST_F(Recording, TrashesIntoADirectoryOfItsOwn) {
    const auto first = recording.trashItem(url("file"));
    ASSERT_THAT(first, Succeeds());
    writeFile(path("file"), "again");
    const auto second = recording.trashItem(url("file"));
    ASSERT_THAT(second, Succeeds());
    EXPECT_EQ(readFile(first->path()), "contents");
    EXPECT_EQ(readFile(second->path()), "again");
    EXPECT_EQ(second->lastPathComponent(), "file");
    EXPECT_FALSE(exists(path("file")));
}

TEST_F(Recording, NamesTypesAsConfigured) {
    RecordingFileManager images([](const files::ItemFacts&) {
        return files::ItemType{"com.ostrel.disk-image-udif", "disk image", false, false};
    });
    const auto properties = images.resourceProperties(url("file"));
    ASSERT_THAT(properties, Succeeds());
    EXPECT_EQ(properties->typeIdentifier, "com.ostrel.disk-image-udif");
}

}  // namespace
}  // namespace pinwell::test
