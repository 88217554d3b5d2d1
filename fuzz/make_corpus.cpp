// Writes the seeds of every fuzz target, from the tests' builders: one directory for each target, one file
// for each seed, named after its contents.
//
//   make_corpus DIRECTORY
#include <cstdio>
#include <exception>
#include <string>

#include "base/byte_io.h"
#include "support/archive_builder.h"
#include "support/certificate_builder.h"
#include "support/cms_signer.h"
#include "support/controller_run.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"
#include "support/package_builder.h"
#include "support/signed_image.h"
#include "support/tabled_image_builder.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"
#include "values/property_list.h"

namespace pinwell::test {
namespace {

using base::asBytes;
using base::toData;

/// The seeds of one target.
class Seeds {
  public:
    Seeds(const std::string& corpus, const std::string& target) : directory_(corpus + "/" + target + "/") {}

    Seeds& add(const std::string& name, ByteView contents) {
        writeFile(directory_ + name, contents);
        return *this;
    }
    Seeds& add(const std::string& name, std::string_view contents) { return add(name, asBytes(contents)); }

  private:
    std::string directory_;
};

void makeTickets(const std::string& corpus) {
    const IssuedChain chain = TicketChain().issue();
    const Data two = TicketPayloadBuilder().entry(2, hashOf(1)).entry(1, hashOf(2)).revoked().build();
    const Data long48 =
        TicketPayloadBuilder().hashLength(48).entry(4, hashOf(3, 48)).entry(2, hashOf(4, 48)).build();
    const Data old = TicketPayloadBuilder().version(1).entry(0, hashOf(5)).build();
    const Data unknown = TicketPayloadBuilder().entry(0, hashOf(6)).entry(9, hashOf(7)).build();
    Seeds(corpus, "ticket")
        .add("container", SatchelBuilder::of(chain, two).build())
        .add("container_small", SatchelBuilder().certificate(derElement(0x30, {})).payload(old).build())
        .add("container_length_of_certificates",
             SatchelBuilder::of(chain, two).certificateBlockLength(~0U).build())
        .add("container_length_of_payload", SatchelBuilder::of(chain, two).payloadLength(~0U).build())
        .add("payload", two)
        .add("payload_sha384", long48)
        .add("payload_version_1", old)
        .add("payload_unknown_algorithms", unknown)
        .add("payload_count", TicketPayloadBuilder().count(~0U).build());
}

Data certificateBlock(const std::vector<Data>& certificates) {
    Data contents;
    for (const Data& certificate : certificates) base::append(contents, certificate);
    return derElement(0x30, contents);
}

void makeCertificateBlocks(const std::string& corpus) {
    TicketChain fields;
    const IssuedChain chain = fields.issue();
    fields.leaf.subjectAlternativeNames = "DNS:a.example,IP:127.0.0.1";
    fields.leaf.extendedKeyUsage = "serverAuth,1.2.3.4";
    fields.leaf.keyUsage = "critical,digitalSignature";
    fields.leaf.extensions.push_back({.oid = "1.2.3.4.5", .critical = true});
    fields.intermediate.key = SigningKey::cached(KeyKind::rsa2048, "seed");
    const IssuedChain other = fields.issue();
    Seeds(corpus, "certificate_block")
        .add("chain", certificateBlock(chain.list()))
        .add("extensions", certificateBlock(other.list()))
        .add("leaf", certificateBlock({chain.leaf.der}))
        .add("four", certificateBlock({chain.leaf.der, chain.leaf.der, chain.leaf.der, chain.leaf.der}))
        .add("empty", certificateBlock({}))
        .add("filler", certificateBlock({derElement(0x30, derElement(0x30, derElement(0x02, toData("1"))))}));
}

void makeSuperblobs(const std::string& corpus) {
    const Data signature = DiskImageBuilder::signature().build();
    const Data stapled = DiskImageBuilder::signature().blob(kSampleTicketSlot, ticketBlob("ticket")).build();
    Seeds(corpus, "blob_set")
        .add("empty", SuperBlobBuilder().build())
        .add("signature", signature)
        .add("stapled", stapled)
        .add("reversed", DiskImageBuilder::signature().reverseIndex().build())
        .add("gap", SuperBlobBuilder().gap(4).blob(0, makeBlob(1, toData("a"))).build())
        .add("count", DiskImageBuilder::signature().count(~0U).build());

    Seeds(corpus, "disk_image")
        .add("unsigned", DiskImageBuilder().build())
        .add("signed", DiskImageBuilder().superblob(signature).build())
        .add("stapled", DiskImageBuilder().superblob(stapled).build())
        .add("version", DiskImageBuilder().version(5).build())
        .add("offset", DiskImageBuilder().superblob(signature).codeSignOffset(~0ULL).build())
        .add("length", DiskImageBuilder().superblob(signature).codeSignLength(~0ULL).build());
}

Data signedDirectory(const Data& directory, bool timestamped) {
    CmsBuilder cms(directory);
    if (timestamped) cms.timestamp(TimestampBuilder());
    return SuperBlobBuilder().blob(0, directory).blob(2, emptyRequirements()).cms(cms.build()).build();
}

void makeCodeSignatures(const std::string& corpus) {
    const Data requirements = emptyRequirements();
    const Data plain = CodeDirectoryBuilder().build();
    const Data full = CodeDirectoryBuilder()
                          .version(0x20500)
                          .flags(0)
                          .team("TEAM123456")
                          .scatter(Data(48))
                          .covers(2, requirements)
                          .build();
    Seeds seeds(corpus, "code_signature");
    seeds.add("ad_hoc", SuperBlobBuilder::adHoc().build())
        .add("directory", plain)
        .add("directory_full", full)
        .add("signed", signedDirectory(full, false))
        .add("timestamped", signedDirectory(full, true));
    SuperBlobBuilder alternates;
    alternates.blob(0, CodeDirectoryBuilder().digestType(1).build()).blob(2, requirements);
    for (std::uint32_t type = 2; type <= 4; ++type)
        alternates.blob(0x1000 + type - 2,
                        CodeDirectoryBuilder().digestType(static_cast<std::uint8_t>(type)).build());
    seeds.add("alternates", alternates.build());
    for (const std::uint32_t version : {0x20001U, 0x20100U, 0x20200U, 0x20300U})
        seeds.add("directory_" + std::to_string(version), CodeDirectoryBuilder().version(version).build());
}

void makeMessages(const std::string& corpus) {
    const Data content = toData("a code directory");
    const auto seed = [&](const CmsBuilder& builder) {
        return base::ByteWriter()
            .u8(static_cast<std::uint8_t>(content.size()))
            .bytes(content)
            .bytes(builder.build())
            .data();
    };
    Seeds(corpus, "cms")
        .add("ec", seed(CmsBuilder(content)))
        .add("rsa", seed(CmsBuilder(content).key(TestKey::rsa2048)))
        .add("ber", seed(CmsBuilder(content).ber()))
        .add("attached", seed(CmsBuilder(content).attached()))
        .add("without_attributes", seed(CmsBuilder(content).withoutSignedAttributes()))
        .add("without_certificate", seed(CmsBuilder(content).withoutCertificate()))
        .add("timestamp", seed(CmsBuilder(content).timestamp(TimestampBuilder())))
        .add("timestamp_sha384", seed(CmsBuilder(content).timestamp(TimestampBuilder().imprintDigest(4))))
        .add("timestamp_plain_data", seed(CmsBuilder(content).timestamp(TimestampBuilder().asPlainData())));
}

void makeExecutables(const std::string& corpus) {
    const Data thin = ExecutableImageBuilder().build();
    const Data other = ExecutableImageBuilder().cpuType(kSampleX86).bits32().build();
    const Data cms = signedDirectory(CodeDirectoryBuilder().flags(0).build(), true);
    Seeds(corpus, "executable_image")
        .add("thin", thin)
        .add("thin_32_big_endian", ExecutableImageBuilder().bits32().bigEndian().build())
        .add("unsigned", ExecutableImageBuilder().withoutSignature().build())
        .add("signed", ExecutableImageBuilder().signature(cms).padding(Data(16)).build())
        .add("universal", UniversalImageBuilder().slice(kSampleX86, other).slice(kSampleArm, thin).build())
        .add("universal_wide", UniversalImageBuilder().wide().slice(kSampleArm, thin).build())
        .add("slices", UniversalImageBuilder().count(~0U).build())
        .add("commands", ExecutableImageBuilder().commandCount(~0U).build());
}

void makeArchives(const std::string& corpus) {
    const std::string document =
        R"(<?xml version="1.0"?><xar><toc><checksum style="sha1"><offset>0</offset><size>20</size></checksum>)"
        R"(<creation-time>2026-11-20</creation-time><signature style="RSA"><offset>20</offset></signature>)"
        R"(<x-signature style="CMS"/><file id="1"><name>&amp;a</name><data><![CDATA[x]]></data></file></toc></xar>)";
    Seeds(corpus, "archive")
        .add("unsigned", ArchiveBuilder().build())
        .add("signed", ArchiveBuilder().signature("RSA").signature("CMS").build())
        .add("named_digest", ArchiveBuilder().namedDigest("sha256").signature("CMS").build())
        .add("without_digest", ArchiveBuilder().digest("none").toc(document).build())
        .add("length", ArchiveBuilder().compressedLength(~0ULL).build());
    Seeds(corpus, "table_of_contents")
        .add("full", document)
        .add("small", "<xar><toc/></xar>")
        .add("namespaces", R"(<x:xar xmlns:x="urn:a"><x:toc><x:signature x:style="CMS"/></x:toc></x:xar>)")
        .add("entity", R"(<!DOCTYPE xar [<!ENTITY a "b">]><xar><toc>&a;</toc></xar>)")
        .add("twice", "<xar><toc><checksum/><checksum/></toc></xar>");

    Seeds(corpus, "package_trailer")
        .add("plain", PackageBuilder().archive(toData("archive")).build())
        .add("terminator", PackageBuilder().archive(toData("archive")).terminator().build())
        .add("ticket", PackageBuilder().archive(toData("archive")).terminator().ticket("ticket").build())
        .add("unknown", PackageBuilder()
                            .archive(toData("archive"))
                            .terminator()
                            .unknown("a")
                            .ticket("t")
                            .unknown("b")
                            .build())
        .add("length", PackageBuilder().trailer({.type = 2, .length = ~0U}).build())
        .add("record", makeTrailer({}));
}

// A dictionary of one key. Its value is an array of an integer, a boolean, a real, a date, text in UTF-16,
// and text with a separate length.
Data binaryPropertyList() {
    const std::vector<std::string> objects = {"\xD1\x01\x02",
                                              "\x51\x61",
                                              "\xA6\x03\x04\x05\x06\x07\x08",
                                              "\x10\x7F",
                                              "\x09",
                                              "\x23" + std::string(8, '\x3F'),
                                              "\x33" + std::string(8, '\x41'),
                                              "\x61\x20\xAC",
                                              "\x5F\x10\x01z"};
    base::ByteWriter writer;
    base::ByteWriter offsets;
    writer.text("bplist00");
    for (const std::string& object : objects) {
        offsets.u8(static_cast<std::uint8_t>(writer.size()));
        writer.text(object);
    }
    const std::size_t table = writer.size();
    writer.bytes(offsets.data()).zeros(6).u8(1).u8(1);
    return writer.be64(objects.size()).be64(0).be64(table).data();
}

void makeDocuments(const std::string& corpus) {
    using values::Array;
    using values::Dictionary;
    const Dictionary dictionary{{"CFBundleExecutable", "Sample"},
                                {"array", Array{1, -1, true, 0.5}},
                                {"data", toData("data")},
                                {"empty", Dictionary{}},
                                {"text", "<&>\u00E9"}};
    const Data binary = binaryPropertyList();
    Seeds(corpus, "property_list")
        .add("xml", *values::serializePropertyList(dictionary))
        .add("kinds",
             "<plist><array><date>2026-11-20T19:55:00Z</date><integer>0x10</integer><real>1e3</real>"
             "<string>&#65;<![CDATA[<]]></string><dict><key>CF$UID</key><integer>1</integer></dict>"
             "</array></plist>")
        .add("entity", R"(<!DOCTYPE plist [<!ENTITY a "b">]><plist><string>&a;</string></plist>)")
        .add("binary", binary);
    Seeds(corpus, "json")
        .add("kinds",
             R"({"a":[1,-1,1.5,1e300,true,false,null,18446744073709551615],"b":{"\u00e9\ud83d\ude00":""}})")
        .add("byte_order_mark", "\xEF\xBB\xBF[]")
        .add("nested", "[[[[[[[[]]]]]]]]");

    const std::string asset =
        R"("signedTicketAsset":{"value":{"size":3,"downloadURL":"https://a.example/${f}"}})";
    Seeds(corpus, "lookup_response")
        .add("inline", ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()})))
        .add("revoked", ControllerRun::inlineAnswer(unsignedTicket({ControllerRun::fileHash()}, 1)))
        .add("other_file", ControllerRun::inlineAnswer(unsignedTicket({Data(20)})))
        .add("large", R"({"records":[{"fields":{)" + asset + "}}]}")
        .add(
            "not_found",
            R"({"records":[{"recordName":"2/2/ab","reason":"Record not found","serverErrorCode":"NOT_FOUND"}]})")
        .add("empty", R"({"records":[]})");

    Seeds(corpus, "configuration")
        .add("host", R"({"lumora":{"host":"records.example.com:8443"}})")
        .add("address", R"({"lumora":{"host":"[::1]:443"}})")
        .add("address_4", R"({"lumora":{"host":"127.0.0.1"}})")
        .add("defaults", R"({"text":"value","flag":false})")
        .add("root", TicketChain().issue().root.pem());
}

void makeSignedExecutables(const std::string& corpus) {
    const Data adHoc = signedImageOf({});
    const Data intel = signedImageOf({.cpuType = kSampleX86});
    Seeds(corpus, "verify_executable")
        .add("ad_hoc", adHoc)
        .add("entitlements", signedImageOf({.components = {{5, makeBlob(0xFADE7171, Data(20))}}}))
        .add("directories", signedImageOf({.digestTypes = {1, 2, 4}, .team = "TEAM42"}))
        .add("signer", signedImageOf({.hasSigner = true}))
        .add("timestamp", signedImageOf({.digestTypes = {1, 2}, .hasSigner = true, .hasTimestamp = true}))
        .add("padding", signedImageOf({.padding = Data(16)}))
        .add("unsigned", ExecutableImageBuilder().withoutSignature().build())
        .add("other_code", ExecutableImageBuilder().build())
        .add("universal", UniversalImageBuilder().slice(kSampleX86, intel).slice(kSampleArm, adHoc).build());
}

/// The first byte gives the kind of the rest (fuzz/verify_disk_image.cpp).
void makeVerifiedDiskImages(const std::string& corpus) {
    const std::string artefacts = VECTORS_DIRECTORY "/artefacts/";
    Seeds seeds(corpus, "verify_disk_image");
    const auto image = [&](const std::string& name) {
        return std::string(1, '\0') + readFile(artefacts + name);
    };
    seeds.add("image", image("Sample.dmg"))
        .add("image_bare", image("bare/Sample.dmg"))
        .add("image_unsigned", image("Unsigned.dmg"));
    const Data some(2048, std::byte{0x5A});
    const auto table = [](const TabledImageBuilder& builder) {
        return base::ByteWriter()
            .u8(1)
            .be16(static_cast<std::uint16_t>(builder.table().size()))
            .bytes(builder.table())
            .bytes(builder.data())
            .data();
    };
    seeds.add("table_plain", table(TabledImageBuilder().plain(some)))
        .add("table_zlib", table(TabledImageBuilder().zlib(some).zeros(3)))
        .add("table_all", table(TabledImageBuilder().plain(some).zeros(10'000).zlib(some).plain(some)))
        .add("table_shared", table(TabledImageBuilder().plain(some).again(4, 2048)));
}

/// The first byte gives the kind of the rest (fuzz/verify_package.cpp).
void makeVerifiedPackages(const std::string& corpus) {
    const std::string artefacts = VECTORS_DIRECTORY "/artefacts/";
    const auto file = [](const std::string& name, const std::string& inside) {
        return "<file id=\"1\"><name>" + name + "</name>" + inside + "</file>";
    };
    const std::string data =
        "<data><offset>20</offset><length>4</length><archived-checksum style=\"sha1\">"
        "a17c9aaa61e80a1bf71d0d850af4e5baa9800bbd</archived-checksum></data>";  // of "data"
    const auto table = [&](const std::string& files) {
        return "\1<xar><toc><checksum style=\"sha1\"><offset>0</offset><size>20</size></checksum>" + files +
               "</toc></xar>data";
    };
    Seeds(corpus, "verify_package")
        .add("stapled", std::string(1, '\0') + readFile(artefacts + "Sample.pkg"))
        .add("bare", std::string(1, '\0') + readFile(artefacts + "bare/Sample.pkg"))
        .add("table", table(file("a", data)))
        .add("table_folders", table(file("d", file("a", data) + file("b", data)) + file("d2", "")))
        .add("table_attribute", table(file("a", "<ea id=\"0\"><name>x</name>" + data.substr(6))))
        .add("table_signature",
             table("<signature style=\"CMS\"><offset>20</offset><size>4</size></signature>"));
}

void makeSeals(const std::string& corpus) {
    const std::string artefacts = VECTORS_DIRECTORY "/artefacts/Sample.app/Contents/";
    const std::string entries =
        "<key>a</key><data>AAAAAAAAAAAAAAAAAAAAAAAAAAA=</data><key>b</key><dict><key>symlink</key>"
        "<string>a</string><key>optional</key><true/></dict><key>c/d</key><dict><key>cdhash</key><data>qqo=</"
        "data>"
        "<key>requirement</key><string>identifier \"x\" and (cdhash H\"00\" or !always)</string></dict>";
    const std::string rules =
        "<key>^.*</key><true/><key>^a/</key><dict><key>omit</key><true/><key>weight</key><real>20.5</real></"
        "dict>"
        "<key>(b|c)+$</key><integer>3</integer><key>^[^/]{1,9}\\.x$</key><false/>";
    const auto list = [&](const std::string& version) {
        return "<plist><dict><key>files" + version + "</key><dict>" + entries + "</dict><key>rules" +
               version + "</key><dict>" + rules + "</dict></dict></plist>";
    };
    Seeds(corpus, "verify_seal")
        .add("application", readFile(artefacts + "_CodeSignature/CodeResources"))
        .add("framework",
             readFile(artefacts + "Frameworks/Greeting.framework/Versions/A/_CodeSignature/CodeResources"))
        .add("version_1", list(""))
        .add("version_2", list("2"))
        .add("requirement",
             "designated => identifier com.example.a and (cdhash H\"ABab\" or !(anchor trusted and never))");
}

/// The first byte selects the file of an artefact that the rest replaces (fuzz/c_interface.cpp).
void makeFilesOfArtefacts(const std::string& corpus) {
    const std::string artefacts = VECTORS_DIRECTORY "/artefacts/";
    Seeds seeds(corpus, "c_interface");
    const auto add = [&](const std::string& name, char place, const std::string& contents) {
        seeds.add(name, place + contents);
    };
    add("image", 0, readFile(artefacts + "Sample.dmg"));
    add("image_unsigned", 0, readFile(artefacts + "bare/Unsigned.dmg"));
    add("package", 1, readFile(artefacts + "Sample.pkg"));
    add("executable", 2, base::toString(ExecutableImageBuilder().build()));
    add("ticket", 3, readFile(artefacts + "Sample.app/Contents/CodeResources"));
    add("ticket_revoked", 3, readFile(VECTORS_DIRECTORY "/tickets/revoked-app.ticket"));
    add("seal", 4, readFile(artefacts + "Sample.app/Contents/_CodeSignature/CodeResources"));
    add("property_list", 5, readFile(artefacts + "Sample.app/Contents/Info.plist"));
    add("main_executable", 6, base::toString(ExecutableImageBuilder().build()));
    add("roots", 7, readFile(VECTORS_DIRECTORY "/platform/roots/sample.pem"));
    add("record_name", 8, "\2\x90" + std::string(20, 'h'));
}

}  // namespace
}  // namespace pinwell::test

int main(int argc, char** argv) {
    using namespace pinwell::test;
    if (argc != 2) {
        std::fprintf(stderr, "Usage: %s DIRECTORY\n", argv[0]);
        return 64;
    }
    try {
        const std::string corpus = argv[1];
        for (const auto make :
             {makeTickets, makeCertificateBlocks, makeSuperblobs, makeCodeSignatures, makeMessages,
              makeExecutables, makeArchives, makeDocuments, makeSignedExecutables, makeVerifiedDiskImages,
              makeVerifiedPackages, makeSeals, makeFilesOfArtefacts})
            make(corpus);
        return 0;
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "%s\n", failure.what());
        return 1;
    }
}
