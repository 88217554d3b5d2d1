// A package's calls to the archive library, and its reaction to every result. The library is this file: its
// functions replace the real ones, so they can return results that no real archive causes.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <xar/xar.h>

#include <cstdlib>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "package_fixture.h"

namespace pinwell::test {
namespace {

using base::Data;
using testing::ElementsAre;
using testing::IsEmpty;

struct Signature {
    std::string type;
    std::uint8_t status = 0;
    Data signedData;
};

struct Property {
    std::int32_t status = 0;
    std::optional<std::string> text;  // `nullopt` for null
};

/// The only archive, and the calls for it.
struct Library {
    bool opens = true;
    std::vector<Signature> signatures;
    Property checksumSize{0, "20"};

    std::vector<std::string> opened;
    std::vector<std::int32_t> modes;
    std::vector<std::string> copied;  // types of the signatures whose data were copied
    std::vector<std::string> keys;
    bool wantedMoreThanTheData = false;
    int closed = 0;
};
Library library;

xar_t archive() {
    return reinterpret_cast<xar_t>(&library);
}
Signature* signatureOf(xar_signature_t handle) {
    return const_cast<Signature*>(reinterpret_cast<const Signature*>(handle));
}
xar_signature_t handleOf(std::size_t number) {
    return number < library.signatures.size() ? reinterpret_cast<xar_signature_t>(&library.signatures[number])
                                              : nullptr;
}

class ArchiveLibrary : public FlatPackageTest {
  protected:
    ArchiveLibrary() {
        library = Library();
        library.signatures = {{"CMS", 0, Data(20, std::byte{0xC5})}};
    }

    /// The hash of a new package object, and the messages.
    std::optional<Data> hash() {
        PWHashedFlatPackage fresh{url, platform.services()};
        const MessageCapture output(kVerbosityVerbose);
        const auto found = fresh.cdHash();
        algorithm = fresh.digestAlgorithm();
        lines = output.lines();
        return found;
    }

    std::uint32_t algorithm = 0;
    std::vector<std::string> lines;
};

TEST_F(ArchiveLibrary, OpensThePackagesPathForReading) {
    EXPECT_EQ(hash(), Data(20, std::byte{0xC5}));
    EXPECT_THAT(library.opened, ElementsAre(path));
    EXPECT_THAT(library.modes, ElementsAre(0));
}

TEST_F(ArchiveLibrary, IsCalledOnlyForTheDataOfTheFirstCMSSignature) {
    library.signatures = {{"RSA", 0, Data(1)}, {"CMS", 0, Data(33, std::byte{1})}, {"CMS", 0, Data(3)}};
    EXPECT_EQ(hash(), Data(33, std::byte{1})) << "whole, whatever its length";
    EXPECT_THAT(library.copied, ElementsAre("CMS"));
    EXPECT_FALSE(library.wantedMoreThanTheData);
    EXPECT_THAT(library.keys, ElementsAre("checksum/size"));
}

TEST_F(ArchiveLibrary, ACodeThatPreventsTheExtractionIsPrintedAndTheNextSignatureNotTried) {
    library.signatures = {{"CMS", 7, {}}, {"CMS", 0, Data(20)}};
    EXPECT_EQ(hash(), std::nullopt);
    EXPECT_EQ(lines.back(), "Error 7 prevented extracting package hash for package: " + url.absoluteString());
    EXPECT_EQ(library.copied.size(), 1U);
    EXPECT_THAT(library.keys, IsEmpty());
    EXPECT_EQ(algorithm, 0U);
}

TEST_F(ArchiveLibrary, AChecksumSizeThatIsAbsentUnreadableOrEmptyIsAlgorithm0InSilence) {
    for (const Property& size :
         {Property{-1, std::nullopt}, Property{-1, "20"}, Property{0, std::nullopt}, Property{0, ""}}) {
        library.checksumSize = size;
        EXPECT_EQ(hash(), Data(20, std::byte{0xC5}));
        EXPECT_EQ(algorithm, 0U);
        EXPECT_THAT(lines, ElementsAre("Sig Type is CMS. Length is 3"));
    }
}

TEST_F(ArchiveLibrary, AnyOtherChecksumSizeThan20And32IsAlgorithm0) {
    for (const char* size : {"48", "0", "2", "200", "-20", "x20", "0x20", "99999999999999999999"}) {
        library.checksumSize.text = size;
        EXPECT_TRUE(hash().has_value());
        EXPECT_EQ(algorithm, 0U) << size;
        EXPECT_EQ(lines.back(), std::string("Package Sample.pkg uses a checksum of size ") + size);
    }
}

TEST_F(ArchiveLibrary, AChecksumSizeCountsByItsLeadingDigits) {
    for (const char* size : {"32", " 32", "032", "32xyz", "32.9"}) {
        library.checksumSize.text = size;
        EXPECT_TRUE(hash().has_value());
        EXPECT_EQ(algorithm, 2U) << size;
    }
}

TEST_F(ArchiveLibrary, IsClosedOnceOnEveryPath) {
    hash();
    EXPECT_EQ(library.closed, 1);
    library.signatures[0].status = 1;
    hash();
    EXPECT_EQ(library.closed, 2);
    library.signatures.clear();
    hash();
    EXPECT_EQ(library.closed, 3);
    library.opens = false;
    EXPECT_EQ(hash(), std::nullopt);
    EXPECT_THAT(lines, IsEmpty());
    EXPECT_EQ(library.closed, 3);
}

}  // namespace
}  // namespace pinwell::test

using pinwell::test::library;

xar_t xar_open(const char* file, int32_t flags) {
    library.opened.emplace_back(file);
    library.modes.push_back(flags);
    return library.opens ? pinwell::test::archive() : nullptr;
}

int xar_close(xar_t) {
    ++library.closed;
    return 0;
}

xar_signature_t xar_signature_first(xar_t) {
    return pinwell::test::handleOf(0);
}

xar_signature_t xar_signature_next(xar_signature_t s) {
    const auto number = pinwell::test::signatureOf(s) - library.signatures.data();
    return pinwell::test::handleOf(static_cast<std::size_t>(number) + 1);
}

char* xar_signature_type(xar_signature_t s) {
    return pinwell::test::signatureOf(s)->type.data();
}

uint8_t xar_signature_copy_signed_data(xar_signature_t sig, uint8_t** data, uint32_t* length,
                                       uint8_t** signed_data, uint32_t* signed_length,
                                       uint32_t* signed_offset) {
    const auto& signature = *pinwell::test::signatureOf(sig);
    library.copied.push_back(signature.type);
    library.wantedMoreThanTheData |=
        signed_data != nullptr || signed_length != nullptr || signed_offset != nullptr;
    // A failed call may leave a part of its results, which the caller then owns.
    *length = static_cast<uint32_t>(signature.signedData.size());
    *data = static_cast<uint8_t*>(std::malloc(signature.signedData.size() + 1));
    for (std::size_t i = 0; i < signature.signedData.size(); ++i)
        (*data)[i] = std::to_integer<uint8_t>(signature.signedData[i]);
    return signature.status;
}

int32_t xar_prop_get(xar_file_t f, const char* key, const char** value) {
    EXPECT_EQ(f, reinterpret_cast<xar_file_t>(pinwell::test::archive())) << "the archive's own properties";
    library.keys.emplace_back(key);
    *value = library.checksumSize.text ? library.checksumSize.text->c_str() : nullptr;
    return library.checksumSize.status;
}
