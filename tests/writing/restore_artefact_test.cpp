// scripts/restore-artefact: the cases that it refuses. The tests of faults and crashes cover its repairs.
#include <gtest/gtest.h>

#include <filesystem>

#include "e2e/artefacts.h"
#include "support/package_builder.h"
#include "support/process.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

class RestoreArtefact : public testing::Test {
  protected:
    ProcessResult restore(std::vector<std::string> arguments) const {
        return runProcess({.executable = RESTORE_ARTEFACT,
                           .arguments = std::move(arguments),
                           .environment = {{"PATH", "/usr/bin:/bin"}},
                           .workingDirectory = directory.path()});
    }

    // Like a write in place: saves the bytes after the image's data.
    void writeCopy(const std::string& bytes) const { writeFile(copy, bytes); }

    void expectRefused(int status) const {
        const ProcessResult result = restore({image, copy});
        EXPECT_EQ(result.exitStatus, status);
        EXPECT_EQ(linesOf(result.errors).size(), 1U) << result.errors;
        EXPECT_TRUE(readFile(image) == before);
    }

    TemporaryDirectory directory;
    const std::string image = directory / "Image.dmg";
    const std::string copy = directory / "Image.dmgData";
    const Data data = irregularData(10'000);
    const Artefact artefact = signedImage(data);
    const std::string stapled = artefact.stapledWith(base::toData("TICKET"));
    const std::string tail = stapled.substr(data.size());
    const std::string before = artefact.contents;

    RestoreArtefact() {
        writeFile(image, before);
        writeCopy(tail);
    }
};

TEST_F(RestoreArtefact, MakesTheSameImageAsTheStaple) {
    for (const std::size_t half :
         {std::size_t{0}, std::size_t{1}, tail.size() / 2, tail.size() - 1, tail.size()}) {
        const std::string old = before.substr(data.size());
        writeFile(image,
                  base::toString(data) + tail.substr(0, half) + old.substr(std::min(half, old.size())));
        const ProcessResult result = restore({image, copy});
        EXPECT_EQ(result.exitStatus, 0) << result.errors;
        EXPECT_EQ(result.output, "");
        EXPECT_TRUE(readFile(image) == stapled) << half;
    }
}

TEST_F(RestoreArtefact, CutsOffTheRestOfALongerTail) {
    writeFile(image, stapled + std::string(100'000, 'x'));
    EXPECT_EQ(restore({image, copy}).exitStatus, 0);
    EXPECT_TRUE(readFile(image) == stapled);
}

TEST_F(RestoreArtefact, TakesNamesThatLookLikeOptions) {
    std::filesystem::rename(image, directory / "-image");
    std::filesystem::rename(copy, directory / "-copy.dmgData");
    EXPECT_EQ(restore({"-image", "-copy.dmgData"}).exitStatus, 0);
    EXPECT_TRUE(readFile(directory / "-image") == stapled);
}

TEST_F(RestoreArtefact, ExplainsItself) {
    EXPECT_EQ(restore({}).exitStatus, 64);
    EXPECT_EQ(restore({image}).errors,
              "Usage: restore-artefact IMAGE COPY.dmgData | PACKAGE COPY.pkgTrailers\n");
}

TEST_F(RestoreArtefact, RefusesUnreadableFiles) {
    std::filesystem::remove(copy);
    expectRefused(66);
    std::filesystem::create_directory(copy);
    expectRefused(66);
}

TEST_F(RestoreArtefact, RefusesALink) {
    std::filesystem::rename(copy, directory / "elsewhere");
    std::filesystem::create_symlink("elsewhere", copy);
    expectRefused(66);
}

TEST_F(RestoreArtefact, RefusesACopyWithoutATrailer) {
    writeCopy(tail.substr(0, tail.size() - 1));
    expectRefused(65);
}

TEST_F(RestoreArtefact, RefusesACopyWithoutASignatureArea) {
    writeCopy("x" + tail.substr(1));
    expectRefused(65);
}

TEST_F(RestoreArtefact, RefusesACopyThatIsTooShort) {
    for (const std::size_t size : {std::size_t{0}, std::size_t{511}, std::size_t{512}, std::size_t{523}}) {
        writeCopy(tail.substr(tail.size() - std::min(size, tail.size())));
        expectRefused(65);
    }
}

TEST_F(RestoreArtefact, RefusesACopyOfAnotherLengthThanStated) {
    writeCopy(tail.substr(0, 20) + tail.substr(21));
    expectRefused(65);
}

TEST_F(RestoreArtefact, RefusesAnImageThatEndsBeforeItsData) {
    const std::string shorter = before.substr(0, data.size() - 1);
    writeFile(image, shorter);
    EXPECT_EQ(restore({image, copy}).exitStatus, 65);
    EXPECT_TRUE(readFile(image) == shorter);
}

TEST_F(RestoreArtefact, RefusesAPlaceThatNoFileReaches) {
    for (const char first : {'\x7F', '\x80', '\xFF'}) {
        std::string wrong = tail;
        wrong.at(wrong.size() - 512 + 296) = first;
        writeCopy(wrong);
        expectRefused(65);
    }
}

class RestorePackage : public RestoreArtefact {
  protected:
    // Like a write in place: saves the 16 bytes before the trailers, then the trailers.
    static PackageBuilder chain() { return PackageBuilder().archive({}).terminator(); }
    const std::string archive = signedPackage(data).contents;
    const std::string stapledPackage = archive + chain().unknown("KEPT").ticket("TICKET").build();
    const std::string package = directory / "Sample.pkg";
    const std::string trailers = directory / ("UUID." + std::to_string(archive.size()) + ".pkgTrailers");

    RestorePackage() {
        writeFile(package, archive + chain().unknown("KE").build());
        writeFile(trailers, stapledPackage.substr(archive.size()));
    }

    void expectPackageRefused(const std::string& from) const {
        const std::string now = readFile(package);
        const ProcessResult result = restore({package, from});
        EXPECT_EQ(result.exitStatus, 65);
        EXPECT_EQ(linesOf(result.errors).size(), 1U) << result.errors;
        EXPECT_TRUE(readFile(package) == now);
    }
};

TEST_F(RestorePackage, MakesTheSamePackageAsTheStaple) {
    for (const std::string& rest : {std::string(), std::string(5, '\0'), std::string(1000, 'x')}) {
        writeFile(package, archive + chain().build() + rest);
        const ProcessResult result = restore({package, trailers});
        EXPECT_EQ(result.exitStatus, 0) << result.errors;
        EXPECT_TRUE(readFile(package) == stapledPackage);
    }
}

TEST_F(RestorePackage, RefusesACopyThatBelongsAfterOtherBytes) {
    writeFile(package, archive + chain().terminator().build().substr(1));
    expectPackageRefused(trailers);
}

TEST_F(RestorePackage, RefusesAPackageThatEndsBeforeThePlace) {
    writeFile(package, archive + chain().build().substr(1));
    expectPackageRefused(trailers);
}

TEST_F(RestorePackage, RefusesACopyThatDoesNotSayWhereItBelongs) {
    for (const char* name : {"UUID.pkgTrailers", "UUID.-1.pkgTrailers", "UUID.08.pkgTrailers",
                             "UUID.9999999999999999999999.pkgTrailers", "UUID..pkgTrailers"}) {
        std::filesystem::copy_file(trailers, directory / name);
        expectPackageRefused(directory / name);
    }
}

TEST_F(RestorePackage, RefusesACopyThatDoesNotEndInATrailer) {
    writeFile(trailers, readFile(trailers) + "x");
    expectPackageRefused(trailers);
    writeFile(trailers, chain().build());
    expectPackageRefused(trailers);
}

TEST_F(RestorePackage, RecognisesACopyByItsName) {
    std::filesystem::rename(trailers, directory / "trailers");
    EXPECT_EQ(restore({package, directory / "trailers"}).exitStatus, 64);
}

}  // namespace
}  // namespace pinwell::test
