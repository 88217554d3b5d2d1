// Stapling on real volumes. If the file system clones, a clone gets the ticket and then replaces the
// artefact; otherwise the artefact itself is written. All its other properties stay the same, and no other
// file remains.
#include "support/volume.h"

#include <fcntl.h>
#include <linux/fiemap.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <unistd.h>

#include <array>
#include <cctype>
#include <cerrno>
#include <cstring>
#include <new>
#include <stdexcept>
#include <system_error>

#include "artefacts.h"
#include "base/handle.h"
#include "fixture.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::Combine;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::Values;

constexpr std::size_t kBlock = 4096;
constexpr std::size_t kVolumeDataSize =
    64 * kBlock + 1000;  // more than a file system keeps among its own records
constexpr const char* kAccessControlList = "system.posix_acl_access";

/// The place of a file's byte on its volume.
struct Place {
    std::uint64_t physical = 0;
    bool shared = false;  // with another file
};

Place placeOf(const std::string& path, std::uint64_t offset) {
    const base::FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    alignas(fiemap) std::array<std::byte, sizeof(fiemap) + sizeof(fiemap_extent)> room{};
    fiemap& map = *new (room.data()) fiemap;
    map.fm_start = offset;
    map.fm_length = 1;
    map.fm_flags = FIEMAP_FLAG_SYNC;
    map.fm_mapped_extents = 0;
    map.fm_extent_count = 1;
    map.fm_reserved = 0;
    if (ioctl(file.get(), FS_IOC_FIEMAP, &map) != 0)
        throw std::system_error(errno, std::generic_category(), path);
    if (map.fm_mapped_extents != 1) throw std::runtime_error(path + " has a hole");
    fiemap_extent extent{};
    std::memcpy(&extent, room.data() + sizeof(fiemap), sizeof extent);
    return {extent.fe_physical + (offset - extent.fe_logical), (extent.fe_flags & FIEMAP_EXTENT_SHARED) != 0};
}

/// The places of some whole blocks of the data.
std::vector<std::uint64_t> dataPlacesOf(const std::string& path) {
    std::vector<std::uint64_t> places;
    for (const std::size_t block : {0U, 31U, 63U}) places.push_back(placeOf(path, block * kBlock).physical);
    return places;
}

bool isEarlier(const timespec& left, const timespec& right) {
    return left.tv_sec != right.tv_sec ? left.tv_sec < right.tv_sec : left.tv_nsec < right.tv_nsec;
}

std::string alphanumeric(const std::string& text) {
    std::string name;
    for (const char c : text)
        if (std::isalnum(static_cast<unsigned char>(c)) != 0) name += c;
    return name;
}

using Maker = Artefact (*)(const Data&);

class Volumes : public EndToEndTest, public testing::WithParamInterface<std::tuple<const char*, Maker>> {
  public:
    static std::string nameOf(const testing::TestParamInfo<ParamType>& info) {
        return alphanumeric(std::get<0>(info.param)) + alphanumeric(std::get<1>(info.param)({}).name);
    }

  protected:
    void SetUp() override {
        if (volume.missing()) GTEST_SKIP() << *volume.missing();
        artefact = std::get<Maker>(GetParam())(irregularData(kVolumeDataSize));
        artefact = writeArtefact(artefact, volume / artefact.name);
        ticket = sealed(artefact.payload());
    }

    ProcessResult stapleArtefact() {
        serveTicket(ticket);
        return pinwell({"staple", artefact.path});
    }
    ProcessResult validateArtefact() const { return pinwell({"validate", artefact.path}); }

    /// The present files on the volume, except the file system's own.
    std::vector<std::string> names() const {
        std::vector<std::string> found = namesIn(volume.path());
        std::erase(found, "lost+found");
        return found;
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        const std::string processing = "Processing: " + artefact.path;
        return Ended(0, ElementsAre(processing, processing, kWorked));
    }
    testing::Matcher<const ProcessResult&> FailedToWrite() const {
        return Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73)));
    }

    Volume volume{std::get<0>(GetParam())};
    Artefact artefact;
    Data ticket;
};

TEST_P(Volumes, KeepTheOtherPropertiesOfAnArtefact) {
    const std::string& path = artefact.path;
    ASSERT_EQ(chown(path.c_str(), 1234, 2345), 0);
    setAttribute(path, "user.origin", "somewhere");
    setAttribute(path, kAccessControlList, listThatLetsAnotherRead());
    const auto before = statusOf(path);

    ASSERT_THAT(stapleArtefact(), Worked());
    const auto after = statusOf(path);
    EXPECT_EQ(after.st_uid, 1234U);
    EXPECT_EQ(after.st_gid, 2345U);
    EXPECT_EQ(after.st_mode, before.st_mode);
    EXPECT_EQ(attribute(path, "user.origin"), "somewhere");
    EXPECT_EQ(attribute(path, kAccessControlList), listThatLetsAnotherRead());
}

TEST_P(Volumes, DateAnArtefactFromItsStapling) {
    constexpr timespec kOldTime{1'000'000'000, 0};
    const std::array<timespec, 2> times{kOldTime, kOldTime};
    ASSERT_EQ(utimensat(AT_FDCWD, artefact.file().c_str(), times.data(), 0), 0);
    writeFile(volume / "earlier", "x");

    ASSERT_THAT(stapleArtefact(), Worked());
    const timespec stapledAt = statusOf(artefact.file()).st_mtim;
    EXPECT_FALSE(isEarlier(stapledAt, statusOf(volume / "earlier").st_mtim));
    writeFile(volume / "later", "x");
    EXPECT_FALSE(isEarlier(statusOf(volume / "later").st_mtim, stapledAt));
}

TEST_P(Volumes, HoldNothingButTheArtefactAfterwards) {
    const auto before = namesBelow(volume.path());
    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(namesBelow(volume.path()), before);
    EXPECT_THAT(names(), ElementsAre(artefact.name));
    EXPECT_THAT(namesBelow(directory / "home"), IsEmpty());
}

TEST_P(Volumes, TakeAnotherTicketInPlaceOfTheFirst) {
    ticket = sealed(artefact.payload().entry(2, hashOf(0x11)).entry(2, hashOf(0x22)));
    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(readFile(artefact.file()), artefact.stapledWith(ticket));
    ticket = sealed(artefact.payload());
    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(readFile(artefact.file()), artefact.stapledWith(ticket));
    EXPECT_THAT(names(), ElementsAre(artefact.name));
    EXPECT_THAT(validateArtefact(), Ended(0, Contains(kValidated)));
}

TEST_P(Volumes, AreNotWrittenToByAValidation) {
    writeFile(artefact.file(), artefact.stapledWith(ticket));
    serveTicket(ticket);
    ASSERT_EQ(mount(nullptr, volume.path().c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
    EXPECT_THAT(validateArtefact(), Ended(0, Contains(kValidated)));
    EXPECT_THAT(names(), ElementsAre(artefact.name));
}

TEST_P(Volumes, ThatAreReadOnlyKeepTheArtefactAsItIs) {
    ASSERT_EQ(mount(nullptr, volume.path().c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), 0);
    EXPECT_THAT(stapleArtefact(), FailedToWrite());
    EXPECT_EQ(readFile(artefact.file()), artefact.contents);
    EXPECT_THAT(names(), ElementsAre(artefact.name));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, Volumes,
                         Combine(Values("xfs", "btrfs", "xfs -m reflink=0", "ext4", "tmpfs"),
                                 Values(&signedImage, &unsignedImage, &signedPackage, &signedBundle)),
                         Volumes::nameOf);

using CloningVolumes = Volumes;

TEST_P(CloningVolumes, SwapTheArtefactForACloneThatSharesItsData) {
    const std::string other = volume / "other name";
    ASSERT_EQ(link(artefact.path.c_str(), other.c_str()), 0);
    const auto inode = statusOf(artefact.path).st_ino;
    const auto places = dataPlacesOf(artefact.path);
    ASSERT_FALSE(placeOf(artefact.path, 0).shared);

    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
    EXPECT_NE(statusOf(artefact.path).st_ino, inode);
    EXPECT_EQ(dataPlacesOf(artefact.path), places);
    EXPECT_TRUE(placeOf(artefact.path, 0).shared);
}

TEST_P(CloningVolumes, LeaveTheArtefactAsItWasToItsOtherNames) {
    const std::string other = volume / "other name";
    ASSERT_EQ(link(artefact.path.c_str(), other.c_str()), 0);
    const auto inode = statusOf(artefact.path).st_ino;

    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(readFile(other), artefact.contents);
    EXPECT_EQ(statusOf(other).st_ino, inode);
    EXPECT_EQ(statusOf(other).st_nlink, 1U);
    EXPECT_EQ(statusOf(artefact.path).st_nlink, 1U);
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, CloningVolumes,
                         Combine(Values("xfs", "btrfs"),
                                 Values(&signedImage, &unsignedImage, &signedPackage)),
                         Volumes::nameOf);

using PlainVolumes = Volumes;

TEST_P(PlainVolumes, HaveTheArtefactItselfWrittenTo) {
    const std::string other = volume / "other name";
    ASSERT_EQ(link(artefact.path.c_str(), other.c_str()), 0);
    const auto inode = statusOf(artefact.path).st_ino;

    ASSERT_THAT(stapleArtefact(), Worked());
    EXPECT_EQ(readFile(artefact.path), artefact.stapledWith(ticket));
    EXPECT_EQ(statusOf(artefact.path).st_ino, inode);
    EXPECT_EQ(statusOf(other).st_ino, inode);
    EXPECT_EQ(statusOf(other).st_nlink, 2U);
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, PlainVolumes,
                         Combine(Values("xfs -m reflink=0", "ext4", "tmpfs"),
                                 Values(&signedImage, &unsignedImage, &signedPackage)),
                         Volumes::nameOf);

// A volume with room for a clone, which takes none, and not for a ticket of this size.
constexpr std::size_t kRoom = 128 * kBlock;
constexpr unsigned kEntriesBeyondTheRoom = 2 * kRoom / 21;

class FullVolume : public Volumes {
  protected:
    void SetUp() override {
        Volumes::SetUp();
        if (IsSkipped()) return;
        TicketPayloadBuilder payload = artefact.payload();
        const base::Data another = hashOf(0x77);
        for (unsigned i = 0; i < kEntriesBeyondTheRoom; ++i) payload.entry(2, another);
        ticket = sealed(payload);
        fill();
    }

  private:
    /// Takes all space but kRoom.
    void fill() const {
        const base::FileDescriptor file(
            open((volume / "filling").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600));
        off_t taken = 0;
        for (off_t piece = 256 * 1024 * 1024; piece >= static_cast<off_t>(kBlock); piece /= 2)
            while (fallocate(file.get(), 0, taken, piece) == 0) taken += piece;
        ASSERT_EQ(ftruncate(file.get(), taken - static_cast<off_t>(kRoom)), 0);
    }
};

using FullCloningVolume = FullVolume;

TEST_P(FullCloningVolume, KeepsTheArtefactAsItIs) {
    const auto inode = statusOf(artefact.path).st_ino;
    EXPECT_THAT(stapleArtefact(), FailedToWrite());
    EXPECT_EQ(readFile(artefact.path), artefact.contents);
    EXPECT_EQ(statusOf(artefact.path).st_ino, inode);
    EXPECT_THAT(names(), ElementsAre(MatchesRegex("\\.pinwell-replacement-.{6}"), artefact.name, "filling"));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, FullCloningVolume,
                         Combine(Values("xfs"), Values(&signedImage, &unsignedImage, &signedPackage)),
                         Volumes::nameOf);

using FullPlainVolume = FullVolume;

TEST_P(FullPlainVolume, LosesNoneOfTheArtefactsOwnData) {
    EXPECT_THAT(stapleArtefact(), FailedToWrite());
    EXPECT_EQ(readFile(artefact.path).substr(0, kVolumeDataSize),
              artefact.contents.substr(0, kVolumeDataSize));
    EXPECT_THAT(names(), ElementsAre(artefact.name, "filling"));
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, FullPlainVolume,
                         Combine(Values("ext4", "tmpfs"),
                                 Values(&signedImage, &unsignedImage, &signedPackage)),
                         Volumes::nameOf);

using FullVolumeWithABundle = FullVolume;

// The old ticket is removed before the new one is written, and frees less space than the new one needs.
TEST_P(FullVolumeWithABundle, HasNoTicketRatherThanHalfOfOne) {
    EXPECT_THAT(stapleArtefact(), FailedToWrite());
    EXPECT_FALSE(exists(artefact.file()));
    EXPECT_EQ(base::toData(readFile(artefact.path + "/Contents/Programs/Sample")), artefact.executable);
    EXPECT_THAT(names(), ElementsAre(artefact.name, "filling"));
}

INSTANTIATE_TEST_SUITE_P(OnVolumes, FullVolumeWithABundle,
                         Combine(Values("xfs", "ext4", "tmpfs"), Values(&signedBundle)), Volumes::nameOf);

}  // namespace
}  // namespace pinwell::test
