// Files that differ from their names, or whose place is not writable. Each run ends with an exit code and a
// line that explains it, never with a signal or a wait.
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

#include "base/handle.h"
#include "e2e/artefacts.h"
#include "e2e/fixture.h"
#include "support/disk_image_builder.h"
#include "support/file_properties.h"
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

    /// Both operations end with this status, and with these messages.
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

    /// Run by an ordinary user, for whom permissions hold, and who owns all files in the test's directory.
    ProcessResult stapleAsOrdinaryUser(const std::string& item) const {
        Command staple = command({"staple", item});
        if (!isSuperuser()) return runProcess(staple);
        // Other users may have no access to the build folder.
        const std::string program = directory / "pinwell";
        std::filesystem::copy_file(PINWELL_PROGRAM, program, std::filesystem::copy_options::skip_existing);
        giveToOrdinaryUser(directory.path());
        const std::string number = std::to_string(kOrdinaryUser);
        staple.executable = "/usr/bin/setpriv";
        staple.arguments = {
            "--reuid=" + number, "--regid=" + number, "--clear-groups", program, "staple", item};
        return runProcess(staple);
    }

    /// Moves the item down until its path has that length, and returns the path. The directories are moved
    /// into one another, so no intermediate path is too long.
    std::string moveDown(const std::string& item, std::size_t length) const {
        const std::string top = directory / "deep";
        const std::string outer = directory / "outer";
        std::string way = item.substr(item.rfind('/'));
        std::filesystem::create_directory(top);
        std::filesystem::rename(item, top + way);
        for (std::size_t rest = length - top.size() - way.size(); rest > 0;) {
            std::size_t part = std::min<std::size_t>(rest, NAME_MAX + 1);
            if (rest - part == 1) --part;  // only a slash would fill it
            rest -= part;
            const std::string name = '/' + std::string(part - 1, 'd');
            std::filesystem::create_directory(outer);
            std::filesystem::rename(top, outer + name);
            std::filesystem::rename(outer, top);
            way.insert(0, name);
        }
        EXPECT_EQ(top.size() + way.size(), length);
        return top + way;
    }

    static void makeNode(const std::string& item, mode_t type, dev_t device = 0) {
        std::filesystem::create_directories(std::filesystem::path(item).parent_path());
        ASSERT_EQ(mknod(item.c_str(), type | 0600U, device), 0) << item;
    }
};

constexpr const char* kExecutableInBundle = "/Contents/Programs/Sample";

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

// A file's attribute that only some file systems support.
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

    base::FileDescriptor file_;
    bool set_ = false;
};

// A file. For a bundle, whose ticket is a file that is removed and made, its directory.
class WriteProtected {
  public:
    WriteProtected(const Artefact& artefact, mode_t mode)
        : file_(artefact.file()), folder_(artefact.isBundle() ? artefact.path + "/Contents" : "") {
        setMode(file_, mode);
        if (!folder_.empty()) setMode(folder_, mode | mode >> 2U);
    }
    ~WriteProtected() {
        if (!folder_.empty()) setMode(folder_, 0755);
        setMode(file_, 0644);
    }
    WriteProtected(const WriteProtected&) = delete;
    WriteProtected& operator=(const WriteProtected&) = delete;

  private:
    std::string file_;
    std::string folder_;
};

class Unwritable : public OddArtefact, public testing::WithParamInterface<Artefact (*)(const Data&)> {
  protected:
    const Artefact made = GetParam()(irregularData(100'000));

    std::string ending() const { return made.name.substr(made.name.find('.')); }

    Artefact put(const std::string& place) {
        Artefact artefact = writeArtefact(made, place);
        serveTicket(sealed(artefact.payload()));
        return artefact;
    }
    /// The item of an artefact with the longest path.
    std::string innermost() const { return made.isBundle() ? kExecutableInBundle : ""; }

    Artefact putAtPathOf(std::size_t length) {
        Artefact artefact = writeArtefact(made, path(made.name));
        artefact.path = moveDown(artefact.path, length);
        return artefact;
    }
    testing::Matcher<const ProcessResult&> Refused(const Artefact& artefact) const {
        return Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73)));
    }
    void expectRefused(const Artefact& artefact) {
        EXPECT_THAT(pinwell({"staple", artefact.path}), Refused(artefact));
        EXPECT_TRUE(readFile(artefact.file()) == artefact.contents);
    }
    void expectProtected(const Artefact& artefact) {
        for (const mode_t mode : {mode_t{0444}, mode_t{0400}}) {
            const WriteProtected writeProtected(artefact, mode);
            EXPECT_THAT(stapleAsOrdinaryUser(artefact.path), Refused(artefact));
            EXPECT_TRUE(readFile(artefact.file()) == artefact.contents);
            EXPECT_EQ(permissionsOf(artefact.file()), mode);
        }
    }
    void expectProtectedOn(const char* fileSystem, std::size_t clonesLeftBehind) {
        const Volume volume(fileSystem);
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        const Artefact artefact = put(volume / made.name);
        giveToOrdinaryUser(std::filesystem::path(volume.path()).parent_path());
        expectProtected(artefact);
        std::vector<std::string> names = namesIn(volume.path());
        EXPECT_EQ(
            std::erase_if(names, [](const auto& name) { return name.starts_with(".pinwell-replacement-"); }),
            clonesLeftBehind);
        EXPECT_THAT(names, ElementsAre(made.name));
    }
    /// A failed swap is recognised by the file that is there afterwards.
    void expectNotReplaced(const Artefact& artefact) {
        const std::string processing = "Processing: " + artefact.path;
        EXPECT_THAT(
            pinwell({"staple", artefact.path}),
            Ended(73, AnyOf(ElementsAre(processing, stapleFailed(73)),
                            ElementsAre(processing, processing, StartsWith("Although we wrote the ticket, "),
                                        stapleFailed(73)))));
        EXPECT_TRUE(readFile(artefact.file()) == artefact.contents);
    }
};

TEST_P(Unwritable, AnImmutableFileStaysAsItIs) {
    for (const char* fileSystem : {"xfs", "ext4"}) {
        const Volume volume(fileSystem);
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        const Artefact artefact = put(volume / made.name);
        const Immutable immutable(artefact.file());
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

TEST_P(Unwritable, AWriteProtectedFileStaysAsItIs) {
    expectProtected(put(path(made.name)));
}

TEST_P(Unwritable, AWriteProtectedFileStaysAsItIsWhereItCannotBeCloned) {
    expectProtectedOn("tmpfs", 0);
}

// A clone could replace it; but it is protected as well, and the protection is for the artefact. An unwritten
// clone remains.
TEST_P(Unwritable, AWriteProtectedFileStaysAsItIsWhereItCanBeCloned) {
    expectProtectedOn("xfs", made.isBundle() ? 0 : 2);
}

TEST_P(Unwritable, AFullVolumeKeepsTheFileAsItIs) {
    const Volume volume("tmpfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    Artefact artefact = made;
    // As long as whole pages are: not a byte of it finds room in the last one.
    while (artefact.contents.size() % 4096 != 0 && artefact.name.ends_with("pkg")) artefact.contents += '\0';
    artefact = writeArtefact(artefact, volume / made.name);
    // Removing a ticket frees space: a bundle for a full disk has no ticket yet.
    if (artefact.isBundle()) std::filesystem::remove(artefact.file());
    const auto ticketFile = [&] {
        return exists(artefact.file()) ? std::optional(readFile(artefact.file())) : std::nullopt;
    };
    const auto before = ticketFile();
    serveTicket(sealed(artefact.payload().entry(2, hashOf(1)).entry(2, hashOf(2))));
    std::string filler(1 << 20, 'x');
    const base::FileDescriptor file(open((volume / "filler").c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
    for (std::size_t size = filler.size(); size >= 512; size /= 2)
        while (write(file.get(), filler.data(), size) > 0) {
        }
    const ProcessResult result = pinwell({"staple", artefact.path});
    // An image may have enough room left in its own last page.
    if (result.exitStatus != 0) {
        EXPECT_THAT(result, Refused(artefact));
        EXPECT_TRUE(ticketFile() == before);
    } else {
        EXPECT_TRUE(artefact.name.ends_with(".dmg"));
    }
}

TEST_P(Unwritable, AFileOverTheSizeLimitStaysAsItIsAndNoSignalEndsTheRun) {
    const Artefact artefact = put(path(made.name));
    const ProcessResult result = [&] {
        const FileSizeLimit limit(artefact.isBundle() ? 100 : artefact.contents.size());
        return pinwell({"staple", artefact.path});
    }();
    if (artefact.isBundle()) {
        // Its ticket is too long as a temporary file already.
        EXPECT_THAT(result,
                    Ended(73, ElementsAre("Processing: " + artefact.path,
                                          StartsWith("Could not write ticket to "), stapleFailed(73))));
    } else {
        EXPECT_THAT(result, Refused(artefact));
    }
    EXPECT_TRUE(readFile(artefact.file()) == artefact.contents);
}

TEST_P(Unwritable, OrNotAFileMayHaveAnyName) {
    const std::string ending = this->ending();
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
        EXPECT_TRUE(readFile(artefact.file()) == artefact.stapledWith(ticket));
        std::filesystem::remove_all(artefact.path);
    }
}

TEST_P(Unwritable, OrNotAFileMayLieAsDeepAsPathsReach) {
    const Artefact artefact = putAtPathOf(PATH_MAX - 1 - innermost().size());
    const Data ticket = sealed(artefact.payload());
    serveTicket(ticket);
    EXPECT_EQ(pinwell({"staple", artefact.path}).exitStatus, 0);
    EXPECT_TRUE(readFile(artefact.file()) == artefact.stapledWith(ticket));
}

TEST_P(Unwritable, APathOverTheLimitDoesNotExist) {
    const std::string place = putAtPathOf(PATH_MAX).path;
    expectBoth(place, 66, ElementsAre(StartsWith("File " + place + " does not exist. ")));
    const std::string name = path(std::string(NAME_MAX, 'n') + ending());
    expectBoth(name, 66, ElementsAre(StartsWith("File " + name + " does not exist. ")));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, Unwritable,
                         testing::Values(&signedImage, &unsignedImage, &signedPackage, &signedBundle),
                         [](const auto& kind) { return kind.param({}).kind(); });

// As everywhere, a user with the right to change a directory may remove its contents.
// Its path is not too long, but the executable in it is out of reach.
TEST_F(OddArtefact, ABundleWhoseExecutableExceedsTheLimitOfPathsHasNoHash) {
    const std::string deep = moveDown(bundle, PATH_MAX - std::string_view(kExecutableInBundle).size());
    expectUnreadable(deep);
}

TEST_F(OddTicketPlace, ThatIsWriteProtectedInABundleThatIsNotIsReplaced) {
    const Data served = ticket();
    serveTicket(served);
    stapleByHand(ticketForOthers());
    for (const mode_t mode : {mode_t{0444}, mode_t{0400}}) {
        setMode(ticketPath(), mode);
        EXPECT_EQ(stapleAsOrdinaryUser(bundle).exitStatus, 0);
        EXPECT_EQ(stapled(), served);
        EXPECT_EQ(permissionsOf(ticketPath()) & mode_t{S_IWUSR}, mode_t{S_IWUSR});
    }
}

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

// A signed image whose data are a hole of 8 TiB: none of the data are read.
TEST_F(OddArtefact, ASignedImageOf8TiBIsStapledWithoutBeingRead) {
    constexpr std::uint64_t kSize = 8ULL << 40U;
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    const std::string image = volume / "Huge.dmg";
    const std::string tail = base::toString(
        DiskImageBuilder().data({}).superblob(DiskImageBuilder::signature()).codeSignOffset(kSize).build());
    writeFile(image, std::string_view());
    const auto putAt = [&](std::uint64_t at, const std::string& bytes) {
        const base::FileDescriptor file(open(image.c_str(), O_WRONLY | O_CLOEXEC));
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
