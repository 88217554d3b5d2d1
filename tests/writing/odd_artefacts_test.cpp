// What is not what its name says, or lies where it cannot be written: a clean end each time, with an exit
// code and a line that tells, never a signal, never a wait.
#include <fcntl.h>
#include <gmock/gmock.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <unistd.h>

#include <climits>
#include <filesystem>
#include <functional>

#include "e2e/artefacts.h"
#include "e2e/fixture.h"
#include "foundation/file_io.h"
#include "support/disk_image_builder.h"
#include "support/file_size_limit.h"
#include "support/volume.h"

namespace pinwell::test {
namespace {

using testing::_;
using testing::AnyOf;
using testing::ElementsAre;
using testing::StartsWith;

class OddArtefact : public EndToEndTest {
  protected:
    std::string path(std::string_view name) const { return directory / ("builds/" + std::string(name)); }

    /// Both operations end so, and say so.
    void expectBoth(const std::string& item, int status,
                    const testing::Matcher<std::vector<std::string>>& lines) {
        EXPECT_THAT(pinwell({"staple", item}), Ended(status, lines)) << item;
        EXPECT_THAT(pinwell({"validate", item}), Ended(status, lines)) << item;
    }
    void expectNoneOfOurs(const std::string& item, const std::string& type) {
        expectBoth(
            item, 66,
            ElementsAre("Processing: " + item, "Pinwell is incapable of working with " + type + " files."));
    }
    void expectUnreadable(const std::string& item) {
        expectBoth(item, 66, ElementsAre("Processing: " + item));
    }

    static void makeNode(const std::string& item, mode_t type, dev_t device = 0) {
        std::filesystem::create_directories(std::filesystem::path(item).parent_path());
        ASSERT_EQ(mknod(item.c_str(), type | 0600U, device), 0) << item;
    }
    static bool isSuperuser() { return geteuid() == 0; }
};

constexpr std::array kNames{"Odd.dmg", "Odd.pkg", "Odd.app"};

TEST_F(OddArtefact, ALinkIsNotFollowed) {
    writeArtefact(signedImage(), path("Image.dmg"));
    for (const auto& [name, target] : {std::pair{"ToAFile.dmg", "Image.dmg"},
                                       {"ToABundle.app", "Sample.app"},
                                       {"Dangling.dmg", "nothing"},
                                       {"Dangling.pkg", "nothing"},
                                       {"Loop.dmg", "Loop.dmg"},
                                       {"Loop.app", "Loop.app"}}) {
        std::filesystem::create_symlink(target, path(name));
        expectNoneOfOurs(path(name), "alias");
    }
    EXPECT_TRUE(readFile(path("Image.dmg")) == signedImage().contents);
}

TEST_F(OddArtefact, ADirectoryOnTheWayMayBeALink) {
    std::filesystem::create_directory_symlink("../builds", path("link"));
    const Artefact image = writeArtefact(signedImage(), path("Image.dmg"));
    const Data served = sealed(image.payload());
    serveTicket(served);
    EXPECT_EQ(pinwell({"staple", path("link/Image.dmg")}).exitStatus, 0);
    EXPECT_TRUE(readFile(image.path) == image.stapledWith(served));
}

TEST_F(OddArtefact, ALoopOnTheWayIsNoFile) {
    std::filesystem::create_symlink("loop", path("loop"));
    expectBoth(path("loop/Image.dmg"), 66,
               ElementsAre(StartsWith("File " + path("loop/Image.dmg") + " does not exist. ")));
}

TEST_F(OddArtefact, AFifoIsNotWaitedFor) {
    for (const char* name : kNames) {
        makeNode(path(name), S_IFIFO);
        expectNoneOfOurs(path(name), "document");
    }
}

TEST_F(OddArtefact, ASocketIsNoArtefact) {
    for (const char* name : kNames) {
        makeNode(path(name), S_IFSOCK);
        expectNoneOfOurs(path(name), "document");
    }
}

TEST_F(OddArtefact, ADeviceIsNotOpened) {
    if (!isSuperuser()) GTEST_SKIP() << "only the superuser may make devices";
    for (const char* name : kNames) {
        makeNode(path(name), S_IFCHR, makedev(1, 5));  // /dev/zero
        expectNoneOfOurs(path(name), "document");
    }
}

TEST_F(OddArtefact, ADirectoryIsNoImageAndNoPackage) {
    std::filesystem::create_directory(path("Odd.dmg"));
    expectNoneOfOurs(path("Odd.dmg"), "folder");
}

TEST_F(OddArtefact, ADirectoryThatIsAPackageHasNoHash) {
    std::filesystem::create_directory(path("Odd.pkg"));
    EXPECT_EQ(pinwell({"staple", path("Odd.pkg")}).exitStatus, 66);
}

TEST_F(OddArtefact, AFileIsNoBundle) {
    writeFile(path("Odd.app"), std::string_view("text"));
    expectNoneOfOurs(path("Odd.app"), "document");
}

TEST_F(OddArtefact, AnEmptyFileIsNoImageAndNoPackage) {
    for (const char* name : {"Odd.dmg", "Odd.pkg"}) {
        writeFile(path(name), std::string_view());
        EXPECT_EQ(pinwell({"staple", path(name)}).exitStatus, 66);
        EXPECT_EQ(pinwell({"validate", path(name)}).exitStatus, 66);
        EXPECT_EQ(readFile(path(name)), "");
    }
}

TEST_F(OddArtefact, ABundleOfFifosIsNotWaitedFor) {
    for (const char* name : {"Contents/Info.plist", "Contents/MacOS/Odd", "Contents/CodeResources"})
        makeNode(path(std::string("Odd.app/") + name), S_IFIFO);
    EXPECT_EQ(pinwell({"staple", path("Odd.app")}).exitStatus, 66);
    EXPECT_EQ(pinwell({"validate", path("Odd.app")}).exitStatus, 66);
}

class OddTicketPlace : public OddArtefact {
  protected:
    OddTicketPlace() { serveTicket(ticket()); }

    void expectCannotBeWritten() {
        EXPECT_THAT(staple(), Ended(73, ElementsAre(processing(), stapleFailed(73))));
        EXPECT_EQ(stapled(), std::nullopt);
    }
};

TEST_F(OddTicketPlace, ThatIsAFifoIsLeftAlone) {
    makeNode(ticketPath(), S_IFIFO);
    expectCannotBeWritten();
}

TEST_F(OddTicketPlace, ThatIsADirectoryIsLeftAlone) {
    writeFile(ticketPath() + "/inside", std::string_view("kept"));
    expectCannotBeWritten();
    EXPECT_EQ(readFile(ticketPath() + "/inside"), "kept");
}

TEST_F(OddTicketPlace, ThatIsALinkIsLeftAlone) {
    writeFile(path("elsewhere"), std::string_view("kept"));
    for (const std::string& target :
         {path("elsewhere"), std::string("CodeResources"), std::string("nothing")}) {
        std::filesystem::create_symlink(target, ticketPath());
        expectCannotBeWritten();
        EXPECT_EQ(std::filesystem::read_symlink(ticketPath()), target);
        std::filesystem::remove(ticketPath());
    }
    EXPECT_EQ(readFile(path("elsewhere")), "kept");
}

// A file's attribute, of which only some file systems know.
class Immutable {
  public:
    explicit Immutable(const std::string& path) : file_(open(path.c_str(), O_RDONLY | O_CLOEXEC)) {
        set_ = change(true);
    }
    ~Immutable() {
        if (set_) change(false);
    }
    Immutable(const Immutable&) = delete;
    Immutable& operator=(const Immutable&) = delete;

    bool isSet() const { return set_; }

  private:
    bool change(bool value) const {
        int flags = 0;
        if (ioctl(file_.get(), FS_IOC_GETFLAGS, &flags) != 0) return false;
        flags = value ? flags | FS_IMMUTABLE_FL : flags & ~FS_IMMUTABLE_FL;
        return ioctl(file_.get(), FS_IOC_SETFLAGS, &flags) == 0;
    }

    foundation::FileDescriptor file_;
    bool set_ = false;
};

class Unwritable : public OddArtefact, public testing::WithParamInterface<Artefact (*)(const Data&)> {
  protected:
    const Artefact made = GetParam()(irregularData(100'000));

    Artefact put(const std::string& place) {
        Artefact artefact = writeArtefact(made, place);
        serveTicket(sealed(artefact.payload()));
        return artefact;
    }
    void expectRefused(const Artefact& artefact) {
        EXPECT_THAT(pinwell({"staple", artefact.path}),
                    Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73))));
        EXPECT_TRUE(readFile(artefact.path) == artefact.contents);
    }
    /// A swap into place that fails is told from what is found there afterwards.
    void expectNotReplaced(const Artefact& artefact) {
        const std::string processing = "Processing: " + artefact.path;
        EXPECT_THAT(
            pinwell({"staple", artefact.path}),
            Ended(73, AnyOf(ElementsAre(processing, stapleFailed(73)),
                            ElementsAre(processing, processing, StartsWith("Although we wrote the ticket, "),
                                        stapleFailed(73)))));
        EXPECT_TRUE(readFile(artefact.path) == artefact.contents);
    }
};

TEST_P(Unwritable, AnImmutableFileStaysAsItIs) {
    for (const char* fileSystem : {"xfs", "ext4"}) {
        const Volume volume(fileSystem);
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        const Artefact artefact = put(volume / made.name);
        const Immutable immutable(artefact.path);
        ASSERT_TRUE(immutable.isSet()) << fileSystem;
        expectNotReplaced(artefact);
    }
}

TEST_P(Unwritable, AReadOnlyVolumeStaysAsItIs) {
    for (const char* fileSystem : {"xfs", "tmpfs"}) {
        const Volume volume(fileSystem);
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        const Artefact artefact = put(volume / made.name);
        ASSERT_EQ(mount(nullptr, volume.path().c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
        expectRefused(artefact);
    }
}

TEST_P(Unwritable, AFullVolumeKeepsTheFileAsItIs) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    Artefact artefact = made;
    // As long as whole pages are: not a byte of it finds room in the last one.
    while (artefact.contents.size() % 4096 != 0 && artefact.name.ends_with("pkg")) artefact.contents += '\0';
    artefact = writeArtefact(artefact, volume / made.name);
    serveTicket(sealed(artefact.payload().entry(2, hashOf(1)).entry(2, hashOf(2))));
    std::string filler(1 << 20, 'x');
    const foundation::FileDescriptor file(
        open((volume / "filler").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    for (std::size_t size = filler.size(); size >= 512; size /= 2)
        while (write(file.get(), filler.data(), size) > 0) {
        }
    const ProcessResult result = pinwell({"staple", artefact.path});
    // An image may have a page of its own left over that is room enough.
    if (result.exitStatus != 0) {
        EXPECT_THAT(result, Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73))));
        EXPECT_TRUE(readFile(artefact.path) == artefact.contents);
    } else {
        EXPECT_TRUE(artefact.name.ends_with(".dmg"));
    }
}

TEST_P(Unwritable, AFileOverTheSizeLimitStaysAsItIsAndNoSignalEndsTheRun) {
    const Artefact artefact = put(path(made.name));
    const ProcessResult result = [&] {
        const FileSizeLimit limit(artefact.contents.size());
        return pinwell({"staple", artefact.path});
    }();
    EXPECT_THAT(result, Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73))));
    EXPECT_TRUE(readFile(artefact.path) == artefact.contents);
}

TEST_P(Unwritable, OrNotAFileMayHaveAnyName) {
    const std::string ending = made.name.substr(made.name.find('.'));
    for (const std::string& name :
         {"\xFF\xFE\xC0" + ending, std::string(NAME_MAX - ending.size(), 'n') + ending,
          "new\nline\x1B[2J" + ending, "-v" + ending, " " + ending}) {
        Artefact artefact = writeArtefact(made, path(name));
        const Data ticket = sealed(artefact.payload());
        serveTicket(ticket);
        const ProcessResult result = pinwell({"staple", artefact.path});
        EXPECT_EQ(result.exitStatus, 0) << testing::PrintToString(name) << result.output;
        EXPECT_EQ(result.outputLines().size(), 3U);
        EXPECT_EQ(result.output.find('\x1B'), std::string::npos);
        EXPECT_TRUE(readFile(artefact.path) == artefact.stapledWith(ticket));
        std::filesystem::remove(artefact.path);
    }
}

TEST_P(Unwritable, APathOverTheLimitDoesNotExist) {
    const std::string place = path(made.name);
    std::string longer = directory / "builds/";
    while (longer.size() <= PATH_MAX) longer += "./";
    expectBoth(longer + made.name, 66, ElementsAre(StartsWith("File ")));
    expectBoth(place + std::string(NAME_MAX, 'n'), 66, ElementsAre(StartsWith("File ")));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, Unwritable,
                         testing::Values(&signedImage, &unsignedImage, &signedPackage), [](const auto& kind) {
                             const std::string name = kind.param({}).name;
                             return name.substr(0, name.find('.')) +
                                    (name.ends_with("dmg") ? "Image" : "Package");
                         });

TEST_F(OddArtefact, AFileThatGrowsWhileItIsStapledIsRefused) {
    const Artefact image = writeArtefact(unsignedImage(), path("Image.dmg"));
    const Data served = sealed(image.payload());
    service().setHandler([&](const RecordedRequest&) {
        std::filesystem::resize_file(image.path, image.contents.size() + 1);
        return answer(inlineRecord(served));
    });
    EXPECT_EQ(pinwell({"staple", image.path}).exitStatus, 73);
    serveNoMore();
    EXPECT_TRUE(readFile(image.path) == image.contents + std::string(1, '\0'));
}

// A signed image whose data are a hole of 8 TiB: nothing of it is read.
TEST_F(OddArtefact, ASignedImageOf8TiBIsStapledWithoutBeingRead) {
    constexpr std::uint64_t kSize = 8ULL << 40U;
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const std::string image = volume / "Huge.dmg";
    const std::string tail = foundation::toString(
        DiskImageBuilder().data({}).superblob(DiskImageBuilder::signature()).codeSignOffset(kSize).build());
    writeFile(image, std::string_view());
    const auto putAt = [&](std::uint64_t at, const std::string& bytes) {
        const foundation::FileDescriptor file(open(image.c_str(), O_WRONLY | O_CLOEXEC));
        return pwrite(file.get(), bytes.data(), bytes.size(), static_cast<off_t>(at)) ==
               static_cast<ssize_t>(bytes.size());
    };
    ASSERT_TRUE(putAt(kSize, tail));
    const Data served =
        sealed(TicketPayloadBuilder().entry(2, codeHashOf(2, DiskImageBuilder::codeDirectory())));
    serveTicket(served);
    EXPECT_EQ(pinwell({"staple", image}).exitStatus, 0);
    EXPECT_EQ(pinwell({"validate", image}).exitStatus, 0);
    EXPECT_EQ(std::filesystem::file_size(image), kSize + tail.size() + 16 + served.size());
    struct stat status {};
    ASSERT_EQ(stat(image.c_str(), &status), 0);
    EXPECT_LT(status.st_blocks, 1024) << "the hole has been filled";
}

}  // namespace
}  // namespace pinwell::test
