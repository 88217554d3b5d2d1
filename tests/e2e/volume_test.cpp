// Stapling on real volumes. Where the file system clones, a clone gets the ticket and then the artefact's
// place; elsewhere the artefact itself is written to. What the artefact is besides its contents is the same
// afterwards, and nothing else is left.
#include "support/volume.h"

#include <fcntl.h>
#include <linux/fiemap.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstring>
#include <system_error>

#include "artefacts.h"
#include "fixture.h"
#include "foundation/file_io.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::Combine;
using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;
using testing::StartsWith;
using testing::Values;

constexpr std::size_t kBlock = 4096;
constexpr std::size_t kDataSize = 64 * kBlock + 1000;  // more than a file system keeps among its own records
constexpr const char* kAccessControlList = "system.posix_acl_access";

/// Where on its volume a byte of a file lies.
struct Place {
    std::uint64_t physical = 0;
    bool shared = false;  // with another file
};

Place placeOf(const std::string& path, std::uint64_t offset) {
    const foundation::FileDescriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    alignas(fiemap) std::array<std::byte, sizeof(fiemap) + sizeof(fiemap_extent)> answer{};
    fiemap question{};
    question.fm_start = offset;
    question.fm_length = 1;
    question.fm_flags = FIEMAP_FLAG_SYNC;
    question.fm_extent_count = 1;
    std::memcpy(answer.data(), &question, sizeof question);
    if (ioctl(file.get(), FS_IOC_FIEMAP, answer.data()) != 0)
        throw std::system_error(errno, std::generic_category(), path);
    fiemap_extent extent{};
    std::memcpy(&question, answer.data(), sizeof question);
    if (question.fm_mapped_extents != 1) throw std::runtime_error(path + " has a hole");
    std::memcpy(&extent, answer.data() + sizeof question, sizeof extent);
    return {extent.fe_physical + (offset - extent.fe_logical), (extent.fe_flags & FIEMAP_EXTENT_SHARED) != 0};
}

/// The places of some whole blocks of the data.
std::vector<std::uint64_t> dataPlacesOf(const std::string& path) {
    std::vector<std::uint64_t> places;
    for (const std::size_t block : {0, 31, 63}) places.push_back(placeOf(path, block * kBlock).physical);
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
        removeAll(volume / "lost+found");
        artefact = writeArtefact(std::get<Maker>(GetParam())(irregularData(kDataSize)), volume / "file");
        artefact = writeArtefact(artefact, volume / artefact.name);
        removeAll(volume / "file");
        ticket = sealed(artefact.payload());
    }

    static void removeAll(const std::string& path) { std::filesystem::remove_all(path); }
    bool isImage() const { return artefact.name.ends_with(".dmg"); }

    ProcessResult stapleOn() {
        serveTicket(ticket);
        return pinwell({"staple", artefact.path});
    }
    testing::Matcher<const ProcessResult&> Worked() const {
        const std::string processing = "Processing: " + artefact.path;
        return Ended(0, ElementsAre(processing, processing, "The staple and validate action worked!"));
    }
    testing::Matcher<const ProcessResult&> FailedToWrite() const {
        return Ended(73, ElementsAre("Processing: " + artefact.path, stapleFailed(73)));
    }

    Volume volume{std::get<0>(GetParam())};
    Artefact artefact;
    Data ticket;
};

}  // namespace
}  // namespace pinwell::test
